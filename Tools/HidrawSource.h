#pragma once

#include "Platform/HidrawDevice.h"
#include "Tools/ObservedDevice.h"

#include <atomic>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// A device of the kernel, observed.
class HidrawSource final : public ObservedDevice {
public:
    /// See HidrawDevice. Throws Failure, which says what to do where something can be done.
    explicit HidrawSource(const std::string& node, std::string_view sysPath = {});

    void setHooks(DeviceHooks hooks) override;
    [[nodiscard]] int hangUpDescriptor() const noexcept override;
    /// "12 reports read".
    [[nodiscard]] std::string tally() const override;
    [[nodiscard]] std::uint64_t sent() const noexcept override { return read_.load(); }
    [[nodiscard]] std::uint64_t handled() const noexcept override { return handled_.load(); }
    [[nodiscard]] bool isServed() const noexcept override { return isServed_.load(); }

    vexa_status open(std::uint32_t options, int& descriptor) noexcept override;
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) noexcept override;
    Vexa::PropertyValue property(const Vexa::PropertyValue& key) noexcept override;
    bool setProperty(const Vexa::PropertyValue& key,
                     const Vexa::PropertyValue& value) noexcept override;
    void reportArrived(std::span<const std::uint8_t> report,
                       std::uint64_t timestamp) noexcept override;
    void reportHandled() noexcept override;
    void scheduled(const Vexa::RunLoop& loop, const char* mode) noexcept override;

private:
    Vexa::HidrawDevice device_;
    DeviceHooks hooks_;
    std::atomic<std::uint64_t> read_{0};
    std::atomic<std::uint64_t> handled_{0};
    std::atomic<bool> isServed_{false};
};

}  // namespace VexaTouch::Tools
