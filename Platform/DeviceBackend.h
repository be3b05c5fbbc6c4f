#pragma once

#include "Platform/PropertyValue.h"

#include <vexa/device.h>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>

namespace Vexa {

/// What stands behind a HID device: derive from it and register it. The operations come from
/// whatever threads use the device, several at once; <vexa/device.h> says what each must do.
/// None may throw.
class DeviceBackend {
public:
    DeviceBackend() = default;
    virtual ~DeviceBackend() = default;
    DeviceBackend(const DeviceBackend&) = delete;
    DeviceBackend(DeviceBackend&&) = delete;
    DeviceBackend& operator=(const DeviceBackend&) = delete;
    DeviceBackend& operator=(DeviceBackend&&) = delete;

    /// Stores a descriptor of which each read gives one report; whoever opened owns and closes it.
    virtual vexa_status open(std::uint32_t options, int& descriptor) noexcept = 0;
    virtual void close(std::uint32_t options) noexcept;
    /// Writes at most the whole of `report`, stores how much. UNSUPPORTED unless overridden.
    virtual vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                                  std::span<std::uint8_t> report, std::size_t& length) noexcept;
    /// No value unless overridden.
    virtual PropertyValue property(const PropertyValue& key) noexcept;
    /// False unless overridden.
    virtual bool setProperty(const PropertyValue& key, const PropertyValue& value) noexcept;
    /// One report was read and goes to the service next. On the input thread; must not block.
    virtual void reportArrived(std::span<const std::uint8_t> report) noexcept;
    /// One report was handled by the service. On the input thread; must not block.
    virtual void reportHandled() noexcept;
};

/// Registers a back-end for as long as it lives. Devices that were made meanwhile go on, and keep
/// the back-end alive.
class DeviceRegistration {
public:
    /// Throws std::bad_alloc.
    explicit DeviceRegistration(std::shared_ptr<DeviceBackend> backend);
    ~DeviceRegistration();
    DeviceRegistration(const DeviceRegistration&) = delete;
    DeviceRegistration(DeviceRegistration&&) = delete;
    DeviceRegistration& operator=(const DeviceRegistration&) = delete;
    DeviceRegistration& operator=(DeviceRegistration&&) = delete;

    /// The service handle, never 0.
    [[nodiscard]] std::uint32_t service() const noexcept { return service_; }

private:
    std::uint32_t service_;
};

}  // namespace Vexa
