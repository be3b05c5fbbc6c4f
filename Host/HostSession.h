#pragma once

#include "Host/PluginInstance.h"
#include "Host/PluginLibrary.h"
#include "Host/ServiceReference.h"
#include "Platform/HidEvent.h"
#include "Platform/PropertyValue.h"
#include "Platform/SerialQueue.h"

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

namespace VexaTouch::Host {

/// One service driven through its whole life by a host, for one device.
///
/// Constructing walks factory, QueryInterface, Probe, Start and setEventCallback; begin() schedules
/// and opens; halt() closes and unschedules; end() halts, stops and releases. A step that fails
/// undoes exactly the steps before it, in reverse, and says in its HostFailure which step it was
/// and why. The session owns the queue that events are delivered on; its thread has round-robin
/// real-time priority 62, just below the input thread, where that is permitted.
///
/// begin(), halt() and end() are for one thread at a time, never the queue's. property() and
/// setProperty() may be called on any thread until end() begins.
class HostSession {
public:
    /// Called on the queue's thread with each event; may keep it, must not throw. What is logged in
    /// it may be dropped: nothing on that thread waits for a slow reader of the log.
    using EventSink = std::function<void(const Vexa::HidEvent& event)>;

    /// `service` is the handle of a registered device; `properties` goes to Probe and Start. The
    /// library must outlive the session. Throws HostFailure.
    HostSession(const PluginLibrary& library, std::uint32_t service, EventSink sink,
                const Vexa::PropertyValue& properties = Vexa::PropertyValue::Dictionary());
    /// Ends, whatever Stop says.
    ~HostSession();
    HostSession(const HostSession&) = delete;
    HostSession(HostSession&&) = delete;
    HostSession& operator=(const HostSession&) = delete;
    HostSession& operator=(HostSession&&) = delete;

    /// Schedules the service on the session's queue and opens the device: events come from now on.
    /// May be called again after halt(), not before it: throws std::logic_error then and changes
    /// nothing. Throws HostFailure when the device does not open; the session is then as it was
    /// before.
    void begin(std::uint32_t options = 0);

    /// Undoes begin(): no event is made any more, and all that were have been delivered when it
    /// returns. The service still answers for its properties.
    void halt();

    /// Undoes what has been done so far, to the last reference. Does nothing the second time.
    /// Throws HostFailure when Stop failed; even then all else is done.
    void end();

    /// No value when the key has none.
    [[nodiscard]] Vexa::PropertyValue property(std::string_view key) const {
        return service_.property(key);
    }
    /// Whether the value was taken.
    // NOLINTNEXTLINE(modernize-use-nodiscard): a write that nobody checks is fine
    bool setProperty(std::string_view key, const Vexa::PropertyValue& value) const {
        return service_.setProperty(key, value);
    }

    /// Returns once the events that were handed to the queue so far have been delivered.
    void drain() const noexcept { queue_.drain(); }

    /// How well the service fits, as Probe left it; 0 unless the service says else.
    [[nodiscard]] std::int32_t score() const noexcept { return score_; }
    [[nodiscard]] const ServiceReference& service() const noexcept { return service_; }

private:
    static void deliver(void* target, void* refcon, void* sender, vexa_event* event,
                        std::uint32_t options);
    [[noreturn]] void fail(std::string_view step, vexa_status status) const;
    vexa_status release() noexcept;

    std::string file_;  // of the plug-in, for messages
    EventSink sink_;
    Vexa::SerialQueue queue_;
    PluginInstance plugin_;
    ServiceReference service_;
    std::int32_t score_ = 0;
    std::uint32_t options_ = 0;
    bool started_ = false;
    bool scheduled_ = false;
    bool open_ = false;
};

}  // namespace VexaTouch::Host
