#include "Tools/LatencyRun.h"

#include "Tools/Failure.h"
#include "Tools/HostedDevice.h"
#include "Tools/ReadingSwitch.h"
#include "Tools/ReportWatch.h"
#include "Tools/SimulatedSurface.h"
#include "Tools/WakeUp.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <exception>
#include <functional>
#include <limits>
#include <memory>
#include <optional>
#include <span>
#include <thread>
#include <utility>

namespace VexaTouch::Tools {

const std::string_view kLatencyGestures =
    "approach 0ms\n"
    "liftoff 0ms\n"
    "gap 10ms\n"
    "tap vol+ 10ms\n"
    "tap play 10ms\n"
    "tap vol- 10ms\n";

namespace {

/// Enough reports were taken from a source without end.
struct Enough final : std::exception {};

/// The first reports of a source, with the state frames between them.
void playFirst(const PlayedDevice::FrameSource& source, std::size_t reports,
               const PlayedDevice::FrameSink& sink) {
    std::size_t count = 0;
    source([&](const PlayedDevice::Frame& frame) {
        if (count >= reports) {
            throw Enough();
        }
        count += frame.type == PlayedDevice::Frame::Type::InputReport ? 1U : 0U;
        sink(frame);
    });
}

/// When the reader reads, by the place of the report that is about to be sent. Taking turns, it has
/// as many reports as its absence, which goes first.
class ReaderTurns {
public:
    explicit ReaderTurns(const LatencyRunOptions& options)
        : reader_(options.reader),
          reports_(options.reports),
          turn_(std::clamp<std::size_t>(static_cast<std::size_t>(options.rate / 2), 1, reports_)) {}

    [[nodiscard]] bool isOn(std::size_t report) const {
        return reader_ == LatencyReader::On ||
               (reader_ == LatencyReader::Turns && inRound(report) >= turnOf(report));
    }
    [[nodiscard]] bool changes(std::size_t report) const {
        return report == 0 || isOn(report) != isOn(report - 1);
    }

private:
    [[nodiscard]] std::size_t inRound(std::size_t report) const { return report % (2 * turn_); }
    /// The last round may be shorter.
    [[nodiscard]] std::size_t turnOf(std::size_t report) const {
        return std::min(turn_, reports_ - report / (2 * turn_) * turn_);
    }

    LatencyReader reader_;
    std::size_t reports_;  ///< of each, with and without
    std::size_t turn_;     ///< in reports
};

/// Reads the recording without pause while it is turned on, on a thread of its own.
class RecordingReader {
public:
    explicit RecordingReader(const Host::HostSession& session)
        : thread_([this, &session] {
              while (switch_.waitUntilOn()) {
                  readOnce(session);
              }
          }) {}
    ~RecordingReader() { finish(); }
    RecordingReader(const RecordingReader&) = delete;
    RecordingReader& operator=(const RecordingReader&) = delete;

    /// Any thread.
    void turn(bool on) noexcept { switch_.turn(on); }
    /// Ends the reading.
    void finish() {
        switch_.finish();
        if (thread_.joinable()) {
            thread_.join();
        }
    }
    /// What the reading was, once it is finished.
    void describe(LatencyResult& result) const {
        result.recordingReads = reads_;
        result.recordingReadNs = reads_ == 0 ? 0 : readNs_ / reads_;
        result.recordingBytes = bytes_;
    }

private:
    void readOnce(const Host::HostSession& session) {
        const auto start = std::chrono::steady_clock::now();
        const Vexa::PropertyValue recording = session.property("Recording");
        const std::chrono::nanoseconds time = std::chrono::steady_clock::now() - start;
        readNs_ += static_cast<std::uint64_t>(time.count());
        ++reads_;
        if (const auto text = recording.asString()) {
            bytes_ = text->size();
        }
    }

    ReadingSwitch switch_;
    std::uint64_t reads_ = 0;
    std::uint64_t readNs_ = 0;
    std::uint64_t bytes_ = 0;
    std::thread thread_;
};

/// Halts a device before what its hooks and its sink use goes away, whatever happens.
class HaltedInTheEnd {
public:
    HaltedInTheEnd(HostedDevice& device, std::atomic<LatencyProbe*>& listening) noexcept
        : device_(device), listening_(listening) {}
    ~HaltedInTheEnd() {
        device_.halt();
        listening_.store(nullptr);
    }
    HaltedInTheEnd(const HaltedInTheEnd&) = delete;
    HaltedInTheEnd& operator=(const HaltedInTheEnd&) = delete;

private:
    HostedDevice& device_;
    std::atomic<LatencyProbe*>& listening_;
};

LatencyResult resultOf(const LatencyProbe& probe, const ReaderTurns& turns, bool withReader,
                       const RecordingReader& reader) {
    LatencyResult result;
    for (const LatencyStage stage : kLatencyStages) {
        result.stages[static_cast<std::size_t>(stage)] = LatencySummary::of(probe.latencies(
            stage, [&](std::size_t report) { return turns.isOn(report) == withReader; }));
    }
    result.inputThread = probe.inputThread();
    result.queueThread = probe.queueThread();
    result.hadReader = withReader;
    if (withReader) {
        reader.describe(result);
    }
    return result;
}

/// A service on a device, the probe that listens to it and the reader of its recording.
class Measurement {
public:
    Measurement(const LatencyRunOptions& options, std::shared_ptr<ObservedDevice> device)
        : options_(options),
          hosted_(
              std::move(device),
              [this](const Vexa::HidEvent& event) {
                  if (LatencyProbe* probe = listening_.load()) {
                      probe->delivered(event);
                  }
              },
              options.patience) {}

