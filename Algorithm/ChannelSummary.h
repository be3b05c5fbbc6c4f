#pragma once

#include "Algorithm/Pixel.h"
#include "Algorithm/VirtualImage.h"
#include "Algorithm/VirtualPixel.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <span>
#include <vector>

namespace VexaTouch {

/// All channels: the pixels, then the virtual pixels.
inline constexpr std::size_t kChannelCount = kPixelCount + kVirtualPixelCount;

/// What one look at all channels tells about a frame, beyond the channels themselves.
struct ChannelSummary {
    std::array<std::int32_t, kChannelCount> values;  ///< `_value` of each channel
    std::int32_t largestValue = std::numeric_limits<std::int32_t>::min();
    std::int32_t aboveNoise = 0;  ///< channels above noise in this frame
    /// Channels that rose above noise during the touch but never became active.
    std::int32_t neverActive = 0;
    bool anyActive = false;
    float activeProgress = 0.0F;  ///< highest `_progress` above 0 of the active channels

    /// Looks at the channels of a frame. Throws std::out_of_range when there are not exactly
    /// kPixelCount and kVirtualPixelCount of them.
    static ChannelSummary of(const std::vector<Pixel>& pixels,
                             const std::vector<VirtualPixel>& virtualPixels);

    /// Takes in the frame's state of one channel; all but `neverActive`.
    void add(std::size_t channel, const Pixel& pixel) noexcept {
        values[channel] = pixel._value;
        largestValue = pixel._value > largestValue ? pixel._value : largestValue;
        aboveNoise += pixel._isAboveNoise ? 1 : 0;
        if (pixel._isActive) {
            anyActive = true;
            activeProgress = largerOrOld(pixel._progress, activeProgress);
        }
    }
    /// Counts into `neverActive`.
    void countNeverActive(std::span<const Pixel> pixels,
                          std::span<const VirtualPixel> virtualPixels) noexcept;
};

}  // namespace VexaTouch
