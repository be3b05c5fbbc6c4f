#include "Tools/RecordRun.h"

#include "Tools/Failure.h"

#include <algorithm>
#include <span>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kPipelineDomain = "Pipeline.";

}  // namespace

RecordRun::RecordRun(const Host::PluginLibrary& library,
                     const std::shared_ptr<ObservedDevice>& device, RecordRunOptions options,
                     Host::HostSession::EventSink sink, SignalWatch& signals, const WakeUp& wake,
                     Streams& streams)
    : device_(device),
      options_(std::move(options)),
      signals_(signals),
      wake_(wake),
      streams_(streams),
      tap_(std::make_shared<InputTap>()),
      feed_(std::make_shared<FrameFeed>([&wake] { wake.notify(); }, options_.feedBytes)),
      decoder_({.onFrame = [this](const RecordedFrame& frame) { keeper_->take(frame); },
                .onGap = [this](const FrameGap& gap) { keeper_->take(gap); }}),
      watch_(*device, streams.patience),
      noHoldBack_(!options_.holdBack),
      registration_(std::make_shared<TappedDevice>(device, tap_)),
      session_(library, registration_.service(), std::move(sink)),
      lastReports_(*device, session_, streams.patience) {
    installHooks();
    for (const Setting& setting : options_.settings) {
        if (!tap_->setProperty(session_, std::string(kPipelineDomain) + setting.key,
                               setting.value)) {
            throw Failure("the service does not take the setting " + setting.key);
        }
    }
}

RecordRun::~RecordRun() {
    endHoldBack();
}

void RecordRun::installHooks() {
    DeviceHooks hooks;
    hooks.onStateFrame = [this](const std::string& key, const Vexa::PropertyValue& value) {
        tap_->setProperty(session_, std::string(kPipelineDomain) + key, value);
    };
    hooks.onSend = [this](std::span<const std::uint8_t>) { holdBack(); };
    hooks.onFinished = [this] {
        finished_ = true;
        wake_.notify();
    };
    hooks.onUnplugged = [this] {
        unplugged_ = true;
        wake_.notify();
    };
    device_->setHooks(std::move(hooks));
}

RecordSummary RecordRun::run(RecordingStream& stream) {
    stream_ = &stream;
    keeper_.emplace(stream, options_.count, streams_);
    tap_->add(feed_, session_);
    const Time start = std::chrono::steady_clock::now();
    session_.begin();
    if (options_.duration) {
        deadline_ = start + *options_.duration;
    }
    for (bool any = takeFrames(); !isOver(); any = takeFrames()) {
        keeper_->drawProgress();
        stuck_ = watch_.lookIfDue(std::chrono::steady_clock::now());
        answerUserSignal();
        // A feed that was not empty wakes nobody.
        if (!any) {
            waitForWork();
        }
    }
    endHoldBack();
    session_.halt();
    tap_->remove(feed_);
    while (takeFrames()) {
    }
    keeper_->eraseProgress();
    if (!unplugged_ && !stuck_) {
        stream.finish();
        session_.end();
        return keeper_->summary();
    }
    const Failure failure =
        stream.finishAfter(unplugged_ ? "the device was unplugged" : ReportWatch::kFault);
    session_.end();
    throw failure;
}

bool RecordRun::isOver() {
    return finished_ || stuck_ || signals_.endWanted() || keeper_->isFull() ||
           (unplugged_ && lastReports_.areTaken()) ||
           (deadline_ && std::chrono::steady_clock::now() >= *deadline_);
}

void RecordRun::waitForWork() {
    Time until = watch_.nextLook();
    const auto noLaterThan = [&until](Time time) { until = std::min(until, time); };
    if (deadline_) {
        noLaterThan(*deadline_);
    }
    if (const auto due = keeper_->progressDue()) {
        noLaterThan(*due);
    }
    if (const auto due = stream_->syncDue()) {
        noLaterThan(*due);
    }
    if (unplugged_) {
        noLaterThan(std::chrono::steady_clock::now() + LastReports::kInterval);
        wake_.wait(until);
    } else if (wake_.wait(until, device_->hangUpDescriptor())) {
        unplugged_ = true;
    }
}

void RecordRun::answerUserSignal() {
    if (signals_.takeRecordingWanted()) {
        keeper_->tellHowMuchThereIs();
    }
}

bool RecordRun::takeFrames() {
    const bool any = drain(*feed_, decoder_);
    if (any) {
        turns_.fetch_add(1);
        turns_.notify_all();
    }
    try {
        stream_->flush();
    } catch (const Failure&) {
        keeper_->eraseProgress();
        throw;
    }
    return any;
}

// On the device's player, before it sends. What it has sent already finds room in the other half.
void RecordRun::holdBack() noexcept {
    for (;;) {
        const std::uint32_t turn = turns_.load();
        if (noHoldBack_.load() || feed_->waiting() < feed_->size() / 2) {
            return;
        }
        turns_.wait(turn);
    }
}

void RecordRun::endHoldBack() noexcept {
    noHoldBack_.store(true);
    turns_.fetch_add(1);
    turns_.notify_all();
}

}  // namespace VexaTouch::Tools
