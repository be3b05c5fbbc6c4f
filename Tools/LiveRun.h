#pragma once

#include "Host/HostSession.h"
#include "Host/KeyMap.h"
#include "Host/MediaKeys.h"
#include "Host/PluginLibrary.h"
#include "Host/SharedKeyboard.h"
#include "Platform/DeviceBackend.h"
#include "Tools/ArrivalTimes.h"
#include "Tools/DeliveredEvent.h"
#include "Tools/EventInbox.h"
#include "Tools/FrameGaps.h"
#include "Tools/LiveScreen.h"
#include "Tools/LiveSurface.h"
#include "Tools/ObservedDevice.h"
#include "Tools/ReportWatch.h"
#include "Tools/SettingKeys.h"
#include "Tools/SignalWatch.h"
#include "Tools/Streams.h"
#include "Tools/TerminalColor.h"
#include "Tools/WakeUp.h"

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace VexaTouch::Tools {

/// How a service is run.
struct LiveRunOptions {
    std::vector<Setting> settings = {};  ///< given to the service before it is scheduled
    bool json = false;                   ///< events as JSON objects instead of columns
    /// Draw the surface and the newest events in place of the columns.
    bool show = false;
    ColorDepth depth = ColorDepth::None;
    std::string recordFile = {};  ///< where the recording goes; empty: nowhere
    std::optional<std::chrono::nanoseconds> duration = {};
    std::optional<std::uint64_t> count = {};  ///< of events
    /// What the gestures' keys are pressed on; null: nothing. It must outlive the run.
    Host::SharedKeyboard* keyboard = nullptr;
    Host::KeyMap keyMap = {};
    /// Events that wait to be printed while nobody reads those before; further ones are lost.
    std::size_t eventRoom = EventInbox::kUsualRoom;
};

/// A service run by a host from its first step to its last: a plug-in, a device and somebody who
/// looks at the events. Says when frames of the device were lost, at most once a second, and how
/// many in the end. It ends when the device has played everything or is gone and what it had sent
/// was handled, after a time, after a number of events, at a signal, when nobody takes the events
/// any more, or when the service takes no reports.
///
/// The thread that runs it prints, draws and writes; the input thread and the device's player only
/// ever leave things for it. Keys are pressed on the thread that delivers the events. A further
/// thread, which never writes, sees that the run is over, halts the session and releases the keys:
/// so none stays down although the first waits for somebody who reads the output.
class LiveRun {
public:
    /// Walks the plug-in's life up to its event callback and gives it the settings. `signals` and
    /// `wake` belong together. Everything given must outlive the run. Throws HostFailure and
    /// Failure.
    LiveRun(const Host::PluginLibrary& library, const std::shared_ptr<ObservedDevice>& device,
            LiveRunOptions options, SignalWatch& signals, const WakeUp& wake, Streams& streams);
    ~LiveRun();
    LiveRun(const LiveRun&) = delete;
    LiveRun(LiveRun&&) = delete;
    LiveRun& operator=(const LiveRun&) = delete;
    LiveRun& operator=(LiveRun&&) = delete;

    /// Runs to the end, the whole teardown included. Once. Throws HostFailure and Failure, also
    /// when the device was unplugged and when events were lost because nobody read those before.
    void run();

private:
    using Time = std::chrono::steady_clock::time_point;

    class Keeper;

    struct Totals {
        std::uint64_t events = 0;
        std::uint64_t lost = 0;
        std::uint64_t latencySumNs = 0;
        std::uint64_t latencyMostNs = 0;
    };

    void installHooks();

    // The keeper's thread.
    void keep();
    [[nodiscard]] bool isOver() const;
    void waitForEnd();
    void waitForLastReports();
    void releaseKeys() noexcept;

    // The thread that runs it.
    void runToEnd();
    void waitForWork() const;
    void handleWork();
    void endWhenEnough();
    void takeEvents();
    void print(const DeliveredEvent& event);
    void handleKeys();
    void draw(bool anyway);
    void tellOfKeyboard() const;
    void tellOfGaps();
    void writeRecordingOnWish();
    void writeRecording();
    /// Gaps in the frame numbers, as found here or by the service, whoever has come further, and
    /// what was lost in them: "2 gaps, 14 frames lost".
    [[nodiscard]] std::string gapsText() const;
    void printSummary(const std::string& gaps) const;

    std::shared_ptr<ObservedDevice> device_;
    LiveRunOptions options_;
    SignalWatch& signals_;
    const WakeUp& wake_;
    Streams& streams_;
    std::uint64_t startNs_;
    WakeUp work_;
    EventInbox inbox_;
    ArrivalTimes arrivals_;
    std::unique_ptr<LiveSurface> surface_;
    std::unique_ptr<LiveScreen> screen_;
    std::deque<std::string> newest_;  // events under the picture
    bool eventsChanged_ = false;
    Totals totals_;
    FrameGaps gaps_;
    std::uint64_t gapsTold_ = 0;
    std::optional<Time> nextGapTime_;  // not before this is there a further line
    Time nextDraw_;
    bool quit_ = false;
    // The keeper's while it lives.
    std::optional<Time> deadline_;
    ReportWatch watch_;
    bool stuck_ = false;
    std::atomic<bool> enough_ = false;  // the thread that runs it has no more use for events
    std::atomic<bool> halted_ = false;
    // Set by the device's threads.
    std::atomic<bool> finished_ = false;
    std::atomic<bool> unplugged_ = false;
    std::optional<Host::MediaKeys> keys_;  // outlives the session, whose events come to it
    Vexa::DeviceRegistration registration_;
    Host::HostSession session_;
};

}  // namespace VexaTouch::Tools
