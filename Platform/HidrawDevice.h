#pragma once

#include "Platform/DeviceBackend.h"
#include "Platform/Mutex.h"
#include "Platform/ReportDescriptor.h"
#include "Platform/ThreadAnnotations.h"

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

namespace Vexa {

/// The properties that a hidraw device answers for. docs/operations.md has the same table.
namespace HidrawKey {

inline constexpr std::string_view kBus = "Bus";
inline constexpr std::string_view kTransport = "Transport";
inline constexpr std::string_view kVendorId = "VendorID";
inline constexpr std::string_view kProductId = "ProductID";
inline constexpr std::string_view kProduct = "Product";
inline constexpr std::string_view kPhysicalPath = "PhysicalPath";
inline constexpr std::string_view kSerialNumber = "SerialNumber";
inline constexpr std::string_view kReportDescriptor = "ReportDescriptor";
inline constexpr std::string_view kMaxInputReportSize = "MaxInputReportSize";

struct Entry {
    std::string_view key;
    std::string_view meaning;
};
inline constexpr std::array<Entry, 9> kAll = {{
    {kBus, "number of the bus: 3 USB, 5 Bluetooth, 6 virtual, 24 I2C"},
    {kTransport, "the bus by name"},
    {kVendorId, "vendor id, a number"},
    {kProductId, "product id, a number"},
    {kProduct, "name of the device"},
    {kPhysicalPath, "where it is plugged in"},
    {kSerialNumber, "serial number; empty when the device has none"},
    {kReportDescriptor, "report descriptor, bytes"},
    {kMaxInputReportSize, "bytes of the longest input report, its id included"},
}};

}  // namespace HidrawKey

/// A HID device of the Linux kernel behind its node /dev/hidrawN.
///
/// It keeps a descriptor of its own from construction to destruction. As long as there is one the
/// kernel gives the node's number to no other device, so that a back-end whose device was unplugged
/// and plugged in again can never reach another one: everything answers GONE then, and the new
/// plug-in gets a back-end of its own. The input thread reads from a second descriptor, one for
/// each opening, so it begins with the reports sent after that.
///
/// A request for a report blocks its caller until the device or the kernel's limit (5 s on USB)
/// ends it; reading goes on meanwhile. open() and close() of any hidraw device in the system may
/// wait for such a request, which is the kernel's way.
///
/// A feature report that is refused, not answered in time or shorter than its descriptor says is
/// logged (HIDService, error), and that it is given again (info), once each time that it changes
/// and not with each request: whoever asks gets a status or bytes, and the user no reason
/// otherwise.
class HidrawDevice : public DeviceBackend {
public:
    /// Looks at the device once: descriptor, ids, name. `sysPath` is the folder in /sys that the
    /// node must belong to ("/sys/devices/.../hidraw/hidraw0"), so that what was found a while ago
    /// is not mistaken for what has taken its node since; empty: whatever is there. Opens for
    /// reading only where writing is not permitted. Throws std::system_error with the node and what
    /// failed; ENODEV when another device is there.
    explicit HidrawDevice(std::string node, std::string_view sysPath = {});
    ~HidrawDevice() override;
    HidrawDevice(const HidrawDevice&) = delete;
    HidrawDevice(HidrawDevice&&) = delete;
    HidrawDevice& operator=(const HidrawDevice&) = delete;
    HidrawDevice& operator=(HidrawDevice&&) = delete;

    [[nodiscard]] const std::string& node() const noexcept { return node_; }
    /// Whether the device was unplugged. Any thread.
    [[nodiscard]] bool isGone() const noexcept;
    /// Poll it for no events: POLLHUP or POLLERR comes with the unplug. Never read it.
    [[nodiscard]] int hangUpDescriptor() const noexcept { return control_; }

    /// SUCCESS, GONE, or NO_RESOURCES when the node may not be opened or there are no descriptors.
    vexa_status open(std::uint32_t options, int& descriptor) noexcept override;
    /// A feature report, as the device answers it, its id first; an answer shorter than the report
    /// is passed on as it is. BAD_ARGUMENT without room for the id; IO_ERROR when the device
    /// refuses or the time is over; GONE; UNSUPPORTED for an input or output report where the
    /// kernel or the driver cannot ask for one.
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) noexcept override;
    /// Sends a feature report to the device, its id first (0 where it has none). Outcomes as above.
    vexa_status setFeatureReport(std::span<const std::uint8_t> report) noexcept;
    /// Those of HidrawKey and what was written; no value after an unplug.
    PropertyValue property(const PropertyValue& key) noexcept override;
    /// Keeps the value for the life of the back-end, under any string key. False for another key,
    /// for no value, after an unplug and without memory.
    bool setProperty(const PropertyValue& key, const PropertyValue& value) noexcept override;

private:
    void readProperties();
    vexa_status statusOf(int error) noexcept;
    void noteRefused(std::uint8_t reportId, int error, std::chrono::milliseconds took) noexcept;
    void noteAnswered(std::uint8_t reportId, std::size_t length, std::size_t room) noexcept;
    bool isNews(std::uint8_t reportId, int outcome) noexcept;

    const std::string node_;
    int control_ = -1;
    std::uint64_t number_ = 0;  // of the node, as stat has it
    mutable std::atomic<bool> gone_{false};
    /// Of feature reports by id, as the descriptor has them: bytes, id included; 0: none.
    std::array<std::uint16_t, 256> featureSizes_{};
    /// How each feature report was answered last: 0 as it should be or never asked, an errno, or a
    /// length that was too short, as -1 - length.
    std::array<std::atomic<int>, 256> outcomes_{};
    Mutex mutex_;
    PropertyValue::Dictionary properties_ GUARDED_BY(mutex_);
};

}  // namespace Vexa
