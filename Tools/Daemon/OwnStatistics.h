#pragma once

#include "Host/PluginLibrary.h"
#include "Platform/PropertyValue.h"
#include "Tools/ObservedDevice.h"
#include "Tools/SignalWatch.h"
#include "Tools/WakeUp.h"

#include <chrono>
#include <memory>
#include <optional>
#include <string>

namespace VexaTouch::Tools::Daemon {

/// What there is to tell of a device in the words of the daemon, which has a node and a reason
/// besides: both are empty here.
struct OwnStatistics {
    Vexa::PropertyValue properties;  ///< of the interface of its surfaces, by name
    Vexa::PropertyValue statistics;
};

/// Runs the service on a device as the daemon does, without a bus: until everything was played, for
/// a time, or until a signal asks for the end. `name` is what the device is called where nothing
/// else names it; `signals` and `wake` belong together. Throws Failure when the device or the
/// plug-in cannot be used, when the device is unplugged, and when the service takes no reports for
/// so long.
OwnStatistics gatherStatistics(const Host::PluginLibrary& library, const std::string& name,
                               const std::shared_ptr<ObservedDevice>& device,
                               std::optional<std::chrono::nanoseconds> duration,
                               const SignalWatch& signals, const WakeUp& wake,
                               std::chrono::nanoseconds patience);

}  // namespace VexaTouch::Tools::Daemon
