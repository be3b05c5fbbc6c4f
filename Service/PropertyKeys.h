#pragma once

#include <string_view>

/// The keys of a service's properties that it answers itself; the tables that use them are in
/// VexaTouchHIDService::getPropertyForKey and VexaTouchHIDService::debugInfo.
namespace VexaTouch::PropertyKey {

inline constexpr std::string_view kVersion = "Version";
inline constexpr std::string_view kRecording = "Recording";
inline constexpr std::string_view kDisjointImageCount = "DisjointImageCount";
inline constexpr std::string_view kFirmwareVersion = "FirmwareVersion";
inline constexpr std::string_view kFactoryResetHoldDuration = "FactoryResetHoldDuration";
inline constexpr std::string_view kCriticalErrors = "CriticalErrors";
inline constexpr std::string_view kServicePluginDebug = "ServicePluginDebug";

/// Keys of this domain go to the pipeline, without it.
inline constexpr std::string_view kPipelineDomain = "Pipeline";
/// What the pipeline and the algorithm tell of themselves.
inline constexpr std::string_view kPipelineDebugInfo = "Pipeline.DebugInfo";
inline constexpr std::string_view kAlgorithmDebugInfo = "Pipeline.Algs.DebugInfo";

}  // namespace VexaTouch::PropertyKey
