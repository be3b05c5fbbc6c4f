#include "Tools/Daemon/ServiceNotify.h"

#include <systemd/sd-daemon.h>

#include <cstdint>

namespace VexaTouch::Tools::Daemon {
namespace {

void tell(const std::string& text) {
    static_cast<void>(sd_notify(0, text.c_str()));
}

}  // namespace

void ServiceNotify::ready() {
    tell("READY=1");
}

void ServiceNotify::stopping() {
    tell("STOPPING=1");
}

void ServiceNotify::status(const std::string& text) {
    tell("STATUS=" + text);
}

void ServiceNotify::alive() {
    tell("WATCHDOG=1");
}

std::optional<std::chrono::microseconds> ServiceNotify::watchdog() {
    std::uint64_t interval = 0;
    if (sd_watchdog_enabled(0, &interval) <= 0) {
        return std::nullopt;
    }
    return std::chrono::microseconds(interval);
}

}  // namespace VexaTouch::Tools::Daemon
