#pragma once

#include "Host/HostSession.h"
#include "Host/PluginLibrary.h"
#include "Platform/DeviceBackend.h"
#include "Platform/Mutex.h"
#include "Platform/PropertyValue.h"
#include "Platform/SerialQueue.h"
#include "Platform/ThreadAnnotations.h"
#include "Tools/Daemon/BusError.h"
#include "Tools/Daemon/CallerRights.h"
#include "Tools/Daemon/DeviceSource.h"
#include "Tools/Daemon/EventLoop.h"
#include "Tools/Daemon/LoopDevice.h"
#include "Tools/Daemon/RememberedSettings.h"
#include "Tools/DeliveredEvent.h"
#include "Tools/FileDescriptor.h"
#include "Tools/FrameFeed.h"
#include "Tools/InputTap.h"
#include "Tools/WakeUp.h"

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

/// What came of something that was asked for: a value or an error.
template <typename Value>
struct Outcome {
    std::optional<Value> value = {};
    std::optional<BusError> error = {};
};

/// What a surface has counted, as the daemon tells it: "Reports", "Images", "FirmwareEvents",
/// "InvalidReports", "Gaps", "FramesLost", "Gestures", and what the service has counted, if that
/// could be had: "DisjointImageCount" and "EventStats".
Vexa::PropertyValue::Dictionary statisticsOf(const ReportCounts& counts, std::uint64_t gestures,
                                             const Vexa::PropertyValue::Dictionary& counters);

/// How long things of a surface may take.
struct SurfaceTimes {
    /// From its begin until its input thread takes reports.
    std::chrono::nanoseconds patience = std::chrono::seconds(5);
    /// From one time that it is told of gaps to the next.
    std::chrono::nanoseconds betweenGaps = std::chrono::seconds(10);
};

/// Gestures in their order, and how many are missing before them.
struct Gestures {
    std::vector<DeliveredEvent> events;
    std::vector<std::uint64_t> hostTimesNs;  ///< of each, when the host got it
    std::uint64_t lost = 0;
};

/// One surface with its own instance of the plug-in, from being plugged in to being taken down.
///
/// All that may wait for the device (the plug-in's life, its properties) happens on a thread of its
/// own, in the order in which it was asked for; the loop's thread asks and is answered. Of the
/// questions to the device whose callers may only watch no more than one is in that order at a
/// time, so that those who may control wait for no more than that one. Public operations are for
/// the loop's thread.
class SurfaceInstance {
public:
    /// Questions that wait; beyond that the answer is Busy.
    static constexpr std::size_t kMostWaiting = 32;
    /// Of these, of one user, over however many connections they come.
    static constexpr std::size_t kMostOfUser = 16;
    /// Of these, of all who may only watch, so that there is always room for those who may control.
    static constexpr std::size_t kMostOfWatchers = 4;
    /// Gestures that wait for the loop; beyond that they are dropped and counted.
    static constexpr std::size_t kMostGestures = 1024;

    enum class State : std::uint8_t { Starting, Running, Failed, Ending };

    struct Hooks {
        /// The state is another one.
        std::function<void()> onState;
        std::function<void(const Gestures& gestures)> onGestures;
        /// Frames are missing that were not told of yet. May be empty.
        std::function<void(const ReportCounts& counts)> onGaps;
        /// Each event, on the host's queue as it is delivered; must not throw.
        std::function<void(const Vexa::HidEvent& event)> onEvent;
    };

    /// Begins to start: opens the device and walks the plug-in's life. `settings` are written
    /// before the first report. Everything given must outlive it. It fails at once when it cannot
    /// start, and later when its input thread ends by itself.
    SurfaceInstance(EventLoop& loop, const Host::PluginLibrary& library, PluggedSurface surface,
                    Settings settings, Hooks hooks, SurfaceTimes times = {});
    /// Once end() has called back; before, only when the loop does not run any more.
    ~SurfaceInstance();
    SurfaceInstance(const SurfaceInstance&) = delete;
    SurfaceInstance(SurfaceInstance&&) = delete;
    SurfaceInstance& operator=(const SurfaceInstance&) = delete;
    SurfaceInstance& operator=(SurfaceInstance&&) = delete;

    /// Takes everything back in order: device closed, unscheduled, stopped, released. What one that
    /// is unplugged had sent before is taken first. Waits for the one question that is being
    /// answered; of those behind it only settings are taken, the others are told NotRunning. Calls
    /// back last of all; no other callback comes afterwards. Once.
    void end(bool isUnplugged, std::function<void()> done);

