#pragma once

#include "Platform/Mutex.h"
#include "Platform/PropertyValue.h"
#include "Platform/ThreadAnnotations.h"

#include <vexa/device.h>
#include <array>
#include <cstddef>
#include <cstdint>
#include <span>

namespace VexaTouch::Tools {

/// What a surface that is made up says of itself.
struct SurfaceIdentity {
    std::array<std::uint8_t, 2> firmwareVersion = {1, 0};
    std::uint32_t factoryResetHoldDuration = 10'000;
    std::uint32_t criticalErrors = 0;
    /// What its properties start with: "Product", "Manufacturer", "SerialNumber", "Transport",
    /// "VendorID", "ProductID", "VersionNumber", "MaxInputReportSize", "MaxFeatureReportSize".
    Vexa::PropertyValue::Dictionary properties = defaultProperties();

    static Vexa::PropertyValue::Dictionary defaultProperties();
};

/// Answers for the device: its three feature reports and its properties. Any thread.
class SurfaceAnswers {
public:
    explicit SurfaceAnswers(SurfaceIdentity identity);

    /// Writes the feature report as far as there is room and stores how much that is. UNSUPPORTED
    /// for every other report.
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) const noexcept;

    /// No value for a key that is not there or is no string.
    [[nodiscard]] Vexa::PropertyValue property(const Vexa::PropertyValue& key) const noexcept;
    /// Keeps any value under any string key. False for another key, for no value, and when there is
    /// no memory.
    bool setProperty(const Vexa::PropertyValue& key, const Vexa::PropertyValue& value) noexcept;

private:
    const std::array<std::uint8_t, 2> firmwareVersion_;
    const std::uint32_t factoryResetHoldDuration_;
    const std::uint32_t criticalErrors_;
    mutable Vexa::Mutex lock_;
    Vexa::PropertyValue::Dictionary properties_ GUARDED_BY(lock_);
};

}  // namespace VexaTouch::Tools
