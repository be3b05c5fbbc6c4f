#pragma once

#include <string>

/// How the daemon is found on a bus.
namespace VexaTouch::Tools::Daemon::BusNames {

/// The number is that of the interface: what would break its users gets another one.
inline constexpr const char* kService = "org.vexatouch.Touch1";
inline constexpr const char* kManagerPath = "/org/vexatouch/Touch1";
inline constexpr const char* kManager = "org.vexatouch.Touch1.Manager";
inline constexpr const char* kDevice = "org.vexatouch.Touch1.Device";
/// What was added to it since 1.0 is told by this, major << 16 | minor.
inline constexpr unsigned kApiVersion = 1U << 16U;

/// The object of the device with this number.
inline std::string devicePath(unsigned number) {
    return std::string(kManagerPath) + "/devices/" + std::to_string(number);
}

}  // namespace VexaTouch::Tools::Daemon::BusNames
