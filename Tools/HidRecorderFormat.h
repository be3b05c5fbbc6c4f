#pragma once

#include <string_view>

/// The comments that carry what the HID recorder's format has no line for.
namespace VexaTouch::Tools::HidRecorderFormat {

inline constexpr std::string_view kCommentPrefix = "# vexatouch: ";
/// `start NS`: the recorded time of the events' zero, for the events that follow.
inline constexpr std::string_view kStart = "start";
/// `nanoseconds N`: the part of the next event's time below a microsecond, 1 to 999.
inline constexpr std::string_view kNanoseconds = "nanoseconds";
/// `state NS KEY [VALUE]`: a state frame; key and value as JSON.
inline constexpr std::string_view kState = "state";
/// `empty-report NS`: a report of no bytes, which the HID tools' replayer would refuse.
inline constexpr std::string_view kEmptyReport = "empty-report";

inline constexpr unsigned long long kNanosecondsPerSecond = 1'000'000'000;

}  // namespace VexaTouch::Tools::HidRecorderFormat
