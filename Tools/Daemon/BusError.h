#pragma once

#include <stdexcept>
#include <string>
#include <string_view>

namespace VexaTouch::Tools::Daemon {

/// What the bus answers instead of a result: a name that a program tells apart and a text for the
/// person who meets it.
class BusError : public std::runtime_error {
public:
    BusError(std::string_view name, const std::string& message)
        : std::runtime_error(message), name_(name) {}

    [[nodiscard]] const std::string& name() const noexcept { return name_; }

private:
    std::string name_;
};

/// The names of our errors; those of the bus itself begin with org.freedesktop.DBus.Error.
namespace ErrorName {
inline constexpr std::string_view kAccessDenied = "org.freedesktop.DBus.Error.AccessDenied";
/// Nothing knows the key, or it has no value.
inline constexpr std::string_view kUnknownKey = "org.vexatouch.Touch1.Error.UnknownKey";
/// The key can be read and not written.
inline constexpr std::string_view kReadOnly = "org.vexatouch.Touch1.Error.ReadOnly";
/// The value is of a type or size that the key does not take, or nothing takes.
inline constexpr std::string_view kInvalidValue = "org.vexatouch.Touch1.Error.InvalidValue";
/// Too much at once: calls that wait, streams that are open.
inline constexpr std::string_view kBusy = "org.vexatouch.Touch1.Error.Busy";
/// The surface is not running: it was unplugged or could not be started.
inline constexpr std::string_view kNotRunning = "org.vexatouch.Touch1.Error.NotRunning";
/// The device or the system refused.
inline constexpr std::string_view kFailed = "org.vexatouch.Touch1.Error.Failed";
}  // namespace ErrorName

}  // namespace VexaTouch::Tools::Daemon
