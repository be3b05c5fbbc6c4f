#pragma once

#include "Algorithm/ChannelSummary.h"
#include "Algorithm/Pixel.h"
#include "Algorithm/VirtualPixel.h"

#include <array>
#include <vector>

namespace VexaTouch {

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
    /// The same from the summary of the channels.
    void updateSVMScore(const ChannelSummary& channels, float activationThreshold) noexcept;

    /// The score of the last update: positive leans toward a touch, negative toward noise.
    [[nodiscard]] float getSVMScore() const noexcept { return _score; }

    float _score = 0.0F;
    static const Parameters _mu;    ///< means by rank, the strongest channel first
    static const Parameters _std_;  ///< standard deviations by rank
    static const Parameters _w;     ///< weights by rank
    static constexpr float _b = 2.0083F;
};

}  // namespace VexaTouch