    [[nodiscard]] State state() const noexcept { return state_; }
    /// "starting", "running", "failed", "ending".
    [[nodiscard]] std::string stateText() const;
    /// Why it failed, or empty.
    [[nodiscard]] const std::string& reason() const noexcept { return reason_; }
    [[nodiscard]] const PluggedSurface& surface() const noexcept { return surface_; }
    /// Those that were written and are in force.
    [[nodiscard]] const Settings& settings() const noexcept { return settings_; }
    [[nodiscard]] ReportCounts counts() const noexcept EXCLUDES(deviceLock_);
    /// Of the gaps, those that onGaps was called for.
    [[nodiscard]] std::uint64_t gapsTold() const noexcept { return gapsTold_; }
    [[nodiscard]] std::uint64_t gestures() const noexcept { return gestures_; }

    // Each throws BusError (NotRunning, Busy) or calls back later.

    void get(const Caller& caller, const std::string& key,
             std::function<void(const Outcome<Vexa::PropertyValue>& outcome)> done);
    /// Gives what the property is afterwards; no value when it cannot be read.
    void set(const Caller& caller, const std::string& key, const Vexa::PropertyValue& value,
             std::function<void(const Outcome<Vexa::PropertyValue>& outcome)> done);
    /// Writes back every setting as it was when the plug-in started, and forgets them.
    void reset(const Caller& caller, std::function<void(const Outcome<bool>& outcome)> done);
    /// What the service itself has counted, for statisticsOf.
    void getCounters(
        const Caller& caller,
        std::function<void(const Outcome<Vexa::PropertyValue::Dictionary>& outcome)> done);

    /// Fills the feed from now on. The tap is for removing it again.
    void addFeed(const Caller& caller, const std::shared_ptr<FrameFeed>& feed,
                 std::function<void(const Outcome<std::shared_ptr<InputTap>>& outcome)> done);

    /// Calls back once the thread that takes the reports has answered, or when there is none that
    /// could. One that is being taken down is asked as long as it has its device.
    void ping(std::function<void()> answered) EXCLUDES(deviceLock_);

private:
    struct Parts;

    void setState(State state, const std::string& reason);
    void lookForThread() EXCLUDES(deviceLock_);
    [[nodiscard]] bool isServed() const EXCLUDES(deviceLock_);
    void deliver(const Vexa::HidEvent& event) EXCLUDES(lock_);
    void takeGestures() EXCLUDES(lock_);
    void tellGaps();
    struct Question {
        Caller caller = {};
        bool asksDevice = false;
        bool isOfSettings = false;  // answered even behind the end

        [[nodiscard]] bool isWatchers() const noexcept { return caller.right < Right::Control; }
        /// Whether there is no more than one such at a time.
        [[nodiscard]] bool isOneByOne() const noexcept { return isWatchers() && asksDevice; }
    };
    /// A question that waits for those before it which go one by one.
    struct Held {
        Question question;
        std::function<void()> task;
        std::function<void(const BusError& error)> refuse;
    };
    template <typename Value, typename Work>
    void ask(const Question& question, Work work,
             std::function<void(const Outcome<Value>& outcome)> done);
    void takePlace(const Question& question);
    void leavePlace(const Question& question) noexcept;
    void submitHeld();

    EventLoop& loop_;
    const Host::PluginLibrary& library_;
    PluggedSurface surface_;
    Settings settings_;
    Hooks hooks_;
    const SurfaceTimes times_;
    State state_ = State::Starting;
    std::string reason_;
    std::size_t waiting_ = 0;
    std::map<uid_t, std::size_t> waitingOf_;  // by user
    std::size_t waitingOfWatchers_ = 0;
    bool isOneAsked_ = false;  // of those that go one by one
    std::deque<Held> held_;    // those behind it
    std::atomic<bool> ending_ = false;
    std::uint64_t gestures_ = 0;
    std::uint64_t gapsTold_ = 0;
    /// No gap is told of before this, on the steady clock.
    std::atomic<std::chrono::nanoseconds> nextGaps_ = std::chrono::nanoseconds(0);
    WakeUp inputWake_;  // by the input thread, which needs no memory for it
    EventLoop::WatchHandle inputWatch_;
    // The worker gives it and takes it back; whoever else uses it does so under the lock, so that
    // the last reference goes on the worker: closing the device may wait.
    mutable Vexa::Mutex deviceLock_;
    std::shared_ptr<LoopDevice> device_ GUARDED_BY(deviceLock_);
    ReportCounts counted_ GUARDED_BY(deviceLock_);  // of one that was taken back
    std::unique_ptr<Parts> parts_;                  // the worker's
    Vexa::Mutex lock_;
    Gestures inbox_ GUARDED_BY(lock_);
    bool inboxPosted_ GUARDED_BY(lock_) = false;
    Vexa::SerialQueue worker_;
};

}  // namespace VexaTouch::Tools::Daemon
