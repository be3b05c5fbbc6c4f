#include "Tools/HidrawSource.h"

#include "Tools/Failure.h"

#include <cerrno>
#include <system_error>
#include <utility>

namespace VexaTouch::Tools {
namespace {

Vexa::HidrawDevice opened(const std::string& node, std::string_view sysPath) {
    try {
        return Vexa::HidrawDevice(node, sysPath);
    } catch (const std::system_error& error) {
        std::string text = error.what();
        switch (error.code().value()) {
            case EACCES:
            case EPERM:
                text += " (a udev rule must give you the node; as root it opens in any case)";
                break;
            case ENOTTY:
            case EINVAL:
                text += " (it is no hidraw node; vexatouch devices --verbose lists them)";
                break;
            case ENOENT:
            case ENODEV:
            case ENXIO:
                text += " (vexatouch devices lists what is plugged in)";
                break;
            default:
                break;
        }
        throw Failure(text);
    }
}

}  // namespace

HidrawSource::HidrawSource(const std::string& node, std::string_view sysPath)
    : device_(opened(node, sysPath)) {}

void HidrawSource::setHooks(DeviceHooks hooks) {
    hooks_ = std::move(hooks);
}

int HidrawSource::hangUpDescriptor() const noexcept {
    return device_.hangUpDescriptor();
}

std::string HidrawSource::tally() const {
    const std::uint64_t read = read_.load();
    return std::to_string(read) + (read == 1 ? " report read" : " reports read");
}

vexa_status HidrawSource::open(std::uint32_t options, int& descriptor) noexcept {
    read_.store(0);
    handled_.store(0);
    return device_.open(options, descriptor);
}

vexa_status HidrawSource::getReport(vexa_report_type type, std::uint32_t reportId,
                                    std::span<std::uint8_t> report, std::size_t& length) noexcept {
    return device_.getReport(type, reportId, report, length);
}

Vexa::PropertyValue HidrawSource::property(const Vexa::PropertyValue& key) noexcept {
    if (key.asString() == kReadsOnKey) {
        return true;
    }
    return device_.property(key);
}

bool HidrawSource::setProperty(const Vexa::PropertyValue& key,
                               const Vexa::PropertyValue& value) noexcept {
    return device_.setProperty(key, value);
}

void HidrawSource::reportArrived(std::span<const std::uint8_t> report,
                                 std::uint64_t timestamp) noexcept {
    read_.fetch_add(1);
    if (hooks_.onSend) {
        hooks_.onSend(report);
    }
    if (hooks_.onArrived) {
        hooks_.onArrived(report, timestamp);
    }
}

void HidrawSource::reportHandled() noexcept {
    handled_.fetch_add(1);
    if (hooks_.onHandled) {
        hooks_.onHandled();
    }
}

void HidrawSource::scheduled(const Vexa::RunLoop& loop, const char* /*mode*/) noexcept {
    isServed_.store(static_cast<bool>(loop));
}

}  // namespace VexaTouch::Tools
