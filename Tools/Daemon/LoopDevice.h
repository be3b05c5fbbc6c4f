#pragma once

#include "Platform/DeviceBackend.h"
#include "Platform/Mutex.h"
#include "Platform/RunLoop.h"
#include "Platform/ThreadAnnotations.h"

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
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
class LoopDevice final : public Vexa::DeviceBackend {
public:
    explicit LoopDevice(std::shared_ptr<Vexa::DeviceBackend> device) noexcept
        : device_(std::move(device)) {}

    vexa_status open(std::uint32_t options, int& descriptor) noexcept override;
    void close(std::uint32_t options) noexcept override;
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) noexcept override;
    Vexa::PropertyValue property(const Vexa::PropertyValue& key) noexcept override;
    bool setProperty(const Vexa::PropertyValue& key,
                     const Vexa::PropertyValue& value) noexcept override;
    void reportArrived(std::span<const std::uint8_t> report,
                       std::uint64_t timestamp) noexcept override;
    void reportHandled() noexcept override;
    void scheduled(const Vexa::RunLoop& loop, const char* mode) noexcept override;

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
    void countGap(std::uint32_t frame) noexcept;

    const std::shared_ptr<Vexa::DeviceBackend> device_;
    Vexa::Mutex lock_;
    Vexa::RunLoop loop_ GUARDED_BY(lock_);
    std::string mode_ GUARDED_BY(lock_);
    std::optional<std::uint32_t> lastFrame_;  // the input thread's
    std::atomic<std::uint64_t> reports_{0};
    std::atomic<std::uint64_t> images_{0};
    std::atomic<std::uint64_t> firmwareEvents_{0};
    std::atomic<std::uint64_t> gaps_{0};
    std::atomic<std::uint64_t> framesLost_{0};
};

}  // namespace VexaTouch::Tools::Daemon
