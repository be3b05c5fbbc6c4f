#pragma once

#include "Tests/Reference/Pixel.h"

#include <cstdint>
#include <string>
#include <vector>

namespace VexaTouch::Reference {

class VirtualImage {
public:
    VirtualImage();

    /// Throws std::out_of_range when a vector is too short, leaving the update half done.
    void updateValues(const std::vector<Pixel>& pixels);

    const std::vector<std::string>& neighborPixelGroups() const { return _neighborPixelGroups; }

    std::vector<std::int32_t> _values;
    std::vector<std::string> _neighborPixelGroups;
    std::vector<std::int32_t> _maxPixelIndex;
    std::vector<float> _normalizationFactors;
};

}  // namespace VexaTouch::Reference
