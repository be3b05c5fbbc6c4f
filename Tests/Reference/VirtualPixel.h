#pragma once

#include "Tests/Reference/Pixel.h"

#include <string>
#include <utility>

namespace VexaTouch::Reference {

class VirtualPixel : public Pixel {
public:
    VirtualPixel(std::string name, int index, float normalizationFactor)
        : Pixel(index, normalizationFactor), _name(std::move(name)) {}

    void updatePixelState(int sample, float activationThreshold, int maxPixelIndex) {
        Pixel::updatePixelState(sample, activationThreshold);
        _index = maxPixelIndex;
    }

    std::string _name;
};

}  // namespace VexaTouch::Reference
