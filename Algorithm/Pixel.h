#pragma once

#include "Algorithm/PixelTable.h"

#include <cstdint>

namespace VexaTouch {

/// "The larger of" two numbers: `old` stays on a tie and when they do not compare.
constexpr float largerOrOld(float candidate, float old) noexcept {
    return candidate > old ? candidate : old;
}

/// "The smaller of" two numbers: `old` stays on a tie and when they do not compare.
constexpr float smallerOrOld(float candidate, float old) noexcept {
    return candidate < old ? candidate : old;
}

/// A raw sample times its channel's gain, truncated toward zero.
constexpr std::int32_t scaledSample(int sample, float gain) noexcept {
    return static_cast<std::int32_t>(static_cast<float>(sample) * gain);
}

/// A scaled sample in units of the activation threshold.
constexpr float progressOf(std::int32_t value, float activationThreshold) noexcept {
    return static_cast<float>(value) / activationThreshold;
}

/// The per-frame state of one sensor channel: the scaled sample, its progress toward the activation
/// threshold, an on/off decision with hysteresis and statistics that accumulate over one touch.
class Pixel {
public:
    /// An inactive pixel that has seen nothing.
    Pixel(int index, float normalizationFactor) noexcept
        : _normalizationFactor(normalizationFactor), _index(index) {}

    /// One frame's update. `sample` is the frame's raw value within 16 signed bits,
    /// `activationThreshold` the value that counts as progress 1.0; any float is accepted.
    void updatePixelState(int sample, float activationThreshold) noexcept;

    /// The rest of updatePixelState, from the scaled sample and its progress on.
    void takeProgress(std::int32_t value, float progress) noexcept;

    /// The region of `_index`.
    [[nodiscard]] PixelRegion getPixelRegion() const noexcept { return pixelRegionOfIndex(_index); }

    /// Forgets the touch: the three sticky statistics and nothing else.
    void resetGlobalStats() noexcept;

    std::int32_t _value = 0;              ///< sample times gain, truncated toward zero
    float _normalizationFactor;           ///< gain, fixed at construction
    float _progress = 0.0F;               ///< `_value` over the activation threshold
    float _peakProgress = 0.0F;           ///< highest progress since the pixel last became active
    float _valleyProgress = 0.0F;         ///< lowest progress since the pixel last became inactive
    bool _isActive = false;               ///< on/off decision of this frame
    bool _isAboveNoise = false;           ///< `_value` is above the noise level in this frame
    bool _wasAboveNoise = false;          ///< sticky: was above noise since the last reset
    bool _wasActive = false;              ///< sticky: was active since the last reset
    float _maxProgressAboveNoise = 0.0F;  ///< sticky: highest progress while above noise
    std::int32_t _index;                  ///< 0 to 14; of a virtual pixel its strongest member's
};

inline void Pixel::updatePixelState(int sample, float activationThreshold) noexcept {
    const std::int32_t value = scaledSample(sample, _normalizationFactor);
    takeProgress(value, progressOf(value, activationThreshold));
}

inline void Pixel::takeProgress(std::int32_t value, float progress) noexcept {
    constexpr float kHysteresis = 0.6F;
    _value = value;
    _progress = progress;
    // The decision of the previous frame chooses the edge of the hysteresis. The edge to turn on
    // is never below 1.0, so most pixels need not know theirs.
    if (_isActive) {
        _isActive = _progress > _peakProgress * kHysteresis;
    } else if (_progress > 1.0F) {
        _isActive = _progress > largerOrOld(_valleyProgress / kHysteresis, 1.0F);
    }
    if (_isActive) {
        _peakProgress = largerOrOld(_progress, _peakProgress);
        _valleyProgress = _progress;
        _wasActive = true;
    } else {
        _peakProgress = _progress;
        _valleyProgress = smallerOrOld(_progress, _valleyProgress);
    }
    _isAboveNoise = _value > kNoiseLevel;
    if (_isAboveNoise) {
        _wasAboveNoise = true;
        _maxProgressAboveNoise = largerOrOld(_progress, _maxProgressAboveNoise);
    }
}

inline void Pixel::resetGlobalStats() noexcept {
    _wasAboveNoise = false;
    _wasActive = false;
    _maxProgressAboveNoise = 0.0F;
}

}  // namespace VexaTouch
