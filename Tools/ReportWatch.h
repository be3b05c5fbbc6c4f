#pragma once

#include "Tools/ObservedDevice.h"

#include <chrono>
#include <cstdint>
#include <optional>

namespace VexaTouch::Tools {

/// Finds out that a service does not take the reports of its device: its input thread may not have
/// started, or have ended, or be stuck, of which a host sees nothing else.
///
/// Looks are counted and not time, so that a process that was held for a while does not give up
/// when it goes on. One watch for each opening of the device; one thread.
class ReportWatch {
public:
    /// What a host says of such a service.
    static constexpr const char* kFault = "the service takes no reports; its log says why";

    /// `patience` is how long reports may wait, or a live device be read by nobody, while no report
    /// is handled. The device must outlive the watch.
    ReportWatch(const ObservedDevice& device, std::chrono::nanoseconds patience) noexcept
        : device_(device), interval_(patience / kLooks) {}

    using Time = std::chrono::steady_clock::time_point;

    /// The time from one look to the next.
    [[nodiscard]] std::chrono::nanoseconds interval() const noexcept { return interval_; }

    /// To be called once in each interval. True when reports have been waiting in vain, or nobody
    /// has been there to read them, for so many looks in a row that the patience is at its end.
    [[nodiscard]] bool look() noexcept;

    /// look() if it is time for it. The first time only begins the first interval. However late it
    /// is called, the next look is a whole interval away.
    [[nodiscard]] bool lookIfDue(Time now) noexcept;
    /// When lookIfDue is to be called again, once it has been.
    [[nodiscard]] Time nextLook() const noexcept { return nextLook_.value_or(Time::max()); }

private:
    static constexpr int kLooks = 10;

    const ObservedDevice& device_;
    std::chrono::nanoseconds interval_;
    std::uint64_t handled_ = 0;
    int inVain_ = 0;
    std::optional<Time> nextLook_;
};

}  // namespace VexaTouch::Tools
