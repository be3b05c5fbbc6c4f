#pragma once

#include "Algorithm/ChannelSummary.h"
#include "Algorithm/SVM.h"

#include <array>
#include <cstdint>
#include <vector>

namespace VexaTouch {

/// The state of the touch: whether a finger touches, since when, in which region, whether the touch
/// has become a hold, and whether its lift-off counts as a tap.
///
/// All times are the device's millisecond timestamps; their differences are taken in unsigned
/// 32-bit arithmetic. A channel is any pixel or virtual pixel, pixels first. Not thread safe.
class HandStats {
public:
    HandStats() = default;

    /// Sets `_y_cutoff` to its default again.
    void SetDecayParameters() noexcept;

    /// Clears the per-touch peak statistics and the touch score, nothing else.
    void Reset() noexcept;

    /// The per-frame step, after all channels had theirs. `pixels` holds kPixelCount elements.
    /// Throws std::out_of_range when there are not kPixelCount and kVirtualPixelCount channels,
    /// before anything has changed.
    void updateHandState(const std::vector<Pixel>& pixels,
                         const std::vector<VirtualPixel>& virtualPixels, unsigned int timeMs);
    /// The same for whoever has the summary of these very channels already.
    void updateHandState(const std::vector<Pixel>& pixels,
                         const std::vector<VirtualPixel>& virtualPixels,
                         const ChannelSummary& channels, unsigned int timeMs);

    /// The region while touching but not holding.
    PixelRegion updateActiveRegion(const std::vector<Pixel>& pixels,
                                   const std::vector<VirtualPixel>& virtualPixels,
                                   unsigned int timeMs);
    /// The region while a hold is in progress; `channelIndex` is the strongest channel's pixel
    /// index, 0 to 14. The old region is always kept in `_previousActiveRegion`.
    PixelRegion changeActiveRegion(const std::vector<Pixel>& pixels, int channelIndex);

    void updateTouchScore(const std::vector<Pixel>& pixels,
                          const std::vector<VirtualPixel>& virtualPixels, unsigned int timeMs);
    void updateTapRejection(const std::vector<Pixel>& pixels,
                            const std::vector<VirtualPixel>& virtualPixels);
    void decayTouchScore(unsigned int timeMs) noexcept;
    void updateRegionMax(const std::vector<Pixel>& pixels) noexcept;

    /// The line through (x0, y0) and (x1, y1), at x.
    static float fuzzify(float x, float x0, float x1, float y0, float y1) noexcept;
    /// The same, held at y0 up to x0 and at y1 from x1.
    static float fuzzifyAndClip(float x, float x0, float x1, float y0, float y1) noexcept;
    /// 0.65 within 0.3 s of the last tap or hold end, rising to 1.0 after 1 s.
    [[nodiscard]] float updateTimeBiasFactor(unsigned int timeMs) const noexcept;

    static constexpr float kDefaultCutoff = 7.389056F;  ///< e squared, bits 0x40EC7326

    SVM _svm;
    float _touch_score = 0.0F;         ///< running sum of classifier scores, clamped
    float _y_cutoff = kDefaultCutoff;  ///< decay constant of the touch score
    float _activationThreshold = 200.0F;
    std::uint32_t _hold_timeout_ms = 500;
    float _touch_score_threshold = 0.0F;  ///< a hold may start only at or above it
    float _touch_score_barrier = 100.0F;  ///< clamp bound of the touch score
    float _max_pixel_value = 0.0F;        ///< peak progress of the touch times the threshold
    bool _enableHoldSuppression = true;
    bool _enableTapSuppression = true;
    bool _isTouching = false;
    bool _wasTouching = false;
    bool _isAboveNoiseLevel = false;
    bool _wasAboveNoiseLevel = false;
    bool _isHolding = false;
    bool _wasHolding = false;
    bool _isHoldSuppressed = false;  ///< a hold was due but the touch score forbade it
    bool _wasHoldSuppressed = false;
    bool _maybeTap = false;          ///< this frame is a lift-off that could be a tap
    bool _isTap = false;             ///< this frame's lift-off is a tap
    bool _isTapSuppressed = false;   ///< the tap classifier rejects the touch
    bool _wouldBeIsHolding = false;  ///< the hold timeout has passed, whatever suppression says
    bool _wouldBeWasHolding = false;
    std::uint32_t _touchdownTimestamp_ms = 0;
    std::uint32_t _liftoffTimestamp_ms = 0;
    std::uint32_t _aboveNoiseTimestamp_ms = 0;
    std::uint32_t _belowNoiseTimestamp_ms = 0;
    std::uint32_t _lastEventTimestamp_ms = 0;  ///< of the last tap or hold end
    float _signalDerivative_thresholded = 0.0F;
    float _touchingSignalDerivative_thresholded = 0.0F;  ///< used only by its sign
    float _timeDurationRatio_thresholded = 0.0F;
    std::int32_t _nonActivePixels_thresholded = 0;
    float _tap_svm_score = 0.0F;
    PixelRegion _activeRegion = 0;
    PixelRegion _previousActiveRegion = 0;     ///< before the last changeActiveRegion
    PixelRegion _last_event_activeRegion = 0;  ///< at the last tap or hold end
    float _peak_pixel_progress = 0.0F;
    std::int32_t _peak_pixel_index = 0;  ///< of the channel that set `_peak_pixel_progress`
    /// Per region the largest `_value` above the noise level, as the last updateRegionMax left it.
    std::array<float, kRegionCount> _regionMax{};
    float _regionChangeThresh = 1.3F;  ///< last factor used by changeActiveRegion

private:
    void trackPeak(const Pixel& channel) noexcept;
    void shiftTouchFlags(const ChannelSummary& channels) noexcept;
    void updateTouchScore(const ChannelSummary& channels, unsigned int timeMs) noexcept;
    void updateTapRejection(const ChannelSummary& channels) noexcept;
    void stampEdges(unsigned int timeMs) noexcept;
    void decideHold(bool timedOut, bool wasHolding) noexcept;
    void decideTap(bool wouldHaveHeld) noexcept;
};

}  // namespace VexaTouch
