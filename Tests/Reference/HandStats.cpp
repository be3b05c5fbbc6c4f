#include "Tests/Reference/HandStats.h"

#include <algorithm>
#include <cmath>
#include <cstddef>

namespace VexaTouch::Reference {

namespace {

constexpr std::size_t kVirtualPixels = 23;

}  // namespace

void HandStats::SetDecayParameters() {
    _y_cutoff = 7.389056F;
}

void HandStats::Reset() {
    _touch_score = 0.0F;
    _max_pixel_value = 0.0F;
    _peak_pixel_progress = 0.0F;
    _peak_pixel_index = 0;
}

void HandStats::updateHandState(std::vector<Pixel> pixels, std::vector<VirtualPixel> virtualPixels,
                                unsigned int timeMs) {
    bool anyActive = false;
    bool anyAboveNoise = false;
    float strongestProgress = 0.0F;
    int strongestIndex = 0;
    const auto scan = [&](const Pixel& channel) {
        const float p = std::max(0.0F, channel._progress);
        if (channel._isAboveNoise) {
            anyAboveNoise = true;
        }
        if (channel._isActive) {
            anyActive = true;
            if (p > _peak_pixel_progress) {
                _peak_pixel_progress = p;
                _peak_pixel_index = channel._index;
            }
        }
        if (p > strongestProgress) {
            strongestProgress = p;
            strongestIndex = channel._index;
        }
    };
    for (const Pixel& pixel : pixels) {
        scan(pixel);
    }
    for (std::size_t i = 0; i < kVirtualPixels; ++i) {
        scan(virtualPixels.at(i));
    }

    _wasTouching = _isTouching;
    _isTouching = anyActive;
    _wasAboveNoiseLevel = _isAboveNoiseLevel;
    _isAboveNoiseLevel = anyAboveNoise;

    if (_isTouching) {
        if (_isHolding) {
            _activeRegion = changeActiveRegion(pixels, strongestIndex);
        } else {
            _activeRegion = updateActiveRegion(pixels, virtualPixels, timeMs);
        }
    }

    if (_isAboveNoiseLevel && !_wasAboveNoiseLevel) {
        _aboveNoiseTimestamp_ms = timeMs;
    }
    if (!_isAboveNoiseLevel && _wasAboveNoiseLevel) {
        _belowNoiseTimestamp_ms = timeMs;
    }
    if (_isTouching && !_wasTouching) {
        _touchdownTimestamp_ms = timeMs;
    }
    if (!_isTouching && _wasTouching) {
        _liftoffTimestamp_ms = timeMs;
    }

    updateTouchScore(pixels, virtualPixels, timeMs);
    updateTapRejection(pixels, virtualPixels);

    const bool oldIsHolding = _isHolding;
    const bool oldWouldBeIsHolding = _wouldBeIsHolding;
    _wasHolding = _isHolding;
    _wouldBeWasHolding = _wouldBeIsHolding;
    _wasHoldSuppressed = _isHoldSuppressed;
    const bool timedOut = _isTouching && (timeMs - _touchdownTimestamp_ms) > _hold_timeout_ms;

    if (!_enableHoldSuppression) {
        _isHolding = timedOut;
    } else {
        const bool scoreTooLow = _touch_score < _touch_score_threshold;
        if (!timedOut) {
            _isHolding = false;
        } else if (scoreTooLow) {
            _isHolding = oldIsHolding;
        } else {
            _isHolding = true;
        }
        _isHoldSuppressed = timedOut && scoreTooLow && !oldIsHolding;
        _wouldBeIsHolding = timedOut;
    }

    _maybeTap = !_isTouching && _wasTouching && !oldWouldBeIsHolding;
    if (!_enableTapSuppression) {
        _isTap = _maybeTap;
    } else {
        _isTap = _maybeTap && !_isTapSuppressed;
        if (!_isTouching && _wasTouching) {
            _maybeTap = !oldWouldBeIsHolding;
            if (oldWouldBeIsHolding) {
                _isTapSuppressed = false;
            }
        } else {
            _maybeTap = false;
            _isTapSuppressed = false;
        }
    }

    if (_isTap || (oldIsHolding && !_isHolding)) {
        _lastEventTimestamp_ms = timeMs;
        _last_event_activeRegion = _activeRegion;
    }
}

void HandStats::updateTouchScore(const std::vector<Pixel>& pixels,
                                 const std::vector<VirtualPixel>& virtualPixels,
                                 unsigned int timeMs) {
    _svm.updateSVMScore(pixels, virtualPixels, _activationThreshold, timeMs);
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

void HandStats::decayTouchScore(unsigned int timeMs) {
    const double sign = std::signbit(_touch_score) ? -1.0 : 1.0;
    const double m = std::fabs(static_cast<double>(_touch_score));
    const std::uint32_t elapsed = (timeMs - 1U) - _belowNoiseTimestamp_ms;
    const double dt = static_cast<double>(elapsed);
    const double decayed = m * (1.0 - std::exp(dt) / (static_cast<double>(_y_cutoff) - 1.0));
    _touch_score = static_cast<float>(sign * std::max(0.0, decayed));
}

void HandStats::updateTapRejection(const std::vector<Pixel>& pixels,
                                   const std::vector<VirtualPixel>& virtualPixels) {
    _max_pixel_value = _peak_pixel_progress * _activationThreshold;

    const std::uint32_t sinceNoise = _liftoffTimestamp_ms - _aboveNoiseTimestamp_ms;
    const std::uint32_t sinceEvent = _liftoffTimestamp_ms - _lastEventTimestamp_ms;
    const auto d = static_cast<std::uint32_t>(
        std::min(static_cast<double>(sinceNoise), static_cast<double>(sinceEvent)));
    const std::uint32_t T = _liftoffTimestamp_ms - _touchdownTimestamp_ms;

    _signalDerivative_thresholded = 0.0F;
    _touchingSignalDerivative_thresholded = 0.0F;
    _timeDurationRatio_thresholded = 0.0F;
    _nonActivePixels_thresholded = 0;
    if (d != 0) {
        _signalDerivative_thresholded = _max_pixel_value / static_cast<float>(d) - 0.51F;
        _timeDurationRatio_thresholded = static_cast<float>(T) / static_cast<float>(d) - 0.25F;
    }
    if (T != 0) {
        _touchingSignalDerivative_thresholded = _max_pixel_value / static_cast<float>(T) - 0.65F;
    }

    int n = 0;
    for (const Pixel& pixel : pixels) {
        if (pixel._wasAboveNoise && !pixel._wasActive) {
            ++n;
        }
    }
    for (std::size_t i = 0; i < kVirtualPixels; ++i) {
        const VirtualPixel& pixel = virtualPixels.at(i);
        if (pixel._wasAboveNoise && !pixel._wasActive) {
            ++n;
        }
    }
    _nonActivePixels_thresholded = 21 - n;

    _tap_svm_score = _signalDerivative_thresholded * 0.2772F +
                     _timeDurationRatio_thresholded * 2.7205F +
                     static_cast<float>(_nonActivePixels_thresholded) * 0.1886F - 2.4116F;

    _isTapSuppressed = _touchingSignalDerivative_thresholded <= 0.0F ||
                       _signalDerivative_thresholded < 0.0F || _nonActivePixels_thresholded < 0 ||
                       _timeDurationRatio_thresholded < 0.0F || _tap_svm_score < 0.0F;
}

void HandStats::updateRegionMax(const std::vector<Pixel>& pixels) {
    for (float& value : _regionMax) {
        value = 0.0F;
    }
    for (const Pixel& pixel : pixels) {
        const PixelRegion r = pixel.getPixelRegion();
        if (r == 0) {
            continue;
        }
        const float v = static_cast<float>(pixel._value) - 75.0F;
        if (v > 0.0F) {
            float& largest = _regionMax[static_cast<std::size_t>(r)];
            largest = std::max(largest, v);
        }
    }
}

PixelRegion HandStats::updateActiveRegion(const std::vector<Pixel>& pixels,
                                          const std::vector<VirtualPixel>& virtualPixels,
                                          unsigned int timeMs) {
    PixelRegion r = pixels[static_cast<std::size_t>(_peak_pixel_index)].getPixelRegion();

    std::vector<Pixel> sorted = pixels;
    std::sort(sorted.begin(), sorted.end(), [](const Pixel& a, const Pixel& b) {
        if (a._maxProgressAboveNoise != b._maxProgressAboveNoise) {
            return a._maxProgressAboveNoise > b._maxProgressAboveNoise;
        }
        return a._index < b._index;  // equals stay in channel order
    });
    const Pixel& first = sorted[0];
    const Pixel& second = sorted[1];

    const float b = updateTimeBiasFactor(timeMs);
    const float noiseProgress = 75.0F / _activationThreshold;

    if (r != _last_event_activeRegion && second._maxProgressAboveNoise > noiseProgress &&
        first.getPixelRegion() == r && second.getPixelRegion() == _last_event_activeRegion &&
        second._maxProgressAboveNoise > first._maxProgressAboveNoise * b) {
        r = _last_event_activeRegion;
    }

    if (_peak_pixel_index == 10 && first._index == 10 &&
        second._maxProgressAboveNoise > noiseProgress) {
        const float k = first._maxProgressAboveNoise;
        if (second._index == 12) {
            float f = 0.7F;
            if (_last_event_activeRegion == 2) {
                f = std::min(0.7F, b);
            }
            if (virtualPixels.at(19)._maxProgressAboveNoise > f * k) {
                r = 2;
            }
        } else if (second._index == 8) {
            float f = 0.7F;
            if (_last_event_activeRegion == 3) {
                f = std::min(0.7F, b);
            }
            if (virtualPixels.at(18)._maxProgressAboveNoise > f * k) {
                r = 3;
            }
        }
    }

    updateRegionMax(pixels);
    return r;
}

PixelRegion HandStats::changeActiveRegion(const std::vector<Pixel>& pixels, int channelIndex) {
    const PixelRegion o = _activeRegion;
    _previousActiveRegion = o;
    const PixelRegion n = pixels[static_cast<std::size_t>(channelIndex)].getPixelRegion();
    if (n == o) {
        return o;
    }
    if (n == 0) {
        return 0;
    }
    if (o == 0) {
        return n;
    }

    const auto oldRegion = static_cast<std::size_t>(o);
    const auto newRegion = static_cast<std::size_t>(n);
    const float m = _regionMax[oldRegion];
    float q = 0.0F;
    float drop = 0.0F;
    if (m > 0.0F) {
        q = _regionMax[newRegion] / m;
        updateRegionMax(pixels);
        drop = std::max(0.0F, m - _regionMax[oldRegion]) / m;
    } else {
        updateRegionMax(pixels);
    }

    if (_regionMax[oldRegion] <= 0.0F) {
        return n;
    }
    _regionChangeThresh = fuzzifyAndClip(drop, 0.2F, 0.5F, 1.3F, 5.0F);
    if (_regionMax[newRegion] / _regionMax[oldRegion] < q * _regionChangeThresh) {
        return o;
    }
    return n;
}

float HandStats::fuzzify(float x, float x0, float x1, float y0, float y1) {
    const float t = (x - x0) / (x1 - x0);
    const float low = (1.0F - t) * y0;
    const float high = t * y1;
    return low + high;
}

float HandStats::fuzzifyAndClip(float x, float x0, float x1, float y0, float y1) {
    if (x <= x0) {
        return y0;
    }
    if (x >= x1) {
        return y1;
    }
    return fuzzify(x, x0, x1, y0, y1);
}

float HandStats::updateTimeBiasFactor(unsigned int timeMs) const {
    const std::uint32_t sinceEvent = timeMs - _lastEventTimestamp_ms;
    const auto s = static_cast<float>(static_cast<double>(sinceEvent) * 0.001);
    return fuzzifyAndClip(s, 0.3F, 1.0F, 0.65F, 1.0F);
}

}  // namespace VexaTouch::Reference
