#include "Tools/Daemon/PropertyRules.h"

#include "Algorithm/StateKeys.h"
#include "Algorithm/VirtualImage.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <string>
#include <system_error>

namespace VexaTouch::Tools::Daemon {
namespace {

constexpr std::string_view kPipeline = "Pipeline.";
constexpr std::string_view kAlgorithm = "Pipeline.Algs.";
constexpr std::string_view kVersion = "Version";
constexpr std::string_view kRecording = "Recording";
constexpr std::string_view kDisjointImageCount = "DisjointImageCount";
constexpr std::string_view kDebug = "ServicePluginDebug";
/// What the service answers itself. Written, they would only hide in the device.
constexpr std::array<std::string_view, 7> kOfTheService = {
    kVersion, kRecording,       kDisjointImageCount, "FirmwareVersion", "FactoryResetHoldDuration",
    kDebug,   "CriticalErrors",
};

[[noreturn]] void unknown(std::string_view key) {
    throw BusError(ErrorName::kUnknownKey,
                   std::string(key) + ": there is no such property, or it has no value");
}

void checkLength(std::string_view key) {
    if (key.empty() || key.size() > PropertyRules::kLongestKey) {
        throw BusError(ErrorName::kUnknownKey,
                       "a key has 1 to " + std::to_string(PropertyRules::kLongestKey) +
                           " bytes, this one " + std::to_string(key.size()));
    }
}

/// As the algorithm itself would write it: digits, no sign, no zero before others.
bool isIndex(std::string_view text) {
    std::size_t index = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), index);
    return error == std::errc() && end == text.data() + text.size() && index < kVirtualPixelCount &&
           (text.size() == 1 || text.front() != '0');
}

/// The entry of a key "Pipeline.Algs...."; null when there is none.
const StateKeyEntry* stateKey(std::string_view key) {
    const std::string_view rest = key.substr(kAlgorithm.size());
    const std::size_t dot = rest.find('.');
    const auto found = std::ranges::find(kStateKeys, rest.substr(0, dot), &StateKeyEntry::name);
    if (found == kStateKeys.end()) {
        return nullptr;
    }
    const bool fits = found->indexed
                          ? dot != std::string_view::npos && isIndex(rest.substr(dot + 1))
                          : dot == std::string_view::npos;
    return fits ? &*found : nullptr;
}

bool isOfPipeline(std::string_view key) {
    return key == kPipeline.substr(0, kPipeline.size() - 1) || key.starts_with(kPipeline);
}

}  // namespace

Right PropertyRules::rightToRead(std::string_view key) {
    return key == kRecording || key == kDebug ? Right::Control : Right::Watch;
}

bool PropertyRules::asksDevice(std::string_view key) {
    return !isOfPipeline(key) && key != kVersion && key != kRecording && key != kDisjointImageCount;
}

void PropertyRules::checkRead(std::string_view key) {
    checkLength(key);
    if (!isOfPipeline(key) || key == "Pipeline.DebugInfo") {
        return;
    }
    const StateKeyEntry* entry = key.starts_with(kAlgorithm) ? stateKey(key) : nullptr;
    if (entry == nullptr || !entry->readable) {
        unknown(key);
    }
}

void PropertyRules::checkWrite(std::string_view key, const Vexa::PropertyValue& value) {
    checkLength(key);
    if (std::ranges::find(kOfTheService, key) != kOfTheService.end() ||
        key == "Pipeline.DebugInfo") {
        throw BusError(ErrorName::kReadOnly, std::string(key) + ": the property is read-only");
    }
    if (!value) {
        throw BusError(ErrorName::kInvalidValue, std::string(key) + ": there is no value to write");
    }
    if (!isOfPipeline(key)) {
        return;
    }
    const StateKeyEntry* entry = key.starts_with(kAlgorithm) ? stateKey(key) : nullptr;
    if (entry == nullptr) {
        unknown(key);
    }
    if (!entry->writable) {
        throw BusError(ErrorName::kReadOnly, std::string(key) + ": the property is read-only");
    }
    if (!value.isNumber() && value.type() != Vexa::PropertyValue::Type::Boolean) {
        throw BusError(ErrorName::kInvalidValue,
                       std::string(key) + ": the value must be a boolean or a number");
    }
    // A recording has no text for it, so that a replay would not decide as was felt.
    if (!std::isfinite(value.toFloat())) {
        throw BusError(ErrorName::kInvalidValue,
                       std::string(key) + ": the value must be finite as a 32-bit float");
    }
}

}  // namespace VexaTouch::Tools::Daemon
