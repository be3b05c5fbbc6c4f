#include "Platform/HidrawDevice.h"

#include "Platform/Log.h"

#include <fcntl.h>
#include <linux/hidraw.h>
#include <linux/input.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <new>
#include <system_error>
#include <utility>

namespace Vexa {
namespace {

// What the number of an ioctl can say.
constexpr std::size_t kLongestRequest = (std::size_t{1} << _IOC_SIZEBITS) - 1;

[[noreturn]] void fail(int error, const std::string& what) {
    throw std::system_error(error, std::generic_category(), what);
}

// -1 with errno set. Where only reading is permitted, for reading.
int openNode(const char* node) noexcept {
    const auto openFor = [node](int access) noexcept {
        int descriptor = -1;
        do {
            descriptor = ::open(node, access | O_NONBLOCK | O_CLOEXEC);
        } while (descriptor < 0 && errno == EINTR);
        return descriptor;
    };
    const int descriptor = openFor(O_RDWR);
    const bool notToWrite = errno == EACCES || errno == EPERM || errno == EROFS;
    return descriptor < 0 && notToWrite ? openFor(O_RDONLY) : descriptor;
}

// The answer of the kernel, or -1 with errno set.
int request(int descriptor, unsigned long code, void* argument) noexcept {
    int answer = -1;
    do {
        answer = ::ioctl(descriptor, code, argument);
    } while (answer < 0 && errno == EINTR);
    return answer;
}

// A text that the kernel keeps of a device; empty when it does not.
template <std::size_t kRoom>
std::string textOf(int descriptor, unsigned long code) {
    std::array<char, kRoom> text{};
    if (request(descriptor, code, text.data()) < 0) return {};
    const auto end = std::ranges::find(text, '\0');
    return {text.begin(), end};
}

[[gnu::format(printf, 2, 3)]] void logLine(LogLevel level, const char* format, ...) noexcept {
    const Log log(LogCategory::HIDService);
    if (!log.isEnabled(level)) return;
    std::array<char, 256> text{};
    va_list arguments;
    va_start(arguments, format);
    std::vsnprintf(text.data(), text.size(), format, arguments);
    va_end(arguments);
    log.write(level, text.data());
}

std::string_view transportOf(std::uint32_t bus) noexcept {
    switch (bus) {
        case BUS_USB:
            return "USB";
        case BUS_BLUETOOTH:
            return "Bluetooth";
        case BUS_VIRTUAL:
            return "Virtual";
        case BUS_I2C:
            return "I2C";
        case BUS_SPI:
            return "SPI";
        default:
            return "Other";
    }
}

}  // namespace

HidrawDevice::HidrawDevice(std::string node, std::string_view sysPath)
    : node_(std::move(node)), control_(openNode(node_.c_str())) {
    if (control_ < 0) fail(errno, node_);
    try {
        struct stat status{};
        if (::fstat(control_, &status) != 0) fail(errno, node_);
        number_ = status.st_rdev;
        // A path in /sys is never given to a second device, and from now on nobody else gets the
        // number of the node: a path that still exists is that of the device which was opened.
        if (!sysPath.empty() && ::access(std::string(sysPath).c_str(), F_OK) != 0) {
            fail(ENODEV, node_ + ": the device that had this node was unplugged");
        }
        readProperties();
    } catch (...) {
        ::close(control_);
        throw;
    }
}

HidrawDevice::~HidrawDevice() {
    ::close(control_);
}

// In the constructor, hence alone.
void HidrawDevice::readProperties() {
    hidraw_devinfo info{};
    if (request(control_, HIDIOCGRAWINFO, &info) < 0) fail(errno, node_ + ": HIDIOCGRAWINFO");
    int size = 0;
    if (request(control_, HIDIOCGRDESCSIZE, &size) < 0) fail(errno, node_ + ": HIDIOCGRDESCSIZE");
    // Filled by the kernel up to `size`.
    hidraw_report_descriptor raw{};
    raw.size = static_cast<std::uint32_t>(std::clamp(size, 0, HID_MAX_DESCRIPTOR_SIZE));
    if (request(control_, HIDIOCGRDESC, &raw) < 0) fail(errno, node_ + ": HIDIOCGRDESC");
    const std::span bytes(raw.value, std::min<std::size_t>(raw.size, sizeof raw.value));
    const auto descriptor = parseReportDescriptor(bytes);

    constexpr std::size_t kLongestName = 256;
    constexpr std::size_t kLongestText = 64;
    const MutexLock lock(mutex_);
    const auto put = [this](std::string_view key, PropertyValue value) REQUIRES(mutex_) {
        properties_.insert_or_assign(std::string(key), std::move(value));
    };
    put(HidrawKey::kBus, std::uint32_t{info.bustype});
    put(HidrawKey::kTransport, transportOf(info.bustype));
    // The header has them signed.
    put(HidrawKey::kVendorId, std::uint32_t{static_cast<std::uint16_t>(info.vendor)});
    put(HidrawKey::kProductId, std::uint32_t{static_cast<std::uint16_t>(info.product)});
    put(HidrawKey::kProduct, textOf<kLongestName>(control_, HIDIOCGRAWNAME(kLongestName)));
    put(HidrawKey::kPhysicalPath, textOf<kLongestText>(control_, HIDIOCGRAWPHYS(kLongestText)));
    put(HidrawKey::kSerialNumber, textOf<kLongestText>(control_, HIDIOCGRAWUNIQ(kLongestText)));
    put(HidrawKey::kReportDescriptor, PropertyValue::Bytes(bytes.begin(), bytes.end()));
    put(HidrawKey::kMaxInputReportSize,
        descriptor ? descriptor->longest(ReportKind::Input) : std::size_t{0});
    if (!descriptor) return;
    for (const ReportDescriptor::Report& report : descriptor->reports) {
        if (report.kind != ReportKind::Feature) continue;
        // Reports without an id are given one, 0, by the kernel.
        featureSizes_[report.id] = static_cast<std::uint16_t>(report.bytes() + 1);
    }
}

bool HidrawDevice::isGone() const noexcept {
    if (gone_) return true;
    pollfd waiting{.fd = control_, .events = 0, .revents = 0};
    if (::poll(&waiting, 1, 0) > 0 && (waiting.revents & (POLLHUP | POLLERR)) != 0) gone_ = true;
    return gone_;
}

vexa_status HidrawDevice::statusOf(int error) noexcept {
    // Of every error alone it cannot be told: an adapter's errors come through unchanged, and that
    // of a device which is busy for a moment is no other than that of one which was unplugged.
    // What is unplugged hangs up before its node goes and before the kernel refuses requests.
    if (isGone()) return VEXA_STATUS_GONE;
    switch (error) {
        case ENOTTY:
        case ENOSYS:
        case EOPNOTSUPP:
            return VEXA_STATUS_UNSUPPORTED;
        case ENOMEM:
        case EMFILE:
        case ENFILE:
        case EACCES:
        case EPERM:
            return VEXA_STATUS_NO_RESOURCES;
        default:
            return VEXA_STATUS_IO_ERROR;
    }
}

vexa_status HidrawDevice::open(std::uint32_t /*options*/, int& descriptor) noexcept {
    if (isGone()) return VEXA_STATUS_GONE;
    const int opened = openNode(node_.c_str());
    if (opened < 0) return statusOf(errno);
    // The number is ours while the device is there, so a node that has it is the device's.
    struct stat status{};
    if (::fstat(opened, &status) != 0 || status.st_rdev != number_ || isGone()) {
        ::close(opened);
        gone_ = true;
        return VEXA_STATUS_GONE;
    }
    descriptor = opened;
    return VEXA_STATUS_SUCCESS;
}

vexa_status HidrawDevice::getReport(vexa_report_type type, std::uint32_t reportId,
                                    std::span<std::uint8_t> report, std::size_t& length) noexcept {
    length = 0;
    if (isGone()) return VEXA_STATUS_GONE;
    if (report.empty() || reportId > UINT8_MAX) return VEXA_STATUS_BAD_ARGUMENT;
    const std::size_t room = std::min(report.size(), kLongestRequest);
    unsigned long code = HIDIOCGFEATURE(room);
    if (type == VEXA_REPORT_INPUT) code = HIDIOCGINPUT(room);
    if (type == VEXA_REPORT_OUTPUT) code = HIDIOCGOUTPUT(room);
    const auto id = static_cast<std::uint8_t>(reportId);
    report[0] = id;
    const auto start = std::chrono::steady_clock::now();
    const int answer = request(control_, code, report.data());
    if (answer < 0) {
        const int error = errno;
        // A kernel that cannot ask for these does not know the number.
        if (error == EINVAL && type != VEXA_REPORT_FEATURE) return VEXA_STATUS_UNSUPPORTED;
        const vexa_status status = statusOf(error);
        if (type == VEXA_REPORT_FEATURE && status != VEXA_STATUS_GONE) {
            noteRefused(id, error,
                        std::chrono::duration_cast<std::chrono::milliseconds>(
                            std::chrono::steady_clock::now() - start));
        }
        return status;
    }
    length = std::min(static_cast<std::size_t>(answer), room);
    if (type == VEXA_REPORT_FEATURE) noteAnswered(id, length, room);
    return VEXA_STATUS_SUCCESS;
}

bool HidrawDevice::isNews(std::uint8_t reportId, int outcome) noexcept {
    return outcomes_[reportId].exchange(outcome) != outcome;
}

void HidrawDevice::noteRefused(std::uint8_t reportId, int error,
                               std::chrono::milliseconds took) noexcept {
    if (!isNews(reportId, error)) return;
    constexpr std::chrono::milliseconds kLate{1000};
    constexpr double kMsPerSecond = 1e3;
    const char* const reason = ::strerrordesc_np(error);
    // The error of a request that the device let wait does not say that it did.
    std::array<char, 32> late{};
    if (took >= kLate) {
        std::snprintf(late.data(), late.size(), ", after %.1f s",
                      static_cast<double>(took.count()) / kMsPerSecond);
    }
    logLine(LogLevel::Error, "%s: feature report %d is not given: %s%s", node_.c_str(),
            int{reportId}, reason == nullptr ? "unknown error" : reason, late.data());
}

void HidrawDevice::noteAnswered(std::uint8_t reportId, std::size_t length,
                                std::size_t room) noexcept {
    const std::size_t whole = std::min<std::size_t>(featureSizes_[reportId], room);
    const bool isShort = length < whole;
    if (!isNews(reportId, isShort ? -1 - static_cast<int>(length) : 0)) return;
    if (isShort) {
        logLine(LogLevel::Error, "%s: feature report %d is too short: %zu of %zu bytes",
                node_.c_str(), int{reportId}, length, whole);
    } else {
        logLine(LogLevel::Info, "%s: feature report %d is given again", node_.c_str(),
                int{reportId});
    }
}

vexa_status HidrawDevice::setFeatureReport(std::span<const std::uint8_t> report) noexcept {
    if (isGone()) return VEXA_STATUS_GONE;
    if (report.empty() || report.size() > kLongestRequest) return VEXA_STATUS_BAD_ARGUMENT;
    // The kernel reads only, whatever the ioctl's type says.
    auto* const bytes = const_cast<std::uint8_t*>(report.data());
    if (request(control_, HIDIOCSFEATURE(report.size()), bytes) < 0) return statusOf(errno);
    return VEXA_STATUS_SUCCESS;
}

PropertyValue HidrawDevice::property(const PropertyValue& key) noexcept {
    const auto name = key.asString();
    if (!name || isGone()) return {};
    const MutexLock lock(mutex_);
    const auto found = properties_.find(*name);
    return found == properties_.end() ? PropertyValue() : found->second;
}

bool HidrawDevice::setProperty(const PropertyValue& key, const PropertyValue& value) noexcept {
    const auto name = key.asString();
    if (!name || !value || isGone()) return false;
    try {
        const MutexLock lock(mutex_);
        properties_.insert_or_assign(std::string(*name), value);
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

}  // namespace Vexa
