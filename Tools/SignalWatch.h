#pragma once

#include "Tools/FileDescriptor.h"
#include "Tools/WakeUp.h"

#include <atomic>
#include <csignal>
#include <thread>

namespace VexaTouch::Tools {

/// Takes the signals that a long run is steered by, as long as it lives: SIGINT, SIGTERM and SIGHUP
/// ask for an end, SIGUSR1 for the recording; SIGPIPE and SIGXFSZ only make the writing fail. The
/// second signal that asks for an end ends the process at once. SIGINT and SIGHUP stay ignored in a
/// process that was started so.
///
/// Signals are read by a thread of its own, so that the second one also works while everybody else
/// is stuck; no handler interrupts anybody. Made before any thread that shall not be bothered by
/// them; one at a time in a process.
class SignalWatch {
public:
    /// `wake` (which must outlive it) is notified of each signal. Throws Failure.
    explicit SignalWatch(const WakeUp& wake);
    ~SignalWatch();
    SignalWatch(const SignalWatch&) = delete;
    SignalWatch(SignalWatch&&) = delete;
    SignalWatch& operator=(const SignalWatch&) = delete;
    SignalWatch& operator=(SignalWatch&&) = delete;

    /// Any thread.
    [[nodiscard]] bool endWanted() const noexcept { return endWanted_.load(); }
    /// Whether SIGUSR1 has arrived since this was last asked.
    [[nodiscard]] bool takeRecordingWanted() noexcept { return recordingWanted_.exchange(false); }

private:
    void watch() noexcept;
    void take(int signal) noexcept;

    const WakeUp& wake_;
    std::atomic<bool> endWanted_ = false;
    std::atomic<bool> recordingWanted_ = false;
    sigset_t previousMask_{};
    struct sigaction previousPipe_{};
    struct sigaction previousFileSize_{};
    FileDescriptor signals_;
    FileDescriptor over_;
    std::thread thread_;
};

}  // namespace VexaTouch::Tools
