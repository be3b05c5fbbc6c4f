#pragma once

#include "Host/HostSession.h"
#include "Platform/DeviceBackend.h"
#include "Platform/HostClock.h"
#include "Platform/Mutex.h"
#include "Platform/PropertyValue.h"
#include "Platform/ThreadAnnotations.h"
#include "Tools/ForwardingDevice.h"
#include "Tools/FrameFeed.h"

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

namespace VexaTouch::Tools {

/// Gives feeds a copy of every input of one service, in the very order in which the service takes
/// them: the reports that its input thread reads and the settings that its host writes. What the
/// feeds get, replayed, gives the events that the service gave.
///
/// For that the service gets its device through a TappedDevice and its properties through
/// setProperty. From the arrival of a report until the service is done with it no setting is
/// written, and the other way round. A setting is written as quickly as the service's own lock lets
/// it and nothing else is done meanwhile, so this costs the input thread no wait that it does not
/// have anyway; it waits for no disk, no reader and no memory.
class InputTap {
public:
    /// Times come from `clock`, which must outlive it.
    explicit InputTap(Vexa::HostClock& clock = Vexa::HostClock::system()) noexcept
        : clock_(clock) {}
    ~InputTap() = default;
    InputTap(const InputTap&) = delete;
    InputTap(InputTap&&) = delete;
    InputTap& operator=(const InputTap&) = delete;
    InputTap& operator=(InputTap&&) = delete;

    // Any thread but the service's input thread.

    /// Begins to fill the feed: first with every setting in force, then with all that comes.
    void add(std::shared_ptr<FrameFeed> feed, const Host::HostSession& session)
        EXCLUDES(settings_, order_);
    /// Closes the feed; nothing comes any more. Does nothing when it was not added.
    void remove(const std::shared_ptr<FrameFeed>& feed) EXCLUDES(settings_, order_);
    /// Writes a property of the service, which stands at its place in the feeds if it is one of the
    /// pipeline. Whether the service took it.
    bool setProperty(const Host::HostSession& session, const std::string& key,
                     const Vexa::PropertyValue& value) EXCLUDES(settings_, order_);

    // The service's input thread: between the two it handles the report.

    void reportArrived(std::span<const std::uint8_t> report) noexcept ACQUIRE(order_);
    void reportHandled() noexcept RELEASE(order_);

private:
    [[nodiscard]] std::uint64_t nowNs() const noexcept;

    Vexa::HostClock& clock_;
    /// Held while settings are written or must not change. Always taken before the other.
    Vexa::Mutex settings_;
    /// Held while an input is being taken by the service.
    Vexa::Mutex order_;
    std::vector<std::shared_ptr<FrameFeed>> feeds_ GUARDED_BY(order_);
};

/// A device whose reports a tap sees; all else is the device's.
class TappedDevice final : public ForwardingDevice {
public:
    TappedDevice(std::shared_ptr<Vexa::DeviceBackend> device,
                 std::shared_ptr<InputTap> tap) noexcept;

    // The library calls both in turn, on one thread: what the first takes the second gives back.
    void reportArrived(std::span<const std::uint8_t> report,
                       std::uint64_t timestamp) noexcept override NO_THREAD_SAFETY_ANALYSIS;
    void reportHandled() noexcept override NO_THREAD_SAFETY_ANALYSIS;

private:
    const std::shared_ptr<InputTap> tap_;
};

}  // namespace VexaTouch::Tools
