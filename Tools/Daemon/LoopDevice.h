#pragma once

#include "Platform/Mutex.h"
#include "Platform/RunLoop.h"
#include "Platform/ThreadAnnotations.h"
#include "Tools/ForwardingDevice.h"
#include "Tools/FrameGaps.h"

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <utility>

namespace VexaTouch::Tools::Daemon {

/// What a device has sent.
struct ReportCounts {
    std::uint64_t reports = 0;  ///< that the service is done with
    std::uint64_t images = 0;
    std::uint64_t firmwareEvents = 0;
    std::uint64_t invalid = 0;  ///< reports that are neither
    std::uint64_t gaps = 0;     ///< places at which frame numbers are missing
    std::uint64_t framesLost = 0;
};

/// A device that counts its reports and knows the loop that serves them, so that a task can be run
/// between them; all else is the device's.
class LoopDevice final : public ForwardingDevice {
public:
    /// None may throw or block; all are optional.
    struct Hooks {
        /// It has left the loop that served it. On the thread that did it.
        std::function<void()> onLeft = {};
        /// Frames are missing before an image. On the input thread.
        std::function<void()> onGap = {};
    };

    explicit LoopDevice(std::shared_ptr<Vexa::DeviceBackend> device, Hooks hooks) noexcept
        : ForwardingDevice(std::move(device)), hooks_(std::move(hooks)) {}

    void reportArrived(std::span<const std::uint8_t> report,
                       std::uint64_t timestamp) noexcept override;
    void reportHandled() noexcept override;
    void scheduled(const Vexa::RunLoop& loop, const char* mode) noexcept override EXCLUDES(lock_);

    /// Waits until a loop serves the device for the first time; false when none does in time.
    [[nodiscard]] bool waitUntilScheduled(std::chrono::nanoseconds patience) EXCLUDES(lock_);
    /// Whether a loop serves it. An unplugged device is served until it is closed. Any thread.
    [[nodiscard]] bool isScheduled() EXCLUDES(lock_);

    /// Runs the callable (it must not throw) on the thread that takes the reports, between two of
    /// them; destroys it when it never can. False when no loop serves the device. Any thread.
    template <typename Callable>
    bool submit(Callable&& callable) EXCLUDES(lock_) {
        Vexa::RunLoop loop;
        std::string mode;
        {
            const Vexa::MutexLock guard(lock_);
            loop = loop_;
            mode = mode_;
        }
        return loop && loop.submit(mode.c_str(), std::forward<Callable>(callable));
    }

    /// Any thread.
    [[nodiscard]] ReportCounts counts() const noexcept;

private:
    const Hooks hooks_;
    Vexa::Mutex lock_;
    std::condition_variable_any changed_;
    bool wasScheduled_ GUARDED_BY(lock_) = false;
    Vexa::RunLoop loop_ GUARDED_BY(lock_);
    std::string mode_ GUARDED_BY(lock_);
    FrameGaps gaps_;
    std::atomic<std::uint64_t> reports_{0};
    std::atomic<std::uint64_t> images_{0};
    std::atomic<std::uint64_t> firmwareEvents_{0};
};

}  // namespace VexaTouch::Tools::Daemon
