#pragma once

#include "Host/HostSession.h"
#include "Host/PluginLibrary.h"
#include "Platform/DeviceBackend.h"
#include "Tools/ObservedDevice.h"

#include <memory>
#include <semaphore>

namespace VexaTouch::Tools {

/// A device with the service on it, from the first step of a host to the last. State frames of a
/// played device become properties of the service. One thread.
class HostedDevice {
public:
    /// Loads the plug-in from its usual place and walks up to the event callback. `sink` is called
    /// with each event, on the session's queue. Throws HostFailure.
    HostedDevice(std::shared_ptr<ObservedDevice> device, Host::HostSession::EventSink sink);

    /// Schedules and opens: a played device plays from its start. Of the hooks, the state frames'
    /// and the end's are the hosted device's own. Throws HostFailure.
    void begin(DeviceHooks hooks = {});
    /// Returns when a played device has played everything since begin(), and the service handled
    /// it.
    void waitUntilPlayed() { finished_.acquire(); }
    /// Closes and unschedules; all events have been delivered when it returns.
    void halt() { session_.halt(); }
    /// Halts, stops and releases. Throws HostFailure when the service does not stop.
    void end() { session_.end(); }

    [[nodiscard]] const Host::HostSession& session() const noexcept { return session_; }
    [[nodiscard]] ObservedDevice& device() noexcept { return *device_; }

private:
    std::shared_ptr<ObservedDevice> device_;
    std::binary_semaphore finished_{0};
    Vexa::DeviceRegistration registration_;
    Host::PluginLibrary library_;
    Host::HostSession session_;
};

}  // namespace VexaTouch::Tools
