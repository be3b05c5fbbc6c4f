#include "Platform/ScriptedDevice.h"

#include <sys/socket.h>
#include <unistd.h>
#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <string>
#include <utility>

namespace Vexa {

namespace {

// Only a failing test waits that long.
constexpr std::chrono::minutes kGuard{1};

}  // namespace

class ScriptedDevice::Socket {
public:
    explicit Socket(int descriptor) noexcept : descriptor_(descriptor) {}
    ~Socket() { static_cast<void>(::close(descriptor_)); }
    Socket(const Socket&) = delete;
    Socket(Socket&&) = delete;
    Socket& operator=(const Socket&) = delete;
    Socket& operator=(Socket&&) = delete;

    [[nodiscard]] int descriptor() const noexcept { return descriptor_; }

    bool send(std::span<const std::uint8_t> report, int flags) const noexcept {
        for (;;) {
            if (::send(descriptor_, report.data(), report.size(), flags | MSG_NOSIGNAL) >= 0) {
                return true;
            }
            if (errno != EINTR) return false;
        }
    }

    // Unlike closing it wakes those who are blocked in send().
    void hangUp() const noexcept { static_cast<void>(::shutdown(descriptor_, SHUT_RDWR)); }

private:
    int descriptor_;
};

ScriptedDevice::ScriptedDevice(PropertyValue::Dictionary properties)
    : properties_(std::move(properties)) {}

ScriptedDevice::~ScriptedDevice() = default;

bool ScriptedDevice::sendReport(std::span<const std::uint8_t> report) {
    return send(report, 0);
}

bool ScriptedDevice::trySendReport(std::span<const std::uint8_t> report) {
    return send(report, MSG_DONTWAIT);
}

bool ScriptedDevice::send(std::span<const std::uint8_t> report, int flags) {
    std::shared_ptr<Socket> socket;
    {
        const MutexLock lock(mutex_);
        socket = socket_;
    }
    return socket && socket->send(report, flags);
}

bool ScriptedDevice::waitUntilHandled(std::uint64_t reports) {
    const auto deadline = std::chrono::steady_clock::now() + kGuard;
    const MutexLock lock(mutex_);
    for (;;) {
        // Announced before looking, as the input thread counts before it looks for the
        // announcement.
        awaited_ = std::min(awaited_.load(), reports);
        if (handled_ >= reports) return true;
        if (changed_.wait_until(mutex_, deadline) == std::cv_status::timeout) {
            return handled_ >= reports;
        }
    }
}

void ScriptedDevice::hangUp() {
    if (!socket_) return;
    socket_->hangUp();
    socket_.reset();
    changed_.notify_all();
}

void ScriptedDevice::unplug() {
    const MutexLock lock(mutex_);
    unplugged_ = true;
    hangUp();
}

bool ScriptedDevice::isOpen() const {
    const MutexLock lock(mutex_);
    return socket_ != nullptr;
}

bool ScriptedDevice::waitUntilOpen(bool open) {
    const auto deadline = std::chrono::steady_clock::now() + kGuard;
    const MutexLock lock(mutex_);
    while ((socket_ != nullptr) != open) {
        if (changed_.wait_until(mutex_, deadline) == std::cv_status::timeout) {
            return (socket_ != nullptr) == open;
        }
    }
    return true;
}

void ScriptedDevice::setNextOpenStatuses(std::vector<vexa_status> statuses) {
    const MutexLock lock(mutex_);
    openStatuses_.assign(statuses.begin(), statuses.end());
}

void ScriptedDevice::setFeatureReport(std::uint32_t reportId, Bytes bytes) {
    const MutexLock lock(mutex_);
    featureReports_[reportId] = {.bytes = std::move(bytes)};
}

void ScriptedDevice::setFeatureReportStatus(std::uint32_t reportId, vexa_status status) {
    const MutexLock lock(mutex_);
    featureReports_[reportId] = {.status = status};
}

void ScriptedDevice::setWrites(Writes writes) {
    const MutexLock lock(mutex_);
    writes_ = writes;
}

void ScriptedDevice::setPropertyValue(std::string_view key, PropertyValue value) {
    const MutexLock lock(mutex_);
    properties_.insert_or_assign(std::string(key), std::move(value));
}

PropertyValue::Dictionary ScriptedDevice::properties() const {
    const MutexLock lock(mutex_);
    return properties_;
}

void ScriptedDevice::setHook(std::function<void(std::string_view)> hook) {
    using Hook = std::function<void(std::string_view)>;
    auto shared = hook ? std::make_shared<const Hook>(std::move(hook)) : nullptr;
    const MutexLock lock(mutex_);
    hasHook_ = shared != nullptr;
    hook_.swap(shared);
}

std::vector<ScriptedDevice::Call> ScriptedDevice::calls() const {
    const MutexLock lock(mutex_);
    return calls_;
}

std::size_t ScriptedDevice::callCount(std::string_view operation) const {
    const MutexLock lock(mutex_);
    return static_cast<std::size_t>(std::ranges::count(calls_, operation, &Call::operation));
}

void ScriptedDevice::enter(std::string_view operation) {
    if (!hasHook_) return;
    std::shared_ptr<const std::function<void(std::string_view)>> hook;
    {
        const MutexLock lock(mutex_);
        hook = hook_;
    }
    if (hook) (*hook)(operation);
}

void ScriptedDevice::enter(Call call) {
    const std::string_view operation = call.operation;
    {
        const MutexLock lock(mutex_);
        calls_.push_back(std::move(call));
    }
    enter(operation);
}

vexa_status ScriptedDevice::open(std::uint32_t options, int& descriptor) noexcept {
    enter({.operation = kOpen, .options = options});
    const MutexLock lock(mutex_);
    if (unplugged_) return VEXA_STATUS_GONE;
    if (!openStatuses_.empty()) {
        const vexa_status status = openStatuses_.front();
        openStatuses_.pop_front();
        if (status != VEXA_STATUS_SUCCESS) return status;
    }
    std::array<int, 2> ends{};
    if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends.data()) != 0) {
        return VEXA_STATUS_NO_RESOURCES;
    }
    hangUp();
    socket_ = std::make_shared<Socket>(ends[0]);
    changed_.notify_all();
    descriptor = ends[1];
    return VEXA_STATUS_SUCCESS;
}

