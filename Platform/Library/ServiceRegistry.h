#pragma once

#include <vexa/device.h>
#include <cstddef>
#include <cstdint>
#include <memory>

namespace Vexa::Library {

/// A back-end that was registered; with its last owner it is told that it is no longer needed.
class Backend {
public:
    Backend() noexcept = default;
    ~Backend();
    Backend(const Backend&) = delete;
    Backend(Backend&&) = delete;
    Backend& operator=(const Backend&) = delete;
    Backend& operator=(Backend&&) = delete;

    /// Takes it over; until then there is nobody to be told.
    void adopt(const vexa_device_backend& table, void* context) noexcept;

    vexa_status open(std::uint32_t options, int& descriptor) const noexcept;
    void close(std::uint32_t options) const noexcept;
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId, std::uint8_t* report,
                          std::size_t& length) const noexcept;
    vexa_value* copyProperty(const vexa_value* key) const noexcept;
    bool setProperty(const vexa_value* key, const vexa_value* value) const noexcept;
    void reportHandled() const noexcept;
    void reportArrived(const std::uint8_t* report, std::size_t length) const noexcept;

private:
    vexa_device_backend table_{};
    void* context_ = nullptr;
};

/// The back-end behind a service handle, or none. Any thread.
std::shared_ptr<const Backend> registeredBackend(std::uint32_t service) noexcept;

}  // namespace Vexa::Library
