#include "Tools/SettingKeys.h"

#include "Algorithm/StateKeys.h"
#include "Algorithm/VirtualImage.h"
#include "Platform/Json.h"
#include "Tools/Failure.h"

#include <algorithm>
#include <cmath>
#include <sstream>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kHostPrefix = "Pipeline.Algs.";
constexpr std::string_view kPipelinePrefix = "Algs.";
constexpr std::size_t kKeyColumn = 36;

/// KEY=VALUE and the option that it was given to.
struct Given {
    std::string_view option;
    std::string_view text;
};

[[noreturn]] void refuse(const Given& given, const std::string& reason) {
    throw UsageError(std::string(given.option) + ' ' + std::string(given.text) + ": " + reason +
                     "\nKeys that can be set (with or without " + std::string(kHostPrefix) +
                     " before them):\n" + settingKeysText());
}

/// The index as the algorithm reads it: leading white space and a sign are taken, what does not
/// begin with a number is 0, what does not fit is out of range.
bool isIndexInRange(std::string_view remainder) {
    std::istringstream stream{std::string(remainder)};
    long long index = 0;
    stream >> index;
    return index >= 0 && static_cast<unsigned long long>(index) < kVirtualPixelCount;
}

std::string keyTerm(const StateKeyEntry& entry) {
    return std::string(entry.name) + (entry.indexed ? ".INDEX" : "");
}

void checkKey(const Given& given, std::string_view key) {
    const std::string_view name = key.substr(0, key.find('.'));
    const auto found = std::ranges::find(kStateKeys, name, &StateKeyEntry::name);
    if (found == kStateKeys.end() || found->indexed != (name.size() < key.size())) {
        refuse(given, "nothing knows the key " + std::string(key));
    }
    if (!found->writable) {
        refuse(given, "the key " + std::string(key) + " is read-only");
    }
    if (found->indexed && !isIndexInRange(key.substr(name.size() + 1))) {
        refuse(given, "the index is not below " + std::to_string(kVirtualPixelCount));
    }
}

}  // namespace

std::string hostKey(std::string_view key) {
    if (key.starts_with(kPipelinePrefix)) {
        return std::string(kHostPrefix) + std::string(key.substr(kPipelinePrefix.size()));
    }
    const std::string_view name = key.substr(0, key.find('.'));
    const bool isBare =
        std::ranges::find(kStateKeys, name, &StateKeyEntry::name) != kStateKeys.end();
    return (isBare ? std::string(kHostPrefix) : std::string()) + std::string(key);
}

Setting parseSetting(std::string_view text, std::string_view option) {
    const Given given{.option = option, .text = text};
    const std::size_t equals = text.find('=');
    if (equals == std::string_view::npos) {
        refuse(given, "KEY=VALUE is needed");
    }
    const std::string fullKey = hostKey(text.substr(0, equals));
    std::string_view key = fullKey;
    if (key.starts_with(kHostPrefix)) {
        key.remove_prefix(kHostPrefix.size());
    }
    checkKey(given, key);
    Vexa::PropertyValue value = Vexa::readJson(text.substr(equals + 1));
    if (!value) {
        refuse(given, "the value is no JSON");
    }
    // A recording has no text for infinity.
    if (value.isNumber() && !std::isfinite(value.toFloat())) {
        refuse(given, "the value is not finite as a 32-bit float");
    }
    return {.key = std::string(kPipelinePrefix) + std::string(key), .value = std::move(value)};
}

std::vector<Setting> parseSettings(std::span<const std::string> texts, std::string_view option) {
    std::vector<Setting> settings;
    settings.reserve(texts.size());
    for (const std::string& text : texts) {
        settings.push_back(parseSetting(text, option));
    }
    return settings;
}

std::vector<std::string> pipelineSettingKeys() {
    std::vector<std::string> keys;
    for (const StateKeyEntry& entry : kStateKeys) {
        if (!entry.readable || !entry.writable) {
            continue;
        }
        const std::string key = std::string(kPipelinePrefix) + std::string(entry.name);
        if (!entry.indexed) {
            keys.push_back(key);
            continue;
        }
        for (std::size_t index = 0; index < kVirtualPixelCount; ++index) {
            keys.push_back(key + '.' + std::to_string(index));
        }
    }
    return keys;
}

std::string settingKeysText() {
    std::string text;
    for (const StateKeyEntry& entry : kStateKeys) {
        if (!entry.writable) {
            continue;
        }
        const std::string term = keyTerm(entry);
        text += "  " + term;
        text.append(term.size() + 2 < kKeyColumn ? kKeyColumn - term.size() - 2 : 1, ' ');
        text += entry.summary;
        if (!entry.defaultValue.empty()) {
            text += " (";
            text += entry.type;
            text += ", default ";
            text += entry.defaultValue;
            text += ')';
        } else if (entry.indexed) {
            text += " (";
            text += entry.type;
            text += ", INDEX 0 to " + std::to_string(kVirtualPixelCount - 1) + ')';
        }
        text += '\n';
    }
    text.pop_back();
    return text;
}

}  // namespace VexaTouch::Tools
