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

/// Reads KEY=VALUE: the key as the host writes it ("Pipeline.Algs.ActivationThreshold") or the bare
/// key of the algorithm, the value as JSON. Throws UsageError, with the list of keys, for a key
/// that nothing knows, a read-only key, an index out of range or a value that is no JSON.
Setting parseSetting(std::string_view text);
std::vector<Setting> parseSettings(std::span<const std::string> texts);

/// The keys that can be set, their defaults and meaning: aligned lines for help and error texts.
std::string settingKeysText();

}  // namespace VexaTouch::Tools
