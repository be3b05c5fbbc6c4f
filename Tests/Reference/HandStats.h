#pragma once

#include "Tests/Reference/Pixel.h"
#include "Tests/Reference/SVM.h"
#include "Tests/Reference/VirtualPixel.h"

#include <cstdint>
#include <vector>

namespace VexaTouch::Reference {

class HandStats {
public:
    void SetDecayParameters();
    void Reset();

    /// Throws std::out_of_range, part-way, when there are fewer than 23 virtual pixels.
    void updateHandState(std::vector<Pixel> pixels, std::vector<VirtualPixel> virtualPixels,
                         unsigned int timeMs);

    PixelRegion updateActiveRegion(const std::vector<Pixel>& pixels,
                                   const std::vector<VirtualPixel>& virtualPixels,
                                   unsigned int timeMs);
    PixelRegion changeActiveRegion(const std::vector<Pixel>& pixels, int channelIndex);
    void updateTouchScore(const std::vector<Pixel>& pixels,
                          const std::vector<VirtualPixel>& virtualPixels, unsigned int timeMs);
    void updateTapRejection(const std::vector<Pixel>& pixels,
                            const std::vector<VirtualPixel>& virtualPixels);
    void decayTouchScore(unsigned int timeMs);
    void updateRegionMax(const std::vector<Pixel>& pixels);
    static float fuzzify(float x, float x0, float x1, float y0, float y1);
    static float fuzzifyAndClip(float x, float x0, float x1, float y0, float y1);
    float updateTimeBiasFactor(unsigned int timeMs) const;

    SVM _svm;
    float _touch_score = 0.0F;
    float _y_cutoff = 7.389056F;
    float _activationThreshold = 200.0F;
    std::uint32_t _hold_timeout_ms = 500;
    float _touch_score_threshold = 0.0F;
    float _touch_score_barrier = 100.0F;
    float _max_pixel_value = 0.0F;
    bool _enableHoldSuppression = true;
    bool _enableTapSuppression = true;
    bool _isTouching = false;
    bool _wasTouching = false;
    bool _isAboveNoiseLevel = false;
    bool _wasAboveNoiseLevel = false;
    bool _isHolding = false;
    bool _wasHolding = false;
    bool _isHoldSuppressed = false;
    bool _wasHoldSuppressed = false;
    bool _maybeTap = false;
    bool _isTap = false;
    bool _isTapSuppressed = false;
    bool _wouldBeIsHolding = false;
    bool _wouldBeWasHolding = false;
    std::uint32_t _touchdownTimestamp_ms = 0;
    std::uint32_t _liftoffTimestamp_ms = 0;
    std::uint32_t _aboveNoiseTimestamp_ms = 0;
    std::uint32_t _belowNoiseTimestamp_ms = 0;
    std::uint32_t _lastEventTimestamp_ms = 0;
    float _signalDerivative_thresholded = 0.0F;
    float _touchingSignalDerivative_thresholded = 0.0F;
    float _timeDurationRatio_thresholded = 0.0F;
    std::int32_t _nonActivePixels_thresholded = 0;
    float _tap_svm_score = 0.0F;
    std::int32_t _activeRegion = 0;
    std::int32_t _previousActiveRegion = 0;
    std::int32_t _last_event_activeRegion = 0;
    float _peak_pixel_progress = 0.0F;
    std::int32_t _peak_pixel_index = 0;
    std::vector<float> _regionMax = std::vector<float>(4, 0.0F);
    float _regionChangeThresh = 1.3F;
};

}  // namespace VexaTouch::Reference
