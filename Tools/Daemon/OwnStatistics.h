#pragma once

#include "Host/PluginLibrary.h"
#include "Platform/PropertyValue.h"
#include "Tools/ObservedDevice.h"
#include "Tools/Streams.h"

#include <chrono>
#include <memory>
#include <optional>
#include <string>

namespace VexaTouch::Tools::Daemon {

/// What the daemon would tell of a device.
struct OwnStatistics {
    Vexa::PropertyValue properties;  ///< of the interface of its surfaces, by name
    Vexa::PropertyValue statistics;
};

/// Runs the service on a device as the daemon does, without a bus: until everything was played, for
/// a time, or until SIGINT, SIGTERM or SIGHUP; a second signal ends the process. `node` is the
/// device's name where it has none itself. Throws Failure when the device or the plug-in cannot be
/// used, when the device is unplugged, and when the service takes no reports.
OwnStatistics gatherStatistics(const Host::PluginLibrary& library, const std::string& node,
                               const std::shared_ptr<ObservedDevice>& device,
                               std::optional<std::chrono::nanoseconds> duration, Streams& streams);

}  // namespace VexaTouch::Tools::Daemon
