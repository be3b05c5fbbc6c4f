#pragma once

#include "Host/PluginLibrary.h"
#include "Platform/HidEvent.h"
#include "Tools/Daemon/Bus.h"
#include "Tools/Daemon/CallerRights.h"
#include "Tools/Daemon/DeviceObject.h"
#include "Tools/Daemon/DeviceSource.h"
#include "Tools/Daemon/EventLoop.h"
#include "Tools/Daemon/ManagerObject.h"
#include "Tools/Daemon/RecordStreams.h"
#include "Tools/Daemon/RememberedSettings.h"
#include "Tools/Daemon/SurfaceInstance.h"

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

/// Who else wants to know of the events of a surface, from its begin to its end.
class EventListener {
public:
    EventListener() = default;
    virtual ~EventListener() = default;
    EventListener(const EventListener&) = delete;
    EventListener(EventListener&&) = delete;
    EventListener& operator=(const EventListener&) = delete;
    EventListener& operator=(EventListener&&) = delete;

    /// On the host's queue of this surface; must not throw.
    virtual void handle(const Vexa::HidEvent& event) noexcept = 0;
    /// It has failed or is about to be taken down: let go of what is held for it, before anything
    /// that may wait. Events may still be on their way, and come yet. On the loop's thread, perhaps
    /// more than once.
    virtual void surfaceEnding() noexcept = 0;
    /// No event comes any more. On the loop's thread.
    virtual void surfaceGone() noexcept = 0;
    /// What it has failed with, in one line, once. On the loop's thread, after events and after
    /// each of both above.
    [[nodiscard]] virtual std::optional<std::string> takeFailure() { return std::nullopt; }
};

struct DaemonOptions {
    RightsPolicy rights;
    /// Makes the listener of a surface; may be empty, or give none.
    std::function<std::unique_ptr<EventListener>()> listener = {};
    SurfaceTimes times = {};
};

/// All surfaces of a source, each with its instance of the plug-in and its object on the bus. What
/// was set on one stays in force when it is plugged in again. One thread, the loop's.
class Daemon {
public:
    /// Outcomes are written to `log`, each once. Everything given must outlive it. Offers the
    /// objects and asks for the name. Throws Failure.
    Daemon(EventLoop& loop, Bus& bus, const Host::PluginLibrary& library, DeviceSource& source,
           DaemonOptions options, std::ostream& log);
    ~Daemon();
    Daemon(const Daemon&) = delete;
    Daemon(Daemon&&) = delete;
    Daemon& operator=(const Daemon&) = delete;
    Daemon& operator=(Daemon&&) = delete;

    /// Takes down every surface, and calls back.
    void end(std::function<void()> done);

    /// Calls back once each input thread has answered.
    void ping(std::function<void()> answered);

    /// Surfaces that are plugged in.
    [[nodiscard]] std::size_t surfaces() const noexcept;
    /// Of all surfaces so far.
    [[nodiscard]] std::uint64_t reports() const noexcept;
    [[nodiscard]] std::uint64_t framesLost() const noexcept;
    /// Called when a surface has come, gone or changed its state, and when frames were lost.
    std::function<void()> onChange;
    /// Called after gestures.
    std::function<void()> onGestures;

private:
    struct Device;

    void takeChanges();
    void add(PluggedSurface surface);
    void remove(const std::string& id);
    void tryAgain(PluggedSurface surface);
    [[nodiscard]] Device* find(const std::string& id) const;
    void takeDown(Device& device, bool isUnplugged);
    void taken(Device& device);
    void stateChanged(Device& device);
    void tellFailure(const Device& device);
    [[nodiscard]] std::vector<std::string> paths() const;

    EventLoop& loop_;
    Bus& bus_;
    const Host::PluginLibrary& library_;
    DeviceSource& source_;
    DaemonOptions options_;
    std::ostream& log_;
    CallerRights rights_;
    RecordStreams streams_;
    std::vector<std::unique_ptr<Device>> devices_;
    unsigned lastNumber_ = 0;
    std::uint64_t reportsOfGone_ = 0;
    std::uint64_t framesLostOfGone_ = 0;
    RememberedSettings remembered_;
    std::function<void()> ended_;
    ManagerObject manager_;
    EventLoop::WatchHandle sourceWatch_;
};

}  // namespace VexaTouch::Tools::Daemon
