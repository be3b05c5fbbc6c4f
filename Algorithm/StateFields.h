#pragma once

/// Every field of the algorithm's state by its exact name, in declaration order, for whoever
/// writes, compares or hashes whole states. Each function calls visit(name, field); the templates
/// accept any type with fields of these names.
namespace VexaTouch {

template <typename P, typename Visit>
void forEachPixelField(P& pixel, Visit&& visit) {
    visit("_value", pixel._value);
    visit("_normalizationFactor", pixel._normalizationFactor);
    visit("_progress", pixel._progress);
    visit("_peakProgress", pixel._peakProgress);
    visit("_valleyProgress", pixel._valleyProgress);
    visit("_isActive", pixel._isActive);
    visit("_isAboveNoise", pixel._isAboveNoise);
    visit("_wasAboveNoise", pixel._wasAboveNoise);
    visit("_wasActive", pixel._wasActive);
    visit("_maxProgressAboveNoise", pixel._maxProgressAboveNoise);
    visit("_index", pixel._index);
}

/// The classifier's score comes as visit("_svm._score", score).
template <typename H, typename Visit>
void forEachHandStatsField(H& hand, Visit&& visit) {
    visit("_svm._score", hand._svm._score);
    visit("_touch_score", hand._touch_score);
    visit("_y_cutoff", hand._y_cutoff);
    visit("_activationThreshold", hand._activationThreshold);
    visit("_hold_timeout_ms", hand._hold_timeout_ms);
    visit("_touch_score_threshold", hand._touch_score_threshold);
    visit("_touch_score_barrier", hand._touch_score_barrier);
    visit("_max_pixel_value", hand._max_pixel_value);
    visit("_enableHoldSuppression", hand._enableHoldSuppression);
    visit("_enableTapSuppression", hand._enableTapSuppression);
    visit("_isTouching", hand._isTouching);
    visit("_wasTouching", hand._wasTouching);
    visit("_isAboveNoiseLevel", hand._isAboveNoiseLevel);
    visit("_wasAboveNoiseLevel", hand._wasAboveNoiseLevel);
    visit("_isHolding", hand._isHolding);
    visit("_wasHolding", hand._wasHolding);
    visit("_isHoldSuppressed", hand._isHoldSuppressed);
    visit("_wasHoldSuppressed", hand._wasHoldSuppressed);
    visit("_maybeTap", hand._maybeTap);
    visit("_isTap", hand._isTap);
    visit("_isTapSuppressed", hand._isTapSuppressed);
    visit("_wouldBeIsHolding", hand._wouldBeIsHolding);
    visit("_wouldBeWasHolding", hand._wouldBeWasHolding);
    visit("_touchdownTimestamp_ms", hand._touchdownTimestamp_ms);
    visit("_liftoffTimestamp_ms", hand._liftoffTimestamp_ms);
    visit("_aboveNoiseTimestamp_ms", hand._aboveNoiseTimestamp_ms);
    visit("_belowNoiseTimestamp_ms", hand._belowNoiseTimestamp_ms);
    visit("_lastEventTimestamp_ms", hand._lastEventTimestamp_ms);
    visit("_signalDerivative_thresholded", hand._signalDerivative_thresholded);
    visit("_touchingSignalDerivative_thresholded", hand._touchingSignalDerivative_thresholded);
    visit("_timeDurationRatio_thresholded", hand._timeDurationRatio_thresholded);
    visit("_nonActivePixels_thresholded", hand._nonActivePixels_thresholded);
    visit("_tap_svm_score", hand._tap_svm_score);
    visit("_activeRegion", hand._activeRegion);
    visit("_previousActiveRegion", hand._previousActiveRegion);
    visit("_last_event_activeRegion", hand._last_event_activeRegion);
    visit("_peak_pixel_progress", hand._peak_pixel_progress);
    visit("_peak_pixel_index", hand._peak_pixel_index);
    visit("_regionMax", hand._regionMax);
    visit("_regionChangeThresh", hand._regionChangeThresh);
}

}  // namespace VexaTouch
