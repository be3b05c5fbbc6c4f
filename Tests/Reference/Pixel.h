#pragma once

#include <cstdint>

/// The algorithm read literally, step by step, with every copy and full sort that the description
/// of the steps makes. It shares no code and no table with `Algorithm`, so that the two can be held
/// against each other; fields have the same names. Test-only.
namespace VexaTouch::Reference {

using PixelRegion = std::int32_t;

class Pixel {
public:
    Pixel(int index, float normalizationFactor);

    void updatePixelState(int sample, float activationThreshold);
    PixelRegion getPixelRegion() const;
    void resetGlobalStats();

    std::int32_t _value = 0;
    float _normalizationFactor;
    float _progress = 0.0F;
    float _peakProgress = 0.0F;
    float _valleyProgress = 0.0F;
    bool _isActive = false;
    bool _isAboveNoise = false;
    bool _wasAboveNoise = false;
    bool _wasActive = false;
    float _maxProgressAboveNoise = 0.0F;
    std::int32_t _index;
};

}  // namespace VexaTouch::Reference
