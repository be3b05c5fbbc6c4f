#include "Tools/Daemon/LoopDevice.h"

#include "Shared/InputReport.h"

namespace VexaTouch::Tools::Daemon {
namespace {

void increment(std::atomic<std::uint64_t>& counter, std::uint64_t by = 1) noexcept {
    counter.fetch_add(by, std::memory_order_relaxed);
}

}  // namespace

vexa_status LoopDevice::open(std::uint32_t options, int& descriptor) noexcept {
    return device_->open(options, descriptor);
}

void LoopDevice::close(std::uint32_t options) noexcept {
    device_->close(options);
}

vexa_status LoopDevice::getReport(vexa_report_type type, std::uint32_t reportId,
                                  std::span<std::uint8_t> report, std::size_t& length) noexcept {
    return device_->getReport(type, reportId, report, length);
}

Vexa::PropertyValue LoopDevice::property(const Vexa::PropertyValue& key) noexcept {
    return device_->property(key);
}

bool LoopDevice::setProperty(const Vexa::PropertyValue& key,
                             const Vexa::PropertyValue& value) noexcept {
    return device_->setProperty(key, value);
}

void LoopDevice::reportArrived(std::span<const std::uint8_t> report,
                               std::uint64_t timestamp) noexcept {
    device_->reportArrived(report, timestamp);
    if (report.empty()) {
        return;
    }
    if (report[0] == InputReport::Image::reportId) {
        if (const auto image = InputReport::Image::parse(report.data(), report.size())) {
            increment(images_);
            countGap(image->frameNumber);
        }
    } else if (report[0] == InputReport::FirmwareEvent::reportId) {
        if (InputReport::FirmwareEvent::parse(report.data(), report.size())) {
            increment(firmwareEvents_);
        }
    }
}

void LoopDevice::countGap(std::uint32_t frame) noexcept {
    if (lastFrame_ && frame != *lastFrame_ + 1U) {
        increment(gaps_);
        // A number that goes back is a device that began anew: nobody knows what is missing.
        const std::uint32_t missing = frame - *lastFrame_ - 1U;
        constexpr std::uint32_t kHalf = std::uint32_t{1} << 31U;
        increment(framesLost_, missing < kHalf ? missing : 0);
    }
    lastFrame_ = frame;
}

void LoopDevice::reportHandled() noexcept {
    device_->reportHandled();
    // Last, so that whoever sees it counted finds it recorded.
    increment(reports_);
}

void LoopDevice::scheduled(const Vexa::RunLoop& loop, const char* mode) noexcept {
    device_->scheduled(loop, mode);
    const Vexa::MutexLock guard(lock_);
    loop_ = loop;
    mode_ = mode;
}

ReportCounts LoopDevice::counts() const noexcept {
    ReportCounts counts;
    counts.reports = reports_.load(std::memory_order_relaxed);
    counts.images = images_.load(std::memory_order_relaxed);
    counts.firmwareEvents = firmwareEvents_.load(std::memory_order_relaxed);
    counts.gaps = gaps_.load(std::memory_order_relaxed);
    counts.framesLost = framesLost_.load(std::memory_order_relaxed);
    const std::uint64_t valid = counts.images + counts.firmwareEvents;
    counts.invalid = counts.reports > valid ? counts.reports - valid : 0;
    return counts;
}

}  // namespace VexaTouch::Tools::Daemon
