#pragma once

#include "Shared/InputReport.h"

#include <array>
#include <cstdint>

namespace VexaTouch {

/// The three buttons of the surface, each a group of pixels; region 0 is none.
///
/// 1: play/pause on tap, voice-assistant call on hold. 2: volume down on tap, volume decrement on
/// hold. 3: volume up on tap, volume increment on hold.
using PixelRegion = std::int32_t;

inline constexpr PixelRegion kRegionNone = 0;
inline constexpr PixelRegion kRegionPlayPause = 1;
inline constexpr PixelRegion kRegionVolumeDown = 2;
inline constexpr PixelRegion kRegionVolumeUp = 3;
/// Region numbers run from 0 to kRegionCount - 1.
inline constexpr std::size_t kRegionCount = 4;

/// Noise level in `_value` units: above noise means above 75, that is at least 76.
inline constexpr std::int32_t kNoiseLevel = 75;

/// Gain of each pixel, "A" first. The sample is multiplied by it before anything else.
inline constexpr std::array<float, kPixelCount> kPixelGains = {
    1.9219F, 1.8833F, 1.9281F, 1.8837F, 1.9163F,  // A to E
    1.8105F, 1.0081F, 1.0F,    1.4851F, 1.5033F,  // F to J
    2.4154F, 1.5378F, 1.5431F, 1.04F,   1.0493F,  // K to O
};

/// The region of a pixel index. Only the index's low five bits count, so 15 to 31 and their
/// equivalents are in no region.
constexpr PixelRegion pixelRegionOfIndex(std::int32_t index) noexcept {
    const std::uint32_t bit = 1U << (static_cast<std::uint32_t>(index) % 32U);
    if ((bit & 0x3C0U) != 0) {  // G H I J
        return kRegionVolumeUp;
    }
    if ((bit & 0x7800U) != 0) {  // L M N O
        return kRegionVolumeDown;
    }
    if ((bit & 0x43FU) != 0) {  // A to F and K
        return kRegionPlayPause;
    }
    return kRegionNone;
}

}  // namespace VexaTouch
