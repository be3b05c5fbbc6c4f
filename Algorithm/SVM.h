#pragma once

#include "Algorithm/Pixel.h"
#include "Algorithm/VirtualImage.h"
#include "Algorithm/VirtualPixel.h"

#include <array>
#include <cstdint>
#include <vector>

namespace VexaTouch {

/// All channels: the pixels, then the virtual pixels.
inline constexpr std::size_t kChannelCount = kPixelCount + kVirtualPixelCount;

/// A linear classifier that scores how touch-like a frame's signal profile is. Its features are the
/// channel values sorted from strongest to weakest, so the score depends on the shape of the touch
/// and not on its place.
class SVM {
public:
    using Parameters = std::array<float, kChannelCount>;

    /// Computes `_score`: 0.0 unless the strongest channel is above `activationThreshold` or the
    /// second is above noise. `timeMs` is not used.
    /// Throws std::out_of_range when there are not kPixelCount and kVirtualPixelCount channels.
    void updateSVMScore(const std::vector<Pixel>& pixels,
                        const std::vector<VirtualPixel>& virtualPixels, float activationThreshold,
                        unsigned int timeMs);

    /// The score of the last update: positive leans toward a touch, negative toward noise.
    [[nodiscard]] float getSVMScore() const noexcept { return _score; }

    float _score = 0.0F;
    static const Parameters _mu;    ///< means by rank, the strongest channel first
    static const Parameters _std_;  ///< standard deviations by rank
    static const Parameters _w;     ///< weights by rank
    static constexpr float _b = 2.0083F;

private:
    using Values = std::array<std::int32_t, kChannelCount>;

    // Channels in the order of their values in the last scored frame, where the next search for the
    // order begins: it hardly changes from frame to frame.
    std::array<std::uint8_t, kChannelCount> order_ = identityOrder();

    static constexpr std::array<std::uint8_t, kChannelCount> identityOrder() noexcept {
        std::array<std::uint8_t, kChannelCount> order{};
        for (std::size_t i = 0; i < order.size(); ++i) {
            order[i] = static_cast<std::uint8_t>(i);
        }
        return order;
    }
    void sortDescending(const Values& values, Values& sorted) noexcept;
};

}  // namespace VexaTouch
