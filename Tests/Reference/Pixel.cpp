#include "Tests/Reference/Pixel.h"

#include <algorithm>

namespace VexaTouch::Reference {

Pixel::Pixel(int index, float normalizationFactor)
    : _normalizationFactor(normalizationFactor), _index(index) {}

void Pixel::updatePixelState(int sample, float activationThreshold) {
    _value = static_cast<std::int32_t>(static_cast<float>(sample) * _normalizationFactor);

    float threshold = 0.0F;
    if (_isActive) {
        threshold = _peakProgress * 0.6F;
    } else {
        threshold = std::max(1.0F, _valleyProgress / 0.6F);
    }

    _progress = static_cast<float>(_value) / activationThreshold;
    _isActive = _progress > threshold;

    // std::max and std::min return their first argument on a tie and when the comparison is
    // unordered, so the old value stands first.
    if (_isActive) {
        _peakProgress = std::max(_peakProgress, _progress);
        _valleyProgress = _progress;
        _wasActive = true;
    } else {
        _peakProgress = _progress;
        _valleyProgress = std::min(_valleyProgress, _progress);
    }

    _isAboveNoise = _value > 75;
    if (_value >= 76) {
        _wasAboveNoise = true;
        _maxProgressAboveNoise = std::max(_maxProgressAboveNoise, _progress);
    }
}

PixelRegion Pixel::getPixelRegion() const {
    const std::uint32_t bit = std::uint32_t{1} << (static_cast<std::uint32_t>(_index) % 32);
    if (bit & 0x3C0) {
        return 3;
    }
    if (bit & 0x7800) {
        return 2;
    }
    if (bit & 0x43F) {
        return 1;
    }
    return 0;
}

void Pixel::resetGlobalStats() {
    _wasAboveNoise = false;
    _wasActive = false;
    _maxProgressAboveNoise = 0.0F;
}

}  // namespace VexaTouch::Reference
