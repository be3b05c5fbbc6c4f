#include "Tools/LiveSurface.h"

#include <utility>

namespace VexaTouch::Tools {

LiveSurface::LiveSurface(ColorDepth depth, std::size_t columns, std::uint64_t startNs,
                         std::span<const Setting> settings)
    : view_(depth, columns, startNs, 0) {
    installProbes();
    for (const Setting& setting : settings) {
        pipeline_.setState(setting.key, setting.value);
    }
}

void LiveSurface::installProbes() {
    pipeline_.imageProbe = [this](const InputReport::Image* image) {
        played_.type = PlayedType::Image;
        played_.image = *image;
    };
    pipeline_.firmwareEventProbe = [this](const InputReport::FirmwareEvent* event) {
        played_.type = PlayedType::Firmware;
        played_.firmware = *event;
    };
    pipeline_.invalidInputReportProbe = [this](const std::uint8_t*, std::uint64_t) {
        played_.type = PlayedType::Invalid;
    };
    pipeline_.hidEventsProbe = [this](const std::vector<Vexa::HidEvent>& events) {
        for (const Vexa::HidEvent& event : events) {
            events_.push_back(eventRecordFromHidEvent(event));
        }
    };
}

void LiveSurface::report(std::span<const std::uint8_t> bytes) noexcept {
    tap_.put(bytes);
    ++sent_;
}

void LiveSurface::state(const std::string& key, const Vexa::PropertyValue& value) {
    const Vexa::MutexLock guard(lock_);
    states_.push_back({.reportsBefore = sent_, .setting = {.key = key, .value = value}});
}

bool LiveSurface::update(std::uint64_t nowNs) {
    nowNs_ = nowNs;
    return tap_.drain([this](std::span<const std::uint8_t> bytes) { take(bytes); }) > 0;
}

void LiveSurface::take(std::span<const std::uint8_t> bytes) {
    applyStates();
    events_.clear();
    frame_.type = PipelineRecording::Frame::Type::InputReport;
    frame_.timestamp = nowNs_;
    frame_.report.assign(bytes.begin(), bytes.end());
    pipeline_.handleInputReport(bytes.data(), bytes.size());
    played_.index = taken_++;
    played_.frame = &frame_;
    played_.events = events_;
    view_.see(played_);
}

void LiveSurface::applyStates() {
    // A report that was left out has had its turn as well.
    const std::uint64_t past = taken_ + tap_.lost();
    const Vexa::MutexLock guard(lock_);
    while (!states_.empty() && states_.front().reportsBefore <= past) {
        const Setting& setting = states_.front().setting;
        pipeline_.setState(setting.key, setting.value);
        states_.pop_front();
    }
}

std::vector<std::string> LiveSurface::lines() const {
    if (taken_ == 0) {
        return {};
    }
    return view_.lines(played_, pipeline_.algs());
}

}  // namespace VexaTouch::Tools
