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
    /// `_value` of each channel. Whoever makes a summary fills it: clearing it first would cost a
    /// fifth of an idle frame.
    std::array<std::int32_t, kChannelCount> values;  // NOLINT(*-member-init)
    std::int32_t largestValue = std::numeric_limits<std::int32_t>::min();
    std::int32_t aboveNoise = 0;  ///< channels whose `_value` is above noise
    bool anyAboveNoise = false;   ///< some channel's `_isAboveNoise` is set
    /// Channels that rose above noise during the touch but never became active.
    std::int32_t neverActive = 0;
    bool anyActive = false;
    float activeProgress = 0.0F;  ///< highest `_progress` above 0 of the active channels

    /// Looks at the channels of a frame. Throws std::out_of_range when there are not exactly
    /// kPixelCount and kVirtualPixelCount of them.
    static ChannelSummary of(const std::vector<Pixel>& pixels,
                             const std::vector<VirtualPixel>& virtualPixels);

    /// Takes in some channels' values, which are in their places already.
    void addValues(std::span<const std::int32_t> some) noexcept {
        for (const std::int32_t value : some) {
            largestValue = value > largestValue ? value : largestValue;
            aboveNoise += static_cast<std::int32_t>(value > kNoiseLevel);
        }
    }
    /// Takes in whether a channel is active, and how much.
    void addActivity(const Pixel& pixel) noexcept {
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
