#pragma once

#include "Platform/PropertyValue.h"

#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

/// One setting as it is given to a pipeline.
struct Setting {
    std::string key;  ///< as a pipeline takes it, "Algs.ActivationThreshold"
    Vexa::PropertyValue value;

    friend bool operator==(const Setting&, const Setting&) = default;
};

/// The beginnings of KEY=VALUE, for completion.
inline constexpr std::string_view kSettingChoices =
    "ActivationThreshold= HoldTimeoutMilliseconds= EnableHoldSuppression= EnableTapSuppression= "
    "VirtualNormalizationFactors. ResetEventStats=";

/// The key as the host writes it ("Pipeline.Algs.ActivationThreshold") of one that a pipeline
/// takes ("Algs.ActivationThreshold") or of the algorithm's bare key; any other as it is.
std::string hostKey(std::string_view key);

/// Reads KEY=VALUE: the key in any of the three forms of hostKey, the value as JSON. Throws
/// UsageError, with the list of keys, for a key that nothing knows, a read-only key, an index out
/// of range, a value that is no JSON or a number that is not finite as a float. `option` is what
/// the text was given to, for the message.
Setting parseSetting(std::string_view text, std::string_view option = "--set");
std::vector<Setting> parseSettings(std::span<const std::string> texts,
                                   std::string_view option = "--set");

/// Every key that holds a setting, as a pipeline takes it, an indexed one once for each index.
/// What can only be written, or only read, is none.
std::vector<std::string> pipelineSettingKeys();

/// The keys that can be set, their defaults and meaning: aligned lines for help and error texts.
std::string settingKeysText();

}  // namespace VexaTouch::Tools
