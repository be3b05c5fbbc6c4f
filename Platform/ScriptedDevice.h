#pragma once

#include "Platform/DeviceBackend.h"
#include "Platform/Mutex.h"
#include "Platform/ThreadAnnotations.h"

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

namespace Vexa {

/// A device that does as it is told: any bytes at any moment, a failure of any call, unplugged in
/// the middle of anything. For tests of whoever uses a device.
///
/// Every member may be called on any thread. Input reports travel over a SOCK_SEQPACKET socket
/// pair, a new one for each open, so that the reader truly waits in the kernel; reports that were
/// not read when the device is closed are lost, those sent before an unplug are not.
class ScriptedDevice final : public DeviceBackend {
public:
    using Bytes = std::vector<std::uint8_t>;

    /// What happens to properties that are written.
    enum class Writes : std::uint8_t {
        Stored,    ///< taken, and read back
        Accepted,  ///< taken, and forgotten
        Refused,
    };

    /// The operations of a device back-end, by the names that the hook gets.
    static constexpr std::string_view kOpen = "open";
    static constexpr std::string_view kClose = "close";
    static constexpr std::string_view kGetReport = "getReport";
    static constexpr std::string_view kProperty = "property";
    static constexpr std::string_view kSetProperty = "setProperty";
    static constexpr std::string_view kReportHandled = "reportHandled";

    /// A call that was made. What the operation does not take stays as it is here.
    struct Call {
        std::string_view operation;
        std::uint32_t options = 0;                    ///< open, close
        vexa_report_type type = VEXA_REPORT_FEATURE;  ///< getReport
        std::uint32_t reportId = 0;                   ///< getReport
        std::size_t room = 0;                         ///< getReport, bytes
        PropertyValue key{};                          ///< property, setProperty
        PropertyValue value{};                        ///< setProperty

        friend bool operator==(const Call&, const Call&) = default;
    };

    explicit ScriptedDevice(PropertyValue::Dictionary properties = {});
    ~ScriptedDevice() override;

    // Input reports. A report of no bytes is a report like any other.

    /// Sends one report whole; blocks while there is no room. False when the device is not open or
    /// unplugged, also when that happens meanwhile.
    // NOLINTNEXTLINE(modernize-use-nodiscard): many a test sends into a closing device
    bool sendReport(std::span<const std::uint8_t> report);
    /// The same, but false instead of blocking.
    [[nodiscard]] bool trySendReport(std::span<const std::uint8_t> report);
    /// Blocks until so many reports in all, since the device was made, have been handled: the
    /// callback has returned. False after a minute, which is a test's failure.
    [[nodiscard]] bool waitUntilHandled(std::uint64_t reports);
    [[nodiscard]] std::uint64_t handled() const noexcept { return handled_; }

    // The plug.

    /// Pulls it: the reader gets what was sent, then the end; calls answer GONE from now on.
    void unplug();
    [[nodiscard]] bool isOpen() const;
    /// Blocks until the device is open or not open. False after a minute.
    [[nodiscard]] bool waitUntilOpen(bool open = true);

    // Answers.

    /// The statuses of the opens to come, one each; 0 lets it succeed. Then all succeed.
    void setNextOpenStatuses(std::vector<vexa_status> statuses);
    /// Feature reports with this id answer these bytes, as many of them as there is room for.
    /// Ids that were not set are UNSUPPORTED, as is every other type of report.
    void setFeatureReport(std::uint32_t reportId, Bytes bytes);
    /// Feature reports with this id fail.
    void setFeatureReportStatus(std::uint32_t reportId, vexa_status status);
    void setWrites(Writes writes);
    void setPropertyValue(std::string_view key, PropertyValue value);
    /// All properties as they are now.
    [[nodiscard]] PropertyValue::Dictionary properties() const;

    // What is seen of the caller.

    /// Called with the operation's name on entry of each, on the caller's thread and with no lock
    /// held: it may call anything here, also block. It must not throw. None: an empty function.
    void setHook(std::function<void(std::string_view operation)> hook);
    /// The calls made so far in the order of their entry, but for reportHandled, which is counted
    /// only.
    [[nodiscard]] std::vector<Call> calls() const;
    /// How many of them were to this operation.
    [[nodiscard]] std::size_t callCount(std::string_view operation) const;

    vexa_status open(std::uint32_t options, int& descriptor) noexcept override;
    void close(std::uint32_t options) noexcept override;
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) noexcept override;
    PropertyValue property(const PropertyValue& key) noexcept override;
    bool setProperty(const PropertyValue& key, const PropertyValue& value) noexcept override;
    void reportHandled() noexcept override;

private:
    /// Our end of a socket pair. Senders hold it too, so that it is never closed under them.
    class Socket;
    struct FeatureReport {
        vexa_status status = VEXA_STATUS_SUCCESS;
        Bytes bytes{};
    };

    bool send(std::span<const std::uint8_t> report, int flags);
    void enter(std::string_view operation);
    void enter(Call call);
    void hangUp() REQUIRES(mutex_);

    mutable Mutex mutex_;
    std::condition_variable_any changed_;
    std::shared_ptr<Socket> socket_ GUARDED_BY(mutex_);
    bool unplugged_ GUARDED_BY(mutex_) = false;
    std::deque<vexa_status> openStatuses_ GUARDED_BY(mutex_);
    std::map<std::uint32_t, FeatureReport> featureReports_ GUARDED_BY(mutex_);
    Writes writes_ GUARDED_BY(mutex_) = Writes::Stored;
    PropertyValue::Dictionary properties_ GUARDED_BY(mutex_);
    std::vector<Call> calls_ GUARDED_BY(mutex_);
    std::shared_ptr<const std::function<void(std::string_view)>> hook_ GUARDED_BY(mutex_);
    std::atomic<bool> hasHook_{false};

    // The input thread takes the lock only when somebody waits for just this report.
    std::atomic<std::uint64_t> handled_{0};
    std::atomic<std::uint64_t> awaited_{UINT64_MAX};
};

}  // namespace Vexa
