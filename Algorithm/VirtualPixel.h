#pragma once

#include "Algorithm/Pixel.h"

#include <string>
#include <utility>

namespace VexaTouch {

/// A pixel fed with the sum of a group of neighbouring pixels. Its `_index` is the strongest
/// member's; before the first update it is the character code of the group's first letter.
class VirtualPixel : public Pixel {
public:
    VirtualPixel(std::string name, int index, float normalizationFactor)
        : Pixel(index, normalizationFactor), _name(std::move(name)) {}

    /// One frame's update, see Pixel; then `_index` becomes `maxPixelIndex`.
    void updatePixelState(int sample, float activationThreshold, int maxPixelIndex) noexcept {
        Pixel::updatePixelState(sample, activationThreshold);
        _index = maxPixelIndex;
    }

    /// The same from the scaled sample and its progress on.
    void takeProgress(std::int32_t value, float progress, int maxPixelIndex) noexcept {
        Pixel::takeProgress(value, progress);
        _index = maxPixelIndex;
    }

    std::string _name;  ///< the letters of the group, such as "ABE"
};

}  // namespace VexaTouch
