#pragma once

#include <array>
#include <string_view>

namespace VexaTouch {

/// The names under which the algorithm's settings and counters are read and written.
namespace StateKey {
inline constexpr std::string_view EnableHoldSuppression = "EnableHoldSuppression";
inline constexpr std::string_view EnableTapSuppression = "EnableTapSuppression";
inline constexpr std::string_view HoldTimeoutMilliseconds = "HoldTimeoutMilliseconds";
inline constexpr std::string_view ActivationThreshold = "ActivationThreshold";
/// A domain: a dot and the index of a pixel group follow.
inline constexpr std::string_view VirtualNormalizationFactors = "VirtualNormalizationFactors";
inline constexpr std::string_view EventStats = "EventStats";
inline constexpr std::string_view DebugInfo = "DebugInfo";
inline constexpr std::string_view ResetEventStats = "ResetEventStats";
}  // namespace StateKey

/// What a key is, for programs and people that list them.
struct StateKeyEntry {
    std::string_view name;
    bool readable;
    bool writable;
    bool indexed;  ///< a dot and an index below kVirtualPixelCount follow the name
    std::string_view type;
    std::string_view defaultValue;  ///< as JSON, empty where there is none
    std::string_view summary;
};

inline constexpr std::array<StateKeyEntry, 8> kStateKeys = {{
    {StateKey::ActivationThreshold, true, true, false, "float", "200.0",
     "pixel value that counts as progress 1.0"},
    {StateKey::HoldTimeoutMilliseconds, true, true, false, "unsigned 32-bit", "500",
     "touch duration in ms after which a touch becomes a hold"},
    {StateKey::EnableHoldSuppression, true, true, false, "boolean", "true",
     "whether a low touch score forbids a hold to begin"},
    {StateKey::EnableTapSuppression, true, true, false, "boolean", "true",
     "whether the tap classifier may reject a tap"},
    {StateKey::VirtualNormalizationFactors, true, true, true, "float", "",
     "gain of a pixel group as read back; frames keep the gain they were built with"},
    {StateKey::EventStats, true, false, false, "dictionary", "",
     "counters of dispatched and rejected gestures"},
    {StateKey::DebugInfo, true, false, false, "dictionary", "", "EventStats under its name"},
    {StateKey::ResetEventStats, false, true, false, "any", "", "a write sets every counter to 0"},
}};

}  // namespace VexaTouch
