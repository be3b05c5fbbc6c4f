// What the service answers to reads and writes of properties.

#include "Service/LogText.h"
#include "Service/PropertyKeys.h"
#include "Service/VexaTouchHIDService.h"
#include "Shared/FeatureReport.h"
#include "Shared/Util.h"

#include <array>
#include <string>
#include <utility>

namespace VexaTouch {

namespace {

using Vexa::PropertyValue;

/// Removes the pipeline's domain from the key; false when it is of another.
bool stripPipelineDomain(std::string& key) {
    return Util::stripDomainFromKey(key, std::string(PropertyKey::kPipelineDomain));
}

}  // namespace

PropertyValue VexaTouchHIDService::getPropertyForKey(const PropertyValue& key) {
    struct Property {
        std::string_view key;
        PropertyValue (VexaTouchHIDService::*read)();
    };
    static constexpr std::array<Property, 7> kProperties = {{
        {PropertyKey::kVersion, &VexaTouchHIDService::version},
        {PropertyKey::kRecording, &VexaTouchHIDService::recording},
        {PropertyKey::kDisjointImageCount, &VexaTouchHIDService::disjointImageCount},
        {PropertyKey::kFirmwareVersion, &VexaTouchHIDService::firmwareVersion},
        {PropertyKey::kFactoryResetHoldDuration, &VexaTouchHIDService::factoryResetHoldDuration},
        {PropertyKey::kCriticalErrors, &VexaTouchHIDService::criticalErrors},
        {PropertyKey::kServicePluginDebug, &VexaTouchHIDService::debugInfo},
    }};

    logText(_log, Vexa::LogLevel::Debug, [&key] { return "getPropertyForKey:" + objectText(key); });
    const auto text = key.asString();
    if (!text) return {};
    std::string name(*text);
    if (stripPipelineDomain(name)) {
        const Vexa::MutexLock lock(_pipelineLock);
        return _pipeline.getState(name);
    }
    for (const Property& property : kProperties) {
        // Lengths are compared first, so a key with a zero byte inside matches none.
        if (property.key == name) return (this->*property.read)();
    }
    return _vexaDevice.property(key);
}

bool VexaTouchHIDService::setPropertyForKey(const PropertyValue& value, const PropertyValue& key) {
    logText(_log, Vexa::LogLevel::Debug,
            [&] { return "setProperty:" + objectText(value) + " forKey:" + objectText(key); });
    const auto text = key.asString();
    if (!text) return false;
    std::string name(*text);
    if (stripPipelineDomain(name)) {
        const Vexa::MutexLock lock(_pipelineLock);
        _pipeline.setState(name, value);
        return true;
    }
    return _vexaDevice.setProperty(key, value);
}

PropertyValue VexaTouchHIDService::debugInfo() {
    // The hold duration is deliberately not among them.
    static constexpr std::array<std::string_view, 7> kKeys = {
        PropertyKey::kVersion,
        PropertyKey::kRecording,
        PropertyKey::kDisjointImageCount,
        PropertyKey::kFirmwareVersion,
        PropertyKey::kCriticalErrors,
        PropertyKey::kPipelineDebugInfo,
        PropertyKey::kAlgorithmDebugInfo,
    };
    PropertyValue::Dictionary info;
    for (const std::string_view key : kKeys) {
        if (PropertyValue value = getPropertyForKey(key)) {
            info.insert_or_assign(std::string(key), std::move(value));
        }
    }
    return info;
}

PropertyValue VexaTouchHIDService::version() {
    return PropertyValue::Array{13, 0, 0};
}

PropertyValue VexaTouchHIDService::recording() {
    // A long recording takes long to write, and the input thread must not wait for it: only the
    // copy is made under the lock.
    std::optional<PipelineRecording> copy;
    {
        const Vexa::MutexLock lock(_pipelineLock);
        copy.emplace(_pipeline);
    }
    return copy->json();
}

PropertyValue VexaTouchHIDService::disjointImageCount() {
    return _disjointImageCount.load(std::memory_order_relaxed);
}

template <typename Report>
std::optional<Report> VexaTouchHIDService::featureReport() const noexcept {
    std::array<std::uint8_t, 32> buffer{};
    std::size_t length = buffer.size();
    if (_vexaDevice.featureReport(Report::reportId, buffer.data(), length) != VEXA_STATUS_SUCCESS) {
        return std::nullopt;
    }
    return Report::parse(buffer.data(), length);
}

PropertyValue VexaTouchHIDService::firmwareVersion() {
    const auto report = featureReport<FeatureReport::FirmwareVersion>();
    if (!report) return {};
    return PropertyValue::Array{report->versionByte0, report->versionByte1};
}

PropertyValue VexaTouchHIDService::factoryResetHoldDuration() {
    const auto report = featureReport<FeatureReport::FactoryResetHoldDuration>();
    return report ? PropertyValue(report->duration) : PropertyValue();
}

PropertyValue VexaTouchHIDService::criticalErrors() {
    const auto report = featureReport<FeatureReport::CriticalErrors>();
    return report ? PropertyValue(report->errors) : PropertyValue();
}

}  // namespace VexaTouch
