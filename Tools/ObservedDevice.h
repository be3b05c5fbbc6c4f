#pragma once

#include "Platform/DeviceBackend.h"
#include "Platform/PropertyValue.h"

#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// What somebody wants to hear of a device. None may throw, or open or close the device; all are
/// optional.
struct DeviceHooks {
    /// A state frame, at its place: all earlier reports have been handled, later ones leave when
    /// this returns. `key` is the recorded one ("Algs.HoldTimeoutMilliseconds": no "Pipeline").
    /// Without it state frames are passed over. On the player's thread; played devices only.
    std::function<void(const std::string& key, const Vexa::PropertyValue& value)> onStateFrame = {};
    /// Everything was played and handled; once for each opening that gets so far. On the player's
    /// thread; played devices only.
    std::function<void()> onFinished = {};
    /// The first moment at which a report is known: it is about to leave a played device (not for
    /// one that is dropped because of the backlog; on the player's thread), or was read from a live
    /// one (on the input thread). Must not block.
    std::function<void(std::span<const std::uint8_t> report)> onSend = {};
    /// A report was read, at this host tick, and the service gets it next. On its input thread;
    /// must not block.
    std::function<void(std::span<const std::uint8_t> report, std::uint64_t ticks)> onArrived = {};
    /// The service is done with a report. On its input thread; must not block.
    std::function<void()> onHandled = {};
    /// The plug was pulled while the device was open. On the thread that did it; played devices
    /// only.
    std::function<void()> onUnplugged = {};
};

/// A device of a command: one that is played or one that is there.
class ObservedDevice : public Vexa::DeviceBackend {
public:
    /// A property that a live device has even after the unplug: a service that gets no value for it
    /// has read the device to its end. Played devices do not have it, since they count what they
    /// send.
    static constexpr std::string_view kReadsOnKey = "VexaTouch.ReadsOn";

    /// While the device is closed, and no report is being handled.
    virtual void setHooks(DeviceHooks hooks) = 0;

    /// When no hook tells of an unplug: poll it for no events, and a hang-up tells. -1: none.
    [[nodiscard]] virtual int hangUpDescriptor() const noexcept { return -1; }
    /// Reports of the latest opening that left a played device or were read from a live one, and
    /// those that the service is done with. Any thread.
    [[nodiscard]] virtual std::uint64_t sent() const noexcept = 0;
    [[nodiscard]] virtual std::uint64_t handled() const noexcept = 0;
    /// Whether somebody is there to read a live device: a report that is not read is not known of
    /// otherwise. A played device knows what it has sent: always true. Any thread.
    [[nodiscard]] virtual bool isServed() const noexcept { return true; }
    /// What became of the reports of the latest opening: "12 reports sent, 0 dropped".
    [[nodiscard]] virtual std::string tally() const = 0;
};

}  // namespace VexaTouch::Tools
