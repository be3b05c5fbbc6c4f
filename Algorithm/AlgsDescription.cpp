#include "Algorithm/Algs.h"

#include <cstdarg>
#include <cstddef>
#include <cstdio>

namespace VexaTouch {

namespace {

constexpr const char* kActiveMark = "<==ON";

__attribute__((format(printf, 1, 2))) std::string formatted(const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    std::va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(nullptr, 0, format, arguments);
    va_end(arguments);
    std::string text(static_cast<std::size_t>(length) + 1, '\0');
    std::vsnprintf(text.data(), text.size(), format, again);
    va_end(again);
    text.pop_back();
    return text;
}

void appendGroup(std::string& groups, const std::string& group) {
    if (!groups.empty()) {
        groups += ", ";
    }
    groups += group;
}

const char* activeMark(const Pixel& pixel) noexcept {
    return pixel._isActive ? kActiveMark : "";
}

}  // namespace

std::string Algs::phaseDescription(unsigned int timeMs) const {
    const HandStats& hand = _handStats;
    const std::uint32_t sinceTouchdown = timeMs - hand._touchdownTimestamp_ms;
    const std::uint32_t touchDuration = hand._liftoffTimestamp_ms - hand._touchdownTimestamp_ms;
    const auto phase = [&hand](const char* name, std::uint32_t duration) {
        return formatted("%s %dms ActiveRegion=%d", name, static_cast<int>(duration),
                         hand._activeRegion);
    };
    const auto endPhase = [&](const char* name, std::uint32_t duration) {
        return phase(name, duration) + (hand._isAboveNoiseLevel ? " ABOVENOISE" : " BELOWNOISE");
    };

    if (hand._isTouching && !hand._wasTouching) {
        return phase("STARTTOUCH", sinceTouchdown);
    }
    if (hand._isHolding) {
        return phase(hand._wasHolding ? "HOLDING" : "STARTHOLD", sinceTouchdown);
    }
    if (hand._isHoldSuppressed) {
        return phase("SUPPRESSHOLD", sinceTouchdown);
    }
    if (hand._isTouching) {
        return phase("TOUCHING", sinceTouchdown);
    }
    if (hand._wasHolding) {
        return endPhase("ENDHOLD", touchDuration);
    }
    if (hand._maybeTap && !hand._isTap) {
        return endPhase("SUPPRESSTAP", sinceTouchdown);
    }
    if (hand._isTap) {
        return endPhase("TAP", touchDuration);
    }
    if (hand._wasTouching) {
        return endPhase("ENDTOUCH", touchDuration);
    }
    return {};
}

std::string Algs::describeFrame(const std::string& channels, unsigned int timeMs) const {
    const HandStats& hand = _handStats;
    return formatted(
               "ts=%f, sd=%f, tsd=%f, NonActivePixels=%d, TimeDurationRatio=%f, "
               "TapSVMScore=%f, [",
               static_cast<double>(hand._touch_score),
               static_cast<double>(hand._signalDerivative_thresholded),
               static_cast<double>(hand._touchingSignalDerivative_thresholded),
               hand._nonActivePixels_thresholded,
               static_cast<double>(hand._timeDurationRatio_thresholded),
               static_cast<double>(hand._tap_svm_score)) +
           channels + "] " + phaseDescription(timeMs);
}

std::string Algs::touchStateDescription(const std::int16_t* samples, unsigned int timeMs) const {
    std::string groups;
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        const Pixel& pixel = _touchPixels[i];
        appendGroup(groups, formatted("%c=%4d %4d%s", 'A' + pixel._index, samples[i], pixel._value,
                                      activeMark(pixel)));
    }
    return describeFrame(groups, timeMs);
}

std::string Algs::virtualStateDescription(const std::int16_t* /*samples*/,
                                          unsigned int timeMs) const {
    std::string groups;
    for (std::size_t i = 0; i < kVirtualPixelCount; ++i) {
        const VirtualPixel& pixel = _virtualPixels[i];
        appendGroup(groups,
                    formatted("%s=%4d%s", pixel._name.c_str(), pixel._value, activeMark(pixel)));
    }
    return describeFrame(groups, timeMs);
}

void Algs::logFrame(const std::int16_t* samples, std::uint32_t frameNumber,
                    std::uint32_t timeMs) const {
    // Readiness is tested before each text, since building one costs more than a whole frame.
    const auto log = [&](const char* title, const auto& text) {
        if (_log.isEnabled(Vexa::LogLevel::Debug)) {
            _log.write(
                Vexa::LogLevel::Debug,
                formatted("Frame %u @%ums, *** %s ***\n", frameNumber, timeMs, title) + text());
        }
    };
    log("Event Stats", [&] { return _EventStats.statsDictionary().description(); });
    log("Touch State Description", [&] { return touchStateDescription(samples, timeMs); });
    log("Virtual State Description", [&] { return virtualStateDescription(samples, timeMs); });
}

}  // namespace VexaTouch
