#pragma once

#include "Host/HostSession.h"
#include "Host/PluginLibrary.h"
#include "Platform/DeviceBackend.h"
#include "Tools/FrameFeed.h"
#include "Tools/InputTap.h"
#include "Tools/LastReports.h"
#include "Tools/ObservedDevice.h"
#include "Tools/RecordKeeper.h"
#include "Tools/RecordingStream.h"
#include "Tools/ReportWatch.h"
#include "Tools/SettingKeys.h"
#include "Tools/SignalWatch.h"
#include "Tools/Streams.h"
#include "Tools/WakeUp.h"

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

namespace VexaTouch::Tools {

/// How a device is recorded.
struct RecordRunOptions {
    std::vector<Setting> settings = {};  ///< given to the service before it is scheduled
    std::optional<std::chrono::nanoseconds> duration = {};
    std::optional<std::uint64_t> count = {};  ///< of input reports
    /// Room for what the disk does not take at once.
    std::size_t feedBytes = FrameFeed::kUsualBytes;
    /// The device plays no faster than the file is written: for played devices only, since a live
    /// one would hold up the input thread. Without, what finds no room is lost.
    bool holdBack = true;
};

/// A service with a device of its own whose every input goes into a file, for as long as that
/// takes. It ends when the device has played everything or is gone and what it had sent is taken,
/// after a time, after a number of reports, at a signal, when the file cannot be written any more,
/// or when the service takes no reports.
///
/// The thread that runs it writes; the input thread and the device's player never wait for it.
class RecordRun {
public:
    /// Walks the plug-in's life up to its event callback and gives it the settings. `sink` gets the
    /// events, on the session's queue. `signals` and `wake` belong together. Everything given must
    /// outlive the run. Throws HostFailure and Failure.
    RecordRun(const Host::PluginLibrary& library, const std::shared_ptr<ObservedDevice>& device,
              RecordRunOptions options, Host::HostSession::EventSink sink, SignalWatch& signals,
              const WakeUp& wake, Streams& streams);
    ~RecordRun();
    RecordRun(const RecordRun&) = delete;
    RecordRun(RecordRun&&) = delete;
    RecordRun& operator=(const RecordRun&) = delete;
    RecordRun& operator=(RecordRun&&) = delete;

    /// Runs to the end, the whole teardown included, and finishes the stream. Once. Throws
    /// HostFailure and Failure, also when the device was unplugged; the stream is finished then as
    /// far as it can be, unless there was no report.
    RecordSummary run(RecordingStream& stream);
    /// What went into the stream, also when run() threw.
    [[nodiscard]] RecordSummary summary() const noexcept {
        return keeper_ ? keeper_->summary() : RecordSummary{};
    }

private:
    using Time = std::chrono::steady_clock::time_point;

    void installHooks();
    [[nodiscard]] bool isOver();
    void waitForWork();
    void answerUserSignal();
    bool takeFrames();
    void holdBack() noexcept;
    void endHoldBack() noexcept;

    std::shared_ptr<ObservedDevice> device_;
    RecordRunOptions options_;
    SignalWatch& signals_;
    const WakeUp& wake_;
    Streams& streams_;
    std::shared_ptr<InputTap> tap_;
    std::shared_ptr<FrameFeed> feed_;
    FrameDecoder decoder_;
    RecordingStream* stream_ = nullptr;   // while it runs
    std::optional<RecordKeeper> keeper_;  // from then on
    std::optional<Time> deadline_;
    ReportWatch watch_;
    bool stuck_ = false;
    // The device's player waits for the second to change while the first is false.
    std::atomic<bool> noHoldBack_;
    std::atomic<std::uint32_t> turns_ = 0;
    // Set by the device's threads.
    std::atomic<bool> finished_ = false;
    std::atomic<bool> unplugged_ = false;
    Vexa::DeviceRegistration registration_;
    Host::HostSession session_;
    LastReports lastReports_;
};

}  // namespace VexaTouch::Tools