void ScriptedDevice::close(std::uint32_t options) noexcept {
    enter({.operation = kClose, .options = options});
    const MutexLock lock(mutex_);
    hangUp();
}

vexa_status ScriptedDevice::getReport(vexa_report_type type, std::uint32_t reportId,
                                      std::span<std::uint8_t> report,
                                      std::size_t& length) noexcept {
    enter({.operation = kGetReport, .type = type, .reportId = reportId, .room = report.size()});
    const MutexLock lock(mutex_);
    if (unplugged_) return VEXA_STATUS_GONE;
    const auto found = featureReports_.find(reportId);
    if (type != VEXA_REPORT_FEATURE || found == featureReports_.end()) {
        return VEXA_STATUS_UNSUPPORTED;
    }
    const auto& [status, bytes] = found->second;
    if (status != VEXA_STATUS_SUCCESS) return status;
    length = std::min(bytes.size(), report.size());
    std::copy_n(bytes.begin(), length, report.begin());
    return VEXA_STATUS_SUCCESS;
}

PropertyValue ScriptedDevice::property(const PropertyValue& key) noexcept {
    enter({.operation = kProperty, .key = key});
    const MutexLock lock(mutex_);
    const auto name = key.asString();
    if (unplugged_ || !name) return {};
    const auto found = properties_.find(*name);
    return found == properties_.end() ? PropertyValue() : found->second;
}

bool ScriptedDevice::setProperty(const PropertyValue& key, const PropertyValue& value) noexcept {
    enter({.operation = kSetProperty, .key = key, .value = value});
    const MutexLock lock(mutex_);
    const auto name = key.asString();
    if (unplugged_ || !name || writes_ == Writes::Refused) return false;
    if (writes_ == Writes::Stored) properties_.insert_or_assign(std::string(*name), value);
    return true;
}

void ScriptedDevice::reportHandled() noexcept {
    enter(kReportHandled);
    if (++handled_ < awaited_) return;
    const MutexLock lock(mutex_);
    // Whoever waits for more announces it again.
    awaited_ = UINT64_MAX;
    changed_.notify_all();
}

}  // namespace Vexa
