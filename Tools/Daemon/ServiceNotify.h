#pragma once

#include <chrono>
#include <optional>
#include <string>

/// What a service tells its manager. Without one, which NOTIFY_SOCKET in the environment names,
/// nothing is told and there is no watchdog.
namespace VexaTouch::Tools::Daemon::ServiceNotify {

void ready();
void stopping();
/// One line for people.
void status(const std::string& text);
/// Still alive.
void alive();

/// How often the manager wants to hear alive(); half of it is a good interval.
std::optional<std::chrono::microseconds> watchdog();

}  // namespace VexaTouch::Tools::Daemon::ServiceNotify
