#include "Algorithm/HandStats.h"

#include <algorithm>
#include <cmath>

namespace VexaTouch {

namespace {

constexpr std::int32_t kPixelI = 8;
constexpr std::int32_t kPixelK = 10;
constexpr std::int32_t kPixelM = 12;

/// Region of the pixel at a position, which is not range-tested.
PixelRegion regionAt(const std::vector<Pixel>& pixels, int index) noexcept {
    return pixels[static_cast<std::size_t>(index)].getPixelRegion();
}

/// `_index` of the channel of highest progress above 0, or 0; the earlier channel wins a tie.
std::int32_t strongestChannelIndex(const std::vector<Pixel>& pixels,
                                   const std::vector<VirtualPixel>& virtualPixels) noexcept {
    float strongest = 0.0F;
    std::int32_t index = 0;
    const auto look = [&](const Pixel& channel) {
        if (channel._progress > strongest) {
            strongest = channel._progress;
            index = channel._index;
        }
    };
    std::ranges::for_each(pixels, look);
    std::ranges::for_each(virtualPixels, look);
    return index;
}

struct TopTwo {
    const Pixel* first;
    const Pixel* second;
};

/// The two pixels of highest `_maxProgressAboveNoise`; the earlier one comes first on a tie.
TopTwo topTwoAboveNoise(const std::vector<Pixel>& pixels) noexcept {
    const Pixel* first = &pixels[0];
    const Pixel* second = &pixels[1];
    if (second->_maxProgressAboveNoise > first->_maxProgressAboveNoise) {
        std::swap(first, second);
    }
    for (std::size_t i = 2; i < kPixelCount; ++i) {
        const Pixel* pixel = &pixels[i];
        if (pixel->_maxProgressAboveNoise > first->_maxProgressAboveNoise) {
            second = first;
            first = pixel;
        } else if (pixel->_maxProgressAboveNoise > second->_maxProgressAboveNoise) {
            second = pixel;
        }
    }
    return {first, second};
}

}  // namespace

void HandStats::SetDecayParameters() noexcept {
    _y_cutoff = kDefaultCutoff;
}

void HandStats::Reset() noexcept {
    _touch_score = 0.0F;
    _max_pixel_value = 0.0F;
    _peak_pixel_progress = 0.0F;
    _peak_pixel_index = 0;
}

void HandStats::updateHandState(const std::vector<Pixel>& pixels,
                                const std::vector<VirtualPixel>& virtualPixels,
                                unsigned int timeMs) {
    updateHandState(pixels, virtualPixels, ChannelSummary::of(pixels, virtualPixels), timeMs);
}

void HandStats::updateHandState(const std::vector<Pixel>& pixels,
                                const std::vector<VirtualPixel>& virtualPixels,
                                const ChannelSummary& channels, unsigned int timeMs) {
    if (channels.activeProgress > _peak_pixel_progress) {
        std::ranges::for_each(pixels, [this](const Pixel& pixel) { trackPeak(pixel); });
        std::ranges::for_each(virtualPixels, [this](const Pixel& pixel) { trackPeak(pixel); });
    }
    shiftTouchFlags(channels);
    if (_isTouching) {
        _activeRegion =
            _isHolding ? changeActiveRegion(pixels, strongestChannelIndex(pixels, virtualPixels))
                       : updateActiveRegion(pixels, virtualPixels, timeMs);
    }
    stampEdges(timeMs);
    updateTouchScore(channels, timeMs);
    updateTapRejection(channels);

    _wasHolding = _isHolding;
    _wouldBeWasHolding = _wouldBeIsHolding;
    _wasHoldSuppressed = _isHoldSuppressed;
    const bool timedOut = _isTouching && timeMs - _touchdownTimestamp_ms > _hold_timeout_ms;
    decideHold(timedOut, _wasHolding);
    decideTap(_wouldBeWasHolding);

    if (_isTap || (_wasHolding && !_isHolding)) {
        _lastEventTimestamp_ms = timeMs;
        _last_event_activeRegion = _activeRegion;
    }
}

void HandStats::trackPeak(const Pixel& channel) noexcept {
    if (channel._isActive && channel._progress > _peak_pixel_progress) {
        _peak_pixel_progress = channel._progress;
        _peak_pixel_index = channel._index;
    }
}

void HandStats::shiftTouchFlags(const ChannelSummary& channels) noexcept {
    _wasTouching = _isTouching;
    _isTouching = channels.anyActive;
    _wasAboveNoiseLevel = _isAboveNoiseLevel;
    _isAboveNoiseLevel = channels.anyAboveNoise;
}

void HandStats::stampEdges(unsigned int timeMs) noexcept {
    if (_isAboveNoiseLevel && !_wasAboveNoiseLevel) {
        _aboveNoiseTimestamp_ms = timeMs;
    } else if (!_isAboveNoiseLevel && _wasAboveNoiseLevel) {
        _belowNoiseTimestamp_ms = timeMs;
    }
    if (_isTouching && !_wasTouching) {
        _touchdownTimestamp_ms = timeMs;
    } else if (!_isTouching && _wasTouching) {
        _liftoffTimestamp_ms = timeMs;
    }
}

void HandStats::decideHold(bool timedOut, bool wasHolding) noexcept {
    if (!_enableHoldSuppression) {
        // The suppression flags deliberately stay as they are in this mode.
        _isHolding = timedOut;
        return;
    }
    const bool scoreTooLow = _touch_score < _touch_score_threshold;
    // A low score forbids a hold that has not begun; a hold in progress goes on.
    _isHolding = timedOut && (!scoreTooLow || wasHolding);
    _isHoldSuppressed = timedOut && scoreTooLow && !wasHolding;
    _wouldBeIsHolding = timedOut;
}

void HandStats::decideTap(bool wouldHaveHeld) noexcept {
    const bool liftedOff = !_isTouching && _wasTouching;
    _maybeTap = liftedOff && !wouldHaveHeld;
    if (!_enableTapSuppression) {
        _isTap = _maybeTap;
        return;
    }
    _isTap = _maybeTap && !_isTapSuppressed;
    // Only a lift-off that could have been a tap keeps the verdict of the classifier.
    _isTapSuppressed = _maybeTap && _isTapSuppressed;
}

void HandStats::updateTouchScore(const std::vector<Pixel>& pixels,
                                 const std::vector<VirtualPixel>& virtualPixels,
                                 unsigned int timeMs) {
    updateTouchScore(ChannelSummary::of(pixels, virtualPixels), timeMs);
}

void HandStats::updateTouchScore(const ChannelSummary& channels, unsigned int timeMs) noexcept {
    _svm.updateSVMScore(channels, _activationThreshold);
    if (_isAboveNoiseLevel && !_wasAboveNoiseLevel && _touch_score != 0.0F) {
        decayTouchScore(timeMs);
    }
    _touch_score += _svm._score;
    if (_touch_score > _touch_score_barrier) {
        _touch_score = _touch_score_barrier;
    } else if (_touch_score < -_touch_score_barrier) {
        _touch_score = -_touch_score_barrier;
    }
}

void HandStats::decayTouchScore(unsigned int timeMs) noexcept {
    const double sign = std::signbit(_touch_score) ? -1.0 : 1.0;
    const double magnitude = std::fabs(static_cast<double>(_touch_score));
    const std::uint32_t elapsedMs = (timeMs - 1U) - _belowNoiseTimestamp_ms;
    const double growth =
        std::exp(static_cast<double>(elapsedMs)) / (static_cast<double>(_y_cutoff) - 1.0);
    _touch_score = static_cast<float>(sign * std::max(0.0, magnitude * (1.0 - growth)));
}

void HandStats::updateTapRejection(const std::vector<Pixel>& pixels,
                                   const std::vector<VirtualPixel>& virtualPixels) {
    updateTapRejection(ChannelSummary::of(pixels, virtualPixels));
}

void HandStats::updateTapRejection(const ChannelSummary& channels) noexcept {
    _max_pixel_value = _peak_pixel_progress * _activationThreshold;
    // Unsigned 32-bit numbers compare in double as they do as integers.
    const std::uint32_t sinceQuiet = std::min(_liftoffTimestamp_ms - _aboveNoiseTimestamp_ms,
                                              _liftoffTimestamp_ms - _lastEventTimestamp_ms);
    const std::uint32_t touchDuration = _liftoffTimestamp_ms - _touchdownTimestamp_ms;
    _signalDerivative_thresholded = 0.0F;
    _touchingSignalDerivative_thresholded = 0.0F;
    _timeDurationRatio_thresholded = 0.0F;
    if (sinceQuiet != 0) {
        const auto duration = static_cast<float>(sinceQuiet);
        _signalDerivative_thresholded = _max_pixel_value / duration - 0.51F;
        _timeDurationRatio_thresholded = static_cast<float>(touchDuration) / duration - 0.25F;
    }
    if (touchDuration != 0) {
        _touchingSignalDerivative_thresholded =
            _max_pixel_value / static_cast<float>(touchDuration) - 0.65F;
    }

    // 22 channels of noise are more than any tap leaves behind.
    _nonActivePixels_thresholded = 21 - channels.neverActive;

    _tap_svm_score = _signalDerivative_thresholded * 0.2772F +
                     _timeDurationRatio_thresholded * 2.7205F +
                     static_cast<float>(_nonActivePixels_thresholded) * 0.1886F - 2.4116F;
    // At most zero for the first, below zero for the others: a touch without duration is always
    // rejected, while one that rose above noise at its lift-off is not.
    _isTapSuppressed = _touchingSignalDerivative_thresholded <= 0.0F ||
                       _signalDerivative_thresholded < 0.0F || _nonActivePixels_thresholded < 0 ||
                       _timeDurationRatio_thresholded < 0.0F || _tap_svm_score < 0.0F;
}

void HandStats::updateRegionMax(const std::vector<Pixel>& pixels) noexcept {
    _regionMax.fill(0.0F);
    for (const Pixel& pixel : pixels) {
        if (pixel._value <= kNoiseLevel) {
            continue;
        }
        const PixelRegion region = pixel.getPixelRegion();
        if (region != kRegionNone) {
            float& most = _regionMax[static_cast<std::size_t>(region)];
            most = largerOrOld(static_cast<float>(pixel._value) - static_cast<float>(kNoiseLevel),
                               most);
        }
    }
}

PixelRegion HandStats::updateActiveRegion(const std::vector<Pixel>& pixels,
                                          const std::vector<VirtualPixel>& virtualPixels,
                                          unsigned int timeMs) {
    PixelRegion region = regionAt(pixels, _peak_pixel_index);
    const auto [first, second] = topTwoAboveNoise(pixels);
    const float bias = updateTimeBiasFactor(timeMs);
    const float noiseProgress = static_cast<float>(kNoiseLevel) / _activationThreshold;
    const bool secondAboveNoise = second->_maxProgressAboveNoise > noiseProgress;

    // Shortly after an event its region keeps a touch that lies nearly as strongly on it.
    if (region != _last_event_activeRegion && secondAboveNoise &&
        first->getPixelRegion() == region && second->getPixelRegion() == _last_event_activeRegion &&
        second->_maxProgressAboveNoise > first->_maxProgressAboveNoise * bias) {
        region = _last_event_activeRegion;
    }

    // K lies between the pixels of the volume regions: a neighbour that shares the touch wins it.
    if (_peak_pixel_index == kPixelK && first->_index == kPixelK && secondAboveNoise) {
        const auto shares = [&](PixelRegion candidate, std::size_t group) {
            const float factor =
                _last_event_activeRegion == candidate ? smallerOrOld(bias, 0.7F) : 0.7F;
            return virtualPixels.at(group)._maxProgressAboveNoise >
                   factor * first->_maxProgressAboveNoise;
        };
        if (second->_index == kPixelM) {
            if (shares(kRegionVolumeDown, kGroupKLM)) {
                region = kRegionVolumeDown;
            }
        } else if (second->_index == kPixelI) {
            if (shares(kRegionVolumeUp, kGroupIJK)) {
                region = kRegionVolumeUp;
            }
        }
    }
    updateRegionMax(pixels);
    return region;
}

PixelRegion HandStats::changeActiveRegion(const std::vector<Pixel>& pixels, int channelIndex) {
    _previousActiveRegion = _activeRegion;
    const PixelRegion from = _activeRegion;
    const PixelRegion to = regionAt(pixels, channelIndex);
    if (to == from) {
        return from;
    }
    if (to == kRegionNone) {
        return kRegionNone;
    }
    if (from == kRegionNone) {
        return to;
    }

    const float& fromMax = _regionMax[static_cast<std::size_t>(from)];
    const float& toMax = _regionMax[static_cast<std::size_t>(to)];
    const float oldFromMax = fromMax;
    float oldLead = 0.0F;
    float drop = 0.0F;
    if (oldFromMax > 0.0F) {
        oldLead = toMax / oldFromMax;
        updateRegionMax(pixels);
        drop = largerOrOld(oldFromMax - fromMax, 0.0F) / oldFromMax;
    } else {
        updateRegionMax(pixels);
    }
    if (fromMax <= 0.0F) {
        return to;  // the old region is no longer above noise
    }
    // A region that fades fast is a finger lifting, which must not drag the hold away.
    _regionChangeThresh = fuzzifyAndClip(drop, 0.2F, 0.5F, 1.3F, 5.0F);
    return toMax / fromMax < oldLead * _regionChangeThresh ? from : to;
}

float HandStats::fuzzify(float x, float x0, float x1, float y0, float y1) noexcept {
    const float t = (x - x0) / (x1 - x0);
    const float low = (1.0F - t) * y0;
    const float high = t * y1;
    return low + high;
}

float HandStats::fuzzifyAndClip(float x, float x0, float x1, float y0, float y1) noexcept {
    if (x <= x0) {
        return y0;
    }
    if (x >= x1) {
        return y1;
    }
    return fuzzify(x, x0, x1, y0, y1);
}

float HandStats::updateTimeBiasFactor(unsigned int timeMs) const noexcept {
    const auto seconds =
        static_cast<float>(static_cast<double>(timeMs - _lastEventTimestamp_ms) * 0.001);
    return fuzzifyAndClip(seconds, 0.3F, 1.0F, 0.65F, 1.0F);
}

}  // namespace VexaTouch
