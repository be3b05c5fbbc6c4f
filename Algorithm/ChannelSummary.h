#pragma once

#include "Algorithm/Pixel.h"
#include "Algorithm/VirtualImage.h"
#include "Algorithm/VirtualPixel.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace VexaTouch {

/// All channels: the pixels, then the virtual pixels.
inline constexpr std::size_t kChannelCount = kPixelCount + kVirtualPixelCount;

/// What one look at all channels tells about a frame, beyond the channels themselves.
struct ChannelSummary {
    std::array<std::int32_t, kChannelCount> values{};  ///< `_value` of each channel
    std::int32_t largestValue = 0;
    std::int32_t aboveNoise = 0;  ///< channels above noise in this frame
    /// Channels that rose above noise during the touch but never became active.
    std::int32_t neverActive = 0;
    bool anyActive = false;

    /// Looks at the channels of a frame. Throws std::out_of_range when there are not exactly
    /// kPixelCount and kVirtualPixelCount of them.
    static ChannelSummary of(const std::vector<Pixel>& pixels,
                             const std::vector<VirtualPixel>& virtualPixels);
};

}  // namespace VexaTouch
