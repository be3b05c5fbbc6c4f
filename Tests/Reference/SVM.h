#pragma once

#include "Tests/Reference/Pixel.h"
#include "Tests/Reference/VirtualPixel.h"

#include <vector>

namespace VexaTouch::Reference {

class SVM {
public:
    SVM();

    void updateSVMScore(const std::vector<Pixel>& pixels,
                        const std::vector<VirtualPixel>& virtualPixels, float activationThreshold,
                        unsigned int timeMs);
    float getSVMScore() const { return _score; }

    float _score = 0.0F;
    std::vector<float> _mu;
    std::vector<float> _std_;
    std::vector<float> _w;
    float _b = 2.0083F;
};

}  // namespace VexaTouch::Reference
