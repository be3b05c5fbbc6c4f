#pragma once

#include "Algorithm/ChannelSummary.h"
#include "Algorithm/Lanes.h"
#include "Algorithm/Pixel.h"
#include "Algorithm/VirtualPixel.h"

#include <array>
#include <cstdint>
#include <span>

namespace VexaTouch {

/// Updates channels four at a time: for each the same operations on the same numbers as
/// Pixel::updatePixelState, only side by side, so the results are the same to the bit. Gathers the
/// frame's summary on the way.
class ChannelUpdate {
public:
    explicit ChannelUpdate(float activationThreshold) noexcept
        : activationThreshold_(activationThreshold) {}

    /// `samples` are the frame's raw values.
    void updatePixels(std::span<Pixel, kPixelCount> pixels,
                      std::span<const std::int16_t, kPixelCount> samples) noexcept;

    /// `sums` are the virtual image's values, of which the low 16 bits count; `maxPixelIndex`
    /// becomes the channels' `_index`.
    void updateVirtualPixels(
        std::span<VirtualPixel, kVirtualPixelCount> pixels,
        std::span<const std::int32_t, kVirtualPixelCount> sums,
        std::span<const std::int32_t, kVirtualPixelCount> maxPixelIndex) noexcept;

    /// `pixels` are known to stay exactly as they are in this frame, at value 0 and inactive;
    /// `neverActive` of them count as such.
    void keepVirtualPixels(std::int32_t neverActive) noexcept;

    /// `_value` of the channels updated so far.
    [[nodiscard]] const std::array<std::int32_t, kChannelCount>& values() const noexcept {
        return summary_.values;
    }
    /// Of the channels updated so far, see ChannelSummary.
    [[nodiscard]] bool anyActive() const noexcept {
        return (totals_.active[0] | totals_.active[1] | totals_.active[2] | totals_.active[3]) != 0;
    }
    [[nodiscard]] std::int32_t neverActive() const noexcept {
        return -(totals_.neverActive[0] + totals_.neverActive[1] + totals_.neverActive[2] +
                 totals_.neverActive[3]);
    }
    /// The summary, once all channels are updated or kept.
    const ChannelSummary& summarize() noexcept;

    /// The summary as it grows, four channels side by side.
    struct Totals {
        IntegerLanes active{};
        IntegerLanes aboveNoise{};   // minus one for each
        IntegerLanes neverActive{};  // minus one for each
        IntegerLanes largest = {INT32_MIN, INT32_MIN, INT32_MIN, INT32_MIN};
    };

private:
    float activationThreshold_;
    ChannelSummary summary_;
    Totals totals_;
};

}  // namespace VexaTouch
