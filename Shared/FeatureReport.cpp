#include "Shared/FeatureReport.h"

#include "Shared/ParseReport.h"

namespace VexaTouch::FeatureReport {

std::optional<FirmwareVersion> FirmwareVersion::parse(const std::uint8_t* data,
                                                      std::size_t length) noexcept {
    return parseReport<FirmwareVersion>(data, length);
}

std::optional<FactoryResetHoldDuration> FactoryResetHoldDuration::parse(
    const std::uint8_t* data, std::size_t length) noexcept {
    return parseReport<FactoryResetHoldDuration>(data, length);
}

std::optional<CriticalErrors> CriticalErrors::parse(const std::uint8_t* data,
                                                    std::size_t length) noexcept {
    return parseReport<CriticalErrors>(data, length);
}

}  // namespace VexaTouch::FeatureReport
