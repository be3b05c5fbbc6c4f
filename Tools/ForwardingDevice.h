#pragma once

#include "Platform/DeviceBackend.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <utility>

namespace VexaTouch::Tools {

/// A device that does what another one does: the base of those that look on.
class ForwardingDevice : public Vexa::DeviceBackend {
public:
    explicit ForwardingDevice(std::shared_ptr<Vexa::DeviceBackend> device) noexcept
        : device_(std::move(device)) {}

    vexa_status open(std::uint32_t options, int& descriptor) noexcept override {
        return device_->open(options, descriptor);
    }
    void close(std::uint32_t options) noexcept override { device_->close(options); }
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) noexcept override {
        return device_->getReport(type, reportId, report, length);
    }
    Vexa::PropertyValue property(const Vexa::PropertyValue& key) noexcept override {
        return device_->property(key);
    }
    bool setProperty(const Vexa::PropertyValue& key,
                     const Vexa::PropertyValue& value) noexcept override {
        return device_->setProperty(key, value);
    }
    void reportArrived(std::span<const std::uint8_t> report,
                       std::uint64_t timestamp) noexcept override {
        device_->reportArrived(report, timestamp);
    }
    void reportHandled() noexcept override { device_->reportHandled(); }
    void scheduled(const Vexa::RunLoop& loop, const char* mode) noexcept override {
        device_->scheduled(loop, mode);
    }

private:
    const std::shared_ptr<Vexa::DeviceBackend> device_;
};

}  // namespace VexaTouch::Tools
