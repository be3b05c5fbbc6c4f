#include "Tools/SurfaceAnswers.h"

#include "Shared/FeatureReport.h"
#include "Shared/InputReport.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace VexaTouch::Tools {
namespace {

/// Id and payload, as much as there is room for; the structure is the wire's own layout.
template <typename Report>
std::size_t write(const Report& content, std::span<std::uint8_t> report) {
    std::array<std::uint8_t, Report::minimumLength> bytes{};
    bytes[0] = Report::reportId;
    std::memcpy(bytes.data() + 1, &content, sizeof content);
    const std::size_t length = std::min(bytes.size(), report.size());
    std::copy_n(bytes.begin(), length, report.begin());
    return length;
}

}  // namespace

Vexa::PropertyValue::Dictionary SurfaceIdentity::defaultProperties() {
    constexpr std::uint32_t kVendor = 0x7E8A;
    constexpr std::uint32_t kProduct = 0x0015;
    constexpr std::uint32_t kVersion = 0x0100;
    constexpr std::size_t kLongestFeatureReport = 5;
    return {
        {"Manufacturer", "Vexa"},
        {"MaxFeatureReportSize", kLongestFeatureReport},
        {"MaxInputReportSize", InputReport::Image::minimumLength},
        {"Product", "Vexa Touch Surface"},
        {"ProductID", kProduct},
        {"SerialNumber", "0000000001"},
        {"Transport", "Virtual"},
        {"VendorID", kVendor},
        {"VersionNumber", kVersion},
    };
}

SurfaceAnswers::SurfaceAnswers(SurfaceIdentity identity)
    : firmwareVersion_(identity.firmwareVersion),
      factoryResetHoldDuration_(identity.factoryResetHoldDuration),
      criticalErrors_(identity.criticalErrors),
      properties_(std::move(identity.properties)) {}

vexa_status SurfaceAnswers::getReport(vexa_report_type type, std::uint32_t reportId,
                                      std::span<std::uint8_t> report,
                                      std::size_t& length) const noexcept {
    if (type != VEXA_REPORT_FEATURE) {
        return VEXA_STATUS_UNSUPPORTED;
    }
    switch (reportId) {
        case FeatureReport::FirmwareVersion::reportId:
            length = write(FeatureReport::FirmwareVersion{.versionByte0 = firmwareVersion_[0],
                                                          .versionByte1 = firmwareVersion_[1]},
                           report);
            return VEXA_STATUS_SUCCESS;
        case FeatureReport::FactoryResetHoldDuration::reportId:
            length = write(
                FeatureReport::FactoryResetHoldDuration{.duration = factoryResetHoldDuration_},
                report);
            return VEXA_STATUS_SUCCESS;
        case FeatureReport::CriticalErrors::reportId:
            length = write(FeatureReport::CriticalErrors{.errors = criticalErrors_}, report);
            return VEXA_STATUS_SUCCESS;
        default:
            return VEXA_STATUS_UNSUPPORTED;
    }
}

Vexa::PropertyValue SurfaceAnswers::property(const Vexa::PropertyValue& key) const noexcept {
    const auto name = key.asString();
    if (!name) {
        return {};
    }
    const Vexa::MutexLock held(lock_);
    const auto found = properties_.find(*name);
    return found == properties_.end() ? Vexa::PropertyValue() : found->second;
}

bool SurfaceAnswers::setProperty(const Vexa::PropertyValue& key,
                                 const Vexa::PropertyValue& value) noexcept {
    const auto name = key.asString();
    if (!name || !value) {
        return false;
    }
    try {
        const Vexa::MutexLock held(lock_);
        properties_.insert_or_assign(std::string(*name), value);
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

}  // namespace VexaTouch::Tools
