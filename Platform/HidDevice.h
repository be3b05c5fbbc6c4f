#pragma once

#include "Platform/Handle.h"
#include "Platform/PropertyValue.h"
#include "Platform/RunLoop.h"

#include <vexa/device.h>
#include <cstddef>
#include <cstdint>
#include <span>

namespace Vexa {

/// A counted reference to a HID device, or none; <vexa/device.h> is its manual.
///
/// A device behind an empty reference answers like one that is not there: NOT_OPEN, no value,
/// false, nothing.
class HidDevice {
public:
    /// No device.
    HidDevice() noexcept = default;
    /// The device of a registered service handle, closed; none when it cannot be made.
    static HidDevice create(std::uint32_t service) noexcept;

    vexa_status open(std::uint32_t options) const noexcept;
    void close(std::uint32_t options) const noexcept;

    /// Asks for a feature report into `buffer`; `length` (its room going in) is what was written.
    vexa_status featureReport(std::uint32_t reportId, std::uint8_t* buffer,
                              std::size_t& length) const noexcept;

    [[nodiscard]] PropertyValue property(const PropertyValue& key) const noexcept;
    // NOLINTNEXTLINE(modernize-use-nodiscard): a write that nobody checks is fine
    bool setProperty(const PropertyValue& key, const PropertyValue& value) const noexcept;

    /// On the thread of the run loop. A null callback ends it; another one is refused before that.
    // NOLINTNEXTLINE(modernize-use-nodiscard): who ends it, or is the only one, need not look
    vexa_status setInputReportCallback(std::span<std::uint8_t> buffer,
                                       vexa_input_report_callback callback,
                                       void* context) const noexcept;
    vexa_status schedule(const RunLoop& loop, const char* mode) const noexcept;
    void unschedule(const RunLoop& loop, const char* mode) const noexcept;

    /// False once it was found to be unplugged.
    [[nodiscard]] bool isPresent() const noexcept;

    [[nodiscard]] vexa_device* get() const noexcept { return handle_.get(); }
    void reset() noexcept { handle_.reset(); }
    explicit operator bool() const noexcept { return static_cast<bool>(handle_); }

private:
    using Reference = Handle<vexa_device, &vexa_device_retain, &vexa_device_release>;

    Reference handle_;
};

}  // namespace Vexa