    [[nodiscard]] HostedDevice& hosted() noexcept { return hosted_; }

    /// Measures from the beginning of the device until `waitUntilDone` returns; `handled` is called
    /// with each report that was handled.
    template <typename Wait>
    std::vector<LatencyResult> run(const std::function<void()>& handled, Wait&& waitUntilDone) {
        LatencyProbe probe(options_.reports * (options_.reader == LatencyReader::Turns ? 2 : 1),
                           options_.mayBeRealTime);
        listening_.store(&probe);
        const ReaderTurns turns(options_);
        RecordingReader reader(hosted_.session());
        DeviceHooks hooks = probe.hooks();
        hooks.onSend = [&, send = hooks.onSend,
                        next = std::size_t{0}](std::span<const std::uint8_t> report) mutable {
            if (turns.changes(next)) {
                reader.turn(turns.isOn(next));
            }
            ++next;
            send(report);
        };
        if (handled) {
            hooks.onHandled = [&handled, told = hooks.onHandled] {
                told();
                handled();
            };
        }
        {
            const HaltedInTheEnd halted(hosted_, listening_);
            hosted_.begin(std::move(hooks));
            waitUntilDone();
            reader.finish();
        }
        hosted_.end();

        std::vector<LatencyResult> results;
        if (options_.reader != LatencyReader::On) {
            results.push_back(resultOf(probe, turns, false, reader));
        }
        if (options_.reader != LatencyReader::Off) {
            results.push_back(resultOf(probe, turns, true, reader));
        }
        return results;
    }

private:
    const LatencyRunOptions& options_;
    std::atomic<LatencyProbe*> listening_ = nullptr;
    HostedDevice hosted_;
};

std::vector<LatencyResult> measurePlayed(const LatencyRunOptions& options) {
    const PlayedDevice::FrameSource filling =
        gestureSource(GestureScript::parse(kLatencyGestures), {}, true);
    const PlayedDevice::FrameSource* source = &filling;
    std::size_t reports = kFullRecording;
    const auto device = std::make_shared<PlayedDevice>(
        [&](const PlayedDevice::FrameSink& sink) { playFirst(*source, reports, sink); },
        PlayedPace{.speed = std::numeric_limits<double>::infinity()}, SurfaceIdentity{},
        Vexa::HostClock::system());
    Measurement measurement(options, device);
    measurement.hosted().begin();
    measurement.hosted().waitUntilPlayed();
    measurement.hosted().halt();

    source = &options.source;
    reports = options.reports * (options.reader == LatencyReader::Turns ? 2 : 1);
    device->setPace({.rate = options.rate});
    return measurement.run({}, [&] { measurement.hosted().waitUntilPlayed(); });
}

std::vector<LatencyResult> measureLive(const LatencyRunOptions& options) {
    const std::size_t parts = options.reader == LatencyReader::Turns ? 2 : 1;
    const std::size_t wanted = options.reports * parts;
    Measurement measurement(options, options.live);
    const WakeUp wake;
    std::atomic<std::size_t> handled = 0;
    const auto now = std::chrono::steady_clock::now();
    const bool isBounded = options.longest < (std::chrono::nanoseconds::max() / 4);
    const std::optional<WakeUp::Time> until =
        isBounded ? std::optional(now + options.longest * parts) : std::nullopt;
    bool unplugged = false;
    auto results = measurement.run(
        [&] {
            if (handled.fetch_add(1) + 1 == wanted) {
                wake.notify();
            }
        },
        [&] {
            ReportWatch watch(*options.live, options.patience);
            while (handled.load() < wanted && !unplugged &&
                   (!until || std::chrono::steady_clock::now() < *until)) {
                if (watch.lookIfDue(std::chrono::steady_clock::now())) {
                    throw Failure(ReportWatch::kFault);
                }
                unplugged = wake.wait(until ? std::min(*until, watch.nextLook()) : watch.nextLook(),
                                      options.live->hangUpDescriptor());
            }
        });
    if (unplugged) {
        throw Failure("the device was unplugged");
    }
    return results;
}

}  // namespace

std::vector<LatencyResult> measureLatency(const LatencyRunOptions& options) {
    return options.live ? measureLive(options) : measurePlayed(options);
}

}  // namespace VexaTouch::Tools
