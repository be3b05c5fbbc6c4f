#pragma once

#include "Platform/DeviceBackend.h"
#include "Platform/ScriptedDevice.h"
#include "Platform/SerialQueue.h"
#include "Tools/Validate/CheckRun.h"
#include "Tools/Validate/CheckedService.h"
#include "Tools/Validate/EventSink.h"
#include "Tools/Validate/LoadedPlugin.h"

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

namespace VexaTouch::Tools {

/// A service with all that a host has for it: a device that does as it is told, a queue, and
/// somebody who takes the events.
class CheckStand {
public:
    CheckStand(CheckRun& run, const LoadedPlugin& plugin);

    [[nodiscard]] Vexa::ScriptedDevice& device() const noexcept { return *device_; }
    [[nodiscard]] std::uint32_t handle() const noexcept { return registration_.service(); }
    [[nodiscard]] EventSink& sink() noexcept { return sink_; }
    [[nodiscard]] vexa_queue* queue() const noexcept { return queue_.get(); }
    [[nodiscard]] CheckedService& service() noexcept { return service_; }
    [[nodiscard]] void* target() noexcept { return &device_; }
    [[nodiscard]] void* refcon() noexcept { return &queue_; }

    // The steps of a host, which must succeed.
    void start() { service_.start(handle()); }
    void setCallback() { service_.setEventCallback(EventSink::callback(), target(), refcon()); }
    void schedule() { service_.schedule(queue()); }
    void unschedule() { service_.unschedule(queue()); }
    /// Start, setEventCallback, schedule, open.
    void begin();
    /// close, unschedule, Stop.
    void end();

    /// Sends a report, waiting for room.
    void send(std::span<const std::uint8_t> bytes);
    /// Sends a report and waits until it is handled; fails the check when it is not.
    void report(std::span<const std::uint8_t> bytes);
    /// A report that many services make an event of: the device has been reset.
    void resetReport();
    /// Waits until so many reports were handled in all.
    void waitForReports(std::uint64_t count);
    /// Until everything that was submitted to the queue has run.
    void drain() { queue_.drain(); }

private:
    CheckRun& run_;
    std::shared_ptr<Vexa::ScriptedDevice> device_ = std::make_shared<Vexa::ScriptedDevice>();
    Vexa::DeviceRegistration registration_{device_};
    Vexa::SerialQueue queue_{"validate"};
    EventSink sink_{queue_};
    CheckedService service_;
};

}  // namespace VexaTouch::Tools
