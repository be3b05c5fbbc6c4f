#include "Tools/RecordRun.h"

#include "Tools/Failure.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <span>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kPipelineDomain = "Pipeline.";
constexpr std::string_view kEraseLine = "\r\x1b[K";
constexpr auto kDrawInterval = std::chrono::milliseconds(100);

RecordedFrame gapFrame(const char* key, std::uint64_t count, std::uint64_t timestampNs) {
    RecordedFrame frame;
    frame.type = RecordedFrame::Type::State;
    frame.timestamp = timestampNs;
    frame.key = key;
    frame.value = count;
    return frame;
}

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
      decoder_({.onFrame = [this](const RecordedFrame& frame) { take(frame); },
                .onGap = [this](const FrameGap& gap) { take(gap); }}),
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
    tap_->add(feed_, session_);
    start_ = std::chrono::steady_clock::now();
    session_.begin();
    if (options_.duration) {
        deadline_ = start_ + *options_.duration;
    }
    nextLook_ = start_ + watch_.interval();
    for (bool any = takeFrames(); !isOver(); any = takeFrames()) {
        drawProgress(false);
        lookAfterReports();
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
    drawProgress(true);
    stream.finish();
    session_.end();
    if (unplugged_) {
        throw Failure("the device was unplugged");
    }
    if (stuck_) {
        throw Failure(ReportWatch::kFault);
    }
    return summary_;
}

bool RecordRun::isOver() {
    return finished_ || stuck_ || signals_.endWanted() || (unplugged_ && lastReports_.areTaken()) ||
           (options_.count && summary_.reports >= *options_.count) ||
           (deadline_ && std::chrono::steady_clock::now() >= *deadline_);
}

void RecordRun::waitForWork() {
    Time until = nextLook_;
    const auto noLaterThan = [&until](Time time) { until = std::min(until, time); };
    if (deadline_) {
        noLaterThan(*deadline_);
    }
    if (streams_.errorIsTerminal) {
        noLaterThan(nextDraw_);
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

void RecordRun::lookAfterReports() {
    const Time now = std::chrono::steady_clock::now();
    if (now >= nextLook_) {
        nextLook_ = now + watch_.interval();
        stuck_ = watch_.look();
    }
}

void RecordRun::answerUserSignal() {
    if (!signals_.takeRecordingWanted()) {
        return;
    }
    streams_.error << (streams_.errorIsTerminal ? kEraseLine : "")
                   << "vexatouch record: " << stream_->frames() << " frames are in "
                   << stream_->name() << "; what is written there is whole without SIGUSR1"
                   << std::endl;
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
        drawProgress(true);
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

void RecordRun::take(const RecordedFrame& frame) {
    if (options_.count && summary_.reports >= *options_.count) {
        return;
    }
    latestNs_ = frame.timestamp;
    ++(frame.type == RecordedFrame::Type::InputReport ? summary_.reports : summary_.settings);
    stream_->add(frame);
}

// The file itself says what it lacks; a pipeline passes over keys that it does not know.
void RecordRun::take(const FrameGap& gap) {
    if (options_.count && summary_.reports >= *options_.count) {
        return;
    }
    summary_.lost.reports += gap.reports;
    summary_.lost.settings += gap.settings;
    if (gap.reports > 0) {
        stream_->add(gapFrame("Recording.LostReports", gap.reports, latestNs_));
    }
    if (gap.settings > 0) {
        stream_->add(gapFrame("Recording.LostSettings", gap.settings, latestNs_));
    }
}

void RecordRun::drawProgress(bool last) {
    if (!streams_.errorIsTerminal) {
        return;
    }
    const Time now = std::chrono::steady_clock::now();
    if (last) {
        streams_.error << kEraseLine << std::flush;
    } else if (now >= nextDraw_) {
        nextDraw_ = now + kDrawInterval;
        constexpr double kBytesPerMegabyte = 1e6;
        std::array<char, 96> line{};
        std::snprintf(line.data(), line.size(), "%llu frames, %.1f MB, %.1f s",
                      static_cast<unsigned long long>(stream_->frames()),
                      static_cast<double>(stream_->bytes()) / kBytesPerMegabyte,
                      std::chrono::duration<double>(now - start_).count());
        streams_.error << kEraseLine << line.data() << std::flush;
    }
}

}  // namespace VexaTouch::Tools
