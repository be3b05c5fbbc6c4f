#include "Tests/Reference/Algs.h"

#include <array>
#include <cstddef>
#include <cstdio>
#include <optional>
#include <sstream>

namespace VexaTouch::Reference {

namespace {

template <typename... Arguments>
std::string formatted(const char* format, Arguments... arguments) {
    std::array<char, 1024> buffer{};
    std::snprintf(buffer.data(), buffer.size(), format, arguments...);
    return buffer.data();
}

Vexa::HidEvent digitizerEvent(std::uint32_t eventMask, PixelRegion verticalCoordinate,
                              Vexa::HidEventPhase phase) {
    Vexa::DigitizerEventRecord record;
    record.transducerType = 2;
    record.eventMask = eventMask;
    record.y = static_cast<double>(static_cast<std::uint32_t>(verticalCoordinate));
    Vexa::HidEvent event = Vexa::HidEvent::digitizer(record);
    if (phase != Vexa::HidEventPhase::None) {
        event.setPhase(phase);
    }
    return event;
}

/// The number after "VirtualNormalizationFactors.", or nothing for a key without that domain.
std::optional<int> factorIndex(const std::string& key) {
    const std::string prefix = "VirtualNormalizationFactors.";
    if (!key.starts_with(prefix)) {
        return std::nullopt;
    }
    std::istringstream stream(key.substr(prefix.size()));
    int index = 0;
    stream >> index;
    return index;
}

}  // namespace

Algs::Algs() {
    const std::array<float, 15> gains = {1.9219F, 1.8833F, 1.9281F, 1.8837F, 1.9163F,
                                         1.8105F, 1.0081F, 1.0F,    1.4851F, 1.5033F,
                                         2.4154F, 1.5378F, 1.5431F, 1.04F,   1.0493F};
    _touchPixels.reserve(15);
    for (int i = 0; i < 15; ++i) {
        _touchPixels.emplace_back(i, gains[static_cast<std::size_t>(i)]);
    }
    const std::vector<std::string>& groups = _virtual_image._neighborPixelGroups;
    _virtualPixels.reserve(groups.size());
    for (std::size_t i = 0; i < groups.size(); ++i) {
        _virtualPixels.emplace_back(groups[i], static_cast<signed char>(groups[i][0]),
                                    _virtual_image._normalizationFactors[i]);
    }
}

std::vector<Vexa::HidEvent> Algs::handleImage(const InputReport::Image& image) {
    std::vector<Vexa::HidEvent> events;
    processTouchFrame(image.signedPixels.data(), image.frameNumber, image.timestampMs, events);
    return events;
}

std::vector<Vexa::HidEvent> Algs::handleReset() {
    std::vector<Vexa::HidEvent> events;
    const std::array<std::int16_t, 15> samples{};
    processTouchFrame(samples.data(), 0, 0, events);
    return events;
}

void Algs::processTouchFrame(const std::int16_t* samples, std::uint32_t frameNumber,
                             std::uint32_t timeMs, std::vector<Vexa::HidEvent>& events) {
    for (std::size_t i = 0; i < 15; ++i) {
        _touchPixels[i].updatePixelState(samples[i], _handStats._activationThreshold);
    }
    _virtual_image.updateValues(_touchPixels);
    for (std::size_t i = 0; i < _virtual_image._neighborPixelGroups.size(); ++i) {
        const auto sample = static_cast<std::int16_t>(_virtual_image._values.at(i));
        _virtualPixels.at(i).updatePixelState(sample, _handStats._activationThreshold,
                                              _virtual_image._maxPixelIndex.at(i));
    }
    _handStats.updateHandState(_touchPixels, _virtualPixels, timeMs);

    const HandStats& h = _handStats;
    std::optional<Vexa::HidEvent> event;
    if (h._isTouching && !h._wasTouching) {
        event = createMayBeginEvent(h._activeRegion);
    } else if (h._isHolding && !h._wasHolding) {
        event = createHoldStartEvent(h._activeRegion);
    } else if (h._isHolding && h._wasHolding && h._activeRegion != h._previousActiveRegion) {
        event = createHoldChangeEvent(h._activeRegion);
    } else if (!h._isHolding && h._wasHolding) {
        event = createHoldEndEvent(h._activeRegion);
        Reset();
    } else if (h._isTap) {
        event = createTapEvent(h._activeRegion);
        Reset();
    } else if (!h._isTouching && h._wasTouching && _lastDispatchedPhase == 0x80) {
        event = createCancelEvent();
        Reset();
    } else if (!h._isTouching && h._wasTouching) {
        Reset();
    }

    if (event) {
        event->setIntegerField(Vexa::HidEventField::DigitizerFrameNumber, frameNumber);
        _lastDispatchedPhase = static_cast<std::uint16_t>(event->phase());
        events.push_back(*event);
    }
    _EventStats.update(_handStats);
    logFrame(samples, frameNumber, timeMs);
}

void Algs::Reset() {
    for (std::size_t i = 0; i < 15; ++i) {
        _touchPixels[i].resetGlobalStats();
    }
    for (VirtualPixel& pixel : _virtualPixels) {
        pixel.resetGlobalStats();
    }
    _handStats.Reset();
}

Vexa::HidEvent Algs::createMayBeginEvent(PixelRegion region) {
    return digitizerEvent(0, region, Vexa::HidEventPhase::MayBegin);
}

Vexa::HidEvent Algs::createHoldStartEvent(PixelRegion region) {
    return digitizerEvent(2, region, Vexa::HidEventPhase::Began);
}

Vexa::HidEvent Algs::createHoldChangeEvent(PixelRegion region) {
    return digitizerEvent(2, region, Vexa::HidEventPhase::Changed);
}

Vexa::HidEvent Algs::createHoldEndEvent(PixelRegion region) {
    return digitizerEvent(2, region, Vexa::HidEventPhase::Ended);
}

Vexa::HidEvent Algs::createTapEvent(PixelRegion region) {
    return digitizerEvent(131072, region, Vexa::HidEventPhase::None);
}

Vexa::HidEvent Algs::createCancelEvent() {
    return digitizerEvent(0, 0, Vexa::HidEventPhase::Cancelled);
}

Vexa::PropertyValue Algs::getState(const std::string& key) const {
    if (key == "EnableHoldSuppression") {
        return _handStats._enableHoldSuppression;
    }
    if (key == "EnableTapSuppression") {
        return _handStats._enableTapSuppression;
    }
    if (key == "HoldTimeoutMilliseconds") {
        return _handStats._hold_timeout_ms;
    }
    if (key == "ActivationThreshold") {
        return _handStats._activationThreshold;
    }
    if (const std::optional<int> index = factorIndex(key)) {
        const std::vector<float>& factors = _virtual_image._normalizationFactors;
        const auto position = static_cast<std::size_t>(*index);
        return position < factors.size() ? Vexa::PropertyValue(factors[position])
                                         : Vexa::PropertyValue();
    }
    if (key == "EventStats") {
        return _EventStats.statsDictionary();
    }
    if (key == "DebugInfo") {
        return Vexa::PropertyValue::Dictionary{{"EventStats", _EventStats.statsDictionary()}};
    }
    return {};
}

void Algs::setState(const std::string& key, Vexa::PropertyValue value) {
    if (key == "EnableHoldSuppression") {
        _handStats._enableHoldSuppression = value.toBoolean();
        return;
    }
    if (key == "EnableTapSuppression") {
        _handStats._enableTapSuppression = value.toBoolean();
        return;
    }
    if (key == "ResetEventStats") {
        _EventStats.Reset();
        return;
    }
    if (key == "ActivationThreshold") {
        _handStats._activationThreshold = value.toFloat();
        return;
    }
    if (const std::optional<int> index = factorIndex(key)) {
        std::vector<float>& factors = _virtual_image._normalizationFactors;
        const auto position = static_cast<std::size_t>(*index);
        if (position < factors.size()) {
            factors[position] = value.toFloat();
        }
        return;
    }
    if (key == "HoldTimeoutMilliseconds") {
        _handStats._hold_timeout_ms = static_cast<std::uint32_t>(value.toUnsigned64());
    }
}

void Algs::logFrame(const std::int16_t* samples, std::uint32_t frameNumber, std::uint32_t timeMs) {
    if (_log.isEnabled(Vexa::LogLevel::Debug)) {
        _log.write(Vexa::LogLevel::Debug,
                   formatted("Frame %u @%ums, *** Event Stats ***\n", frameNumber, timeMs) +
                       _EventStats.statsDictionary().description());
    }
    if (_log.isEnabled(Vexa::LogLevel::Debug)) {
        _log.write(
            Vexa::LogLevel::Debug,
            formatted("Frame %u @%ums, *** Touch State Description ***\n", frameNumber, timeMs) +
                touchStateDescription(samples, timeMs));
    }
    if (_log.isEnabled(Vexa::LogLevel::Debug)) {
        _log.write(
            Vexa::LogLevel::Debug,
            formatted("Frame %u @%ums, *** Virtual State Description ***\n", frameNumber, timeMs) +
                virtualStateDescription(samples, timeMs));
    }
}

std::string Algs::touchStateDescription(const std::int16_t* samples, unsigned int timeMs) const {
    std::string text = prefixText();
    for (std::size_t i = 0; i < 15; ++i) {
        const Pixel& pixel = _touchPixels[i];
        text += formatted("%c=%4d %4d%s", 'A' + pixel._index, samples[i], pixel._value,
                          pixel._isActive ? "<==ON" : "");
        if (i + 1 < 15) {
            text += ", ";
        }
    }
    return text + "] " + phaseText(timeMs);
}

std::string Algs::virtualStateDescription(const std::int16_t* /*samples*/,
                                          unsigned int timeMs) const {
    std::string text = prefixText();
    for (std::size_t i = 0; i < 23; ++i) {
        const VirtualPixel& pixel = _virtualPixels.at(i);
        text += formatted("%s=%4d%s", pixel._name.c_str(), pixel._value,
                          pixel._isActive ? "<==ON" : "");
        if (i + 1 < 23) {
            text += ", ";
        }
    }
    return text + "] " + phaseText(timeMs);
}

std::string Algs::prefixText() const {
    const HandStats& h = _handStats;
    return formatted(
        "ts=%f, sd=%f, tsd=%f, NonActivePixels=%d, TimeDurationRatio=%f, TapSVMScore=%f, [",
        static_cast<double>(h._touch_score), static_cast<double>(h._signalDerivative_thresholded),
        static_cast<double>(h._touchingSignalDerivative_thresholded),
        h._nonActivePixels_thresholded, static_cast<double>(h._timeDurationRatio_thresholded),
        static_cast<double>(h._tap_svm_score));
}

std::string Algs::phaseText(unsigned int timeMs) const {
    const HandStats& h = _handStats;
    const auto sinceTouchdown = static_cast<int>(timeMs - h._touchdownTimestamp_ms);
    const auto touchDuration = static_cast<int>(h._liftoffTimestamp_ms - h._touchdownTimestamp_ms);
    const int region = h._activeRegion;
    const char* const noise = h._isAboveNoiseLevel ? "ABOVENOISE" : "BELOWNOISE";
    if (h._isTouching && !h._wasTouching) {
        return formatted("STARTTOUCH %dms ActiveRegion=%d", sinceTouchdown, region);
    }
    if (h._isHolding && h._wasHolding) {
        return formatted("HOLDING %dms ActiveRegion=%d", sinceTouchdown, region);
    }
    if (h._isHolding) {
        return formatted("STARTHOLD %dms ActiveRegion=%d", sinceTouchdown, region);
    }
    if (h._isHoldSuppressed) {
        return formatted("SUPPRESSHOLD %dms ActiveRegion=%d", sinceTouchdown, region);
    }
    if (h._isTouching) {
        return formatted("TOUCHING %dms ActiveRegion=%d", sinceTouchdown, region);
    }
    if (h._wasHolding) {
        return formatted("ENDHOLD %dms ActiveRegion=%d %s", touchDuration, region, noise);
    }
    if (h._maybeTap && !h._isTap) {
        return formatted("SUPPRESSTAP %dms ActiveRegion=%d %s", sinceTouchdown, region, noise);
    }
    if (h._isTap) {
        return formatted("TAP %dms ActiveRegion=%d %s", touchDuration, region, noise);
    }
    if (h._wasTouching) {
        return formatted("ENDTOUCH %dms ActiveRegion=%d %s", touchDuration, region, noise);
    }
    return "";
}

}  // namespace VexaTouch::Reference
