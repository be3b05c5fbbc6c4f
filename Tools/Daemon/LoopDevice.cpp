#include "Tools/Daemon/LoopDevice.h"

#include "Shared/InputReport.h"

namespace VexaTouch::Tools::Daemon {
namespace {

void increment(std::atomic<std::uint64_t>& counter) noexcept {
    counter.fetch_add(1, std::memory_order_relaxed);
}

}  // namespace

void LoopDevice::reportArrived(std::span<const std::uint8_t> report,
                               std::uint64_t timestamp) noexcept {
    ForwardingDevice::reportArrived(report, timestamp);
    if (report.empty()) {
        return;
    }
    if (report[0] == InputReport::Image::reportId) {
        if (InputReport::Image::parse(report.data(), report.size())) {
            increment(images_);
            if (gaps_.see(report) && hooks_.onGap) {
                hooks_.onGap();
            }
        }
    } else if (report[0] == InputReport::FirmwareEvent::reportId) {
        if (InputReport::FirmwareEvent::parse(report.data(), report.size())) {
            increment(firmwareEvents_);
        }
    }
}

void LoopDevice::reportHandled() noexcept {
    ForwardingDevice::reportHandled();
    // Last, so that whoever sees it counted finds it recorded.
    increment(reports_);
}

void LoopDevice::scheduled(const Vexa::RunLoop& loop, const char* mode) noexcept {
    ForwardingDevice::scheduled(loop, mode);
    {
        const Vexa::MutexLock guard(lock_);
        loop_ = loop;
        mode_ = mode;
        wasScheduled_ |= static_cast<bool>(loop);
    }
    changed_.notify_all();
    if (!loop && hooks_.onLeft) {
        hooks_.onLeft();
    }
}

bool LoopDevice::waitUntilScheduled(std::chrono::nanoseconds patience) {
    const auto until = std::chrono::steady_clock::now() + patience;
    const Vexa::MutexLock guard(lock_);
    while (!wasScheduled_) {
        if (changed_.wait_until(lock_, until) == std::cv_status::timeout) {
            return wasScheduled_;
        }
    }
    return true;
}

bool LoopDevice::isScheduled() {
    const Vexa::MutexLock guard(lock_);
    return static_cast<bool>(loop_);
}

ReportCounts LoopDevice::counts() const noexcept {
    ReportCounts counts;
    counts.reports = reports_.load(std::memory_order_relaxed);
    counts.images = images_.load(std::memory_order_relaxed);
    counts.firmwareEvents = firmwareEvents_.load(std::memory_order_relaxed);
    counts.gaps = gaps_.gaps();
    counts.framesLost = gaps_.framesLost();
    const std::uint64_t valid = counts.images + counts.firmwareEvents;
    counts.invalid = counts.reports > valid ? counts.reports - valid : 0;
    return counts;
}

}  // namespace VexaTouch::Tools::Daemon
