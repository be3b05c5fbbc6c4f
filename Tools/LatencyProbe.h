#pragma once

#include "Platform/HidEvent.h"
#include "Platform/TraceListener.h"
#include "Tools/PlayedDevice.h"

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <vector>

namespace VexaTouch::Tools {

/// The stages of a report on its way through the service, each measured from the moment at which
/// the report is written to the device.
enum class LatencyStage : std::uint8_t {
    TakenUp,   ///< the pipeline begins with it, on the input thread
    Handled,   ///< the input callback has returned: the pipeline is done with it
    Landed,    ///< its events have come to the host's queue
    Delivered  ///< the host's callback is called with its first event
};

inline constexpr std::array kLatencyStages = {LatencyStage::TakenUp, LatencyStage::Handled,
                                              LatencyStage::Landed, LatencyStage::Delivered};

/// What a thread was scheduled by.
struct ThreadPriority {
    bool realTime = false;
    int priority = 0;  ///< of the real-time policy
};

/// Takes down the moments of each report of one opening of a device, from the first on: its hooks,
/// the trace points (whose sink it is while it lives) and the host's events tell it. One at a time
/// in a process.
///
/// All memory is there from the start: nothing that is told to it allocates, locks or makes a
/// system call but for the clock, except the first report and the first batch, which look at their
/// threads.
class LatencyProbe {
public:
    /// Has room for so many reports; later ones are not measured. Without `mayBeRealTime` the input
    /// thread and the queue's are put back to the normal policy when they are first seen.
    LatencyProbe(std::size_t reports, bool mayBeRealTime);
    ~LatencyProbe() = default;
    LatencyProbe(const LatencyProbe&) = delete;
    LatencyProbe(LatencyProbe&&) = delete;
    LatencyProbe& operator=(const LatencyProbe&) = delete;
    LatencyProbe& operator=(LatencyProbe&&) = delete;

    /// Those of the device.
    [[nodiscard]] DeviceHooks hooks();
    /// An event is delivered. On the queue's thread.
    void delivered(const Vexa::HidEvent& event) noexcept;

    // Once the device is closed and the queue drained.
    /// In nanoseconds, of the reports that came so far and whose places, from 0, are asked for. An
    /// event is its report's by the number of the frame; a report without events has no sample in
    /// the last two stages.
    [[nodiscard]] std::vector<std::uint64_t> latencies(
        LatencyStage stage, const std::function<bool(std::size_t report)>& isWanted =
                                [](std::size_t) { return true; }) const;
    [[nodiscard]] const ThreadPriority& inputThread() const noexcept { return inputThread_; }
    [[nodiscard]] const ThreadPriority& queueThread() const noexcept { return queueThread_; }

private:
    static constexpr std::size_t kFrames = 65'536;

    void passed(std::uint32_t code) noexcept;
    void sending(std::span<const std::uint8_t> report) noexcept;
    void takenUp() noexcept;
    void handled() noexcept;
    void landed() noexcept;
    [[nodiscard]] ThreadPriority lookAtThisThread() const noexcept;

    std::vector<std::uint64_t>& momentsOf(LatencyStage stage) {
        return moments_[static_cast<std::size_t>(stage)];
    }

    const std::size_t reports_;
    const bool mayBeRealTime_;
    std::vector<std::uint64_t> written_;  ///< in nanoseconds, as all moments
    /// 0 where there was none.
    std::array<std::vector<std::uint64_t>, kLatencyStages.size()> moments_;
    /// Which report had the frame number, by its lowest bits.
    std::vector<std::atomic<std::size_t>> reportOfFrame_;

    std::size_t sent_ = 0;     ///< player's thread
    std::size_t takenUp_ = 0;  ///< input thread
    std::size_t handled_ = 0;  ///< input thread
    ThreadPriority inputThread_;
    ThreadPriority queueThread_;
    std::uint64_t landedNs_ = 0;  ///< queue's thread: of the latest batch

    std::optional<Vexa::TraceListener> listener_;  ///< fills what stands above
};

}  // namespace VexaTouch::Tools
