#pragma once

#include <string_view>

namespace VexaTouch {

/// Member names, type names and fault texts of the recording container.
namespace Container {

inline constexpr unsigned kVersion = 1;

inline constexpr std::string_view Version = "Version";
inline constexpr std::string_view Frames = "Frames";
inline constexpr std::string_view Reports = "Reports";  // version 0

inline constexpr std::string_view Type = "Type";
inline constexpr std::string_view Timestamp = "Timestamp";
inline constexpr std::string_view Key = "Key";
inline constexpr std::string_view Value = "Value";
inline constexpr std::string_view Report = "Report";
inline constexpr std::string_view ReportData = "ReportData";  // version 0

inline constexpr std::string_view TypeInputReport = "InputReport";
inline constexpr std::string_view TypeState = "State";

inline constexpr const char* InvalidContainer = "invalid container";
inline constexpr const char* InvalidVersion = "invalid version";
inline constexpr const char* InvalidContainerVersion = "invalid container version: ";
inline constexpr const char* FrameLacksTimestamp = "frame lacks Timestamp";
inline constexpr const char* FrameLacksReportData = "frame lacks ReportData";
inline constexpr const char* MigrationFailed = "migrateSerializedContainer failed: ";
inline constexpr const char* InvalidFrames = "invalid frames";
inline constexpr const char* InvalidFrameType = "invalid frame type";
inline constexpr const char* InvalidFrameTimestamp = "invalid frame timestamp";
inline constexpr const char* InvalidStateKey = "invalid state key";
inline constexpr const char* InvalidStateValue = "invalid state value class";
inline constexpr const char* InvalidReport = "invalid report";
inline constexpr const char* InvalidHexString = "invalid hex string";

}  // namespace Container
}  // namespace VexaTouch
