#include "Tools/LatencyProbe.h"

#include "Shared/InputReport.h"

#include <pthread.h>
#include <sched.h>

#include <chrono>

namespace VexaTouch::Tools {
namespace {

std::uint64_t nowNs() noexcept {
    return static_cast<std::uint64_t>(std::chrono::duration_cast<std::chrono::nanoseconds>(
                                          std::chrono::steady_clock::now().time_since_epoch())
                                          .count());
}

}  // namespace

LatencyProbe::LatencyProbe(std::size_t reports, bool mayBeRealTime)
    : reports_(reports), mayBeRealTime_(mayBeRealTime), written_(reports), reportOfFrame_(kFrames) {
    for (auto& moments : moments_) {
        moments.resize(reports);
    }
    for (auto& report : reportOfFrame_) {
        report.store(reports);
    }
    listener_.emplace([this](std::uint32_t code, Vexa::TraceListener::Arguments) { passed(code); });
}

DeviceHooks LatencyProbe::hooks() {
    return {.onSend = [this](std::span<const std::uint8_t> report) { sending(report); },
            .onHandled = [this] { handled(); }};
}

void LatencyProbe::passed(std::uint32_t code) noexcept {
    if (code == VEXA_TRACE_REPORT) {
        takenUp();
    } else if (code == VEXA_TRACE_BATCH) {
        landed();
    }
}

void LatencyProbe::sending(std::span<const std::uint8_t> report) noexcept {
    const std::size_t index = sent_++;
    if (index >= reports_) {
        return;
    }
    if (const auto image = InputReport::Image::parse(report.data(), report.size())) {
        reportOfFrame_[image->frameNumber % kFrames].store(index);
    }
    written_[index] = nowNs();
}

void LatencyProbe::takenUp() noexcept {
    if (takenUp_ == 0) {
        inputThread_ = lookAtThisThread();
    }
    const std::size_t index = takenUp_++;
    if (index < reports_) {
        momentsOf(LatencyStage::TakenUp)[index] = nowNs();
    }
}

void LatencyProbe::landed() noexcept {
    if (landedNs_ == 0) {
        queueThread_ = lookAtThisThread();
    }
    landedNs_ = nowNs();
}

ThreadPriority LatencyProbe::lookAtThisThread() const noexcept {
    sched_param parameter{};
    if (!mayBeRealTime_) {
        pthread_setschedparam(pthread_self(), SCHED_OTHER, &parameter);
    }
    int policy = SCHED_OTHER;
    if (pthread_getschedparam(pthread_self(), &policy, &parameter) != 0) {
        return {};
    }
    return {.realTime = policy == SCHED_RR || policy == SCHED_FIFO,
            .priority = parameter.sched_priority};
}

void LatencyProbe::handled() noexcept {
    const std::size_t index = handled_++;
    if (index < reports_) {
        momentsOf(LatencyStage::Handled)[index] = nowNs();
    }
}

void LatencyProbe::delivered(const Vexa::HidEvent& event) noexcept {
    const std::uint64_t now = nowNs();
    if (event.type() != Vexa::HidEventType::Digitizer) {
        return;
    }
    const auto frame =
        static_cast<std::uint32_t>(event.integerField(Vexa::HidEventField::DigitizerFrameNumber));
    const std::size_t index = reportOfFrame_[frame % kFrames].load();
    // Its first event counts.
    if (index < reports_ && momentsOf(LatencyStage::Delivered)[index] == 0) {
        momentsOf(LatencyStage::Landed)[index] = landedNs_;
        momentsOf(LatencyStage::Delivered)[index] = now;
    }
}

std::vector<std::uint64_t> LatencyProbe::latencies(
    LatencyStage stage, const std::function<bool(std::size_t report)>& isWanted) const {
    const std::vector<std::uint64_t>& moments = moments_[static_cast<std::size_t>(stage)];
    std::vector<std::uint64_t> all;
    all.reserve(moments.size());
    for (std::size_t i = 0; i < moments.size(); ++i) {
        if (moments[i] != 0 && isWanted(i)) {
            all.push_back(moments[i] - written_[i]);
        }
    }
    return all;
}

}  // namespace VexaTouch::Tools
