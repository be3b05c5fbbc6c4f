#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

namespace VexaTouch {

/// Reports that are read from the device on request. Each structure holds exactly the bytes
/// that follow the report id, in wire order (little-endian). `parse` behaves as
/// InputReport::Image::parse does.
namespace FeatureReport {

struct FirmwareVersion {
    static constexpr std::uint8_t reportId = 4;
    /// Shortest accepted report in bytes, report id included.
    static constexpr std::size_t minimumLength = 3;

    std::uint8_t versionByte0;
    std::uint8_t versionByte1;

    static std::optional<FirmwareVersion> parse(const std::uint8_t* data,
                                                std::size_t length) noexcept;
};

/// How long a hold must last to reset the device to factory state, in the firmware's own unit.
struct FactoryResetHoldDuration {
    static constexpr std::uint8_t reportId = 31;
    static constexpr std::size_t minimumLength = 5;

    std::uint32_t duration;

    static std::optional<FactoryResetHoldDuration> parse(const std::uint8_t* data,
                                                         std::size_t length) noexcept;
};

/// The firmware's critical-error word, passed on uninterpreted.
struct CriticalErrors {
    static constexpr std::uint8_t reportId = 63;
    static constexpr std::size_t minimumLength = 5;

    std::uint32_t errors;

    static std::optional<CriticalErrors> parse(const std::uint8_t* data,
                                               std::size_t length) noexcept;
};

static_assert(sizeof(FirmwareVersion) == FirmwareVersion::minimumLength - 1);
static_assert(sizeof(FactoryResetHoldDuration) == FactoryResetHoldDuration::minimumLength - 1);
static_assert(sizeof(CriticalErrors) == CriticalErrors::minimumLength - 1);

}  // namespace FeatureReport
}  // namespace VexaTouch
