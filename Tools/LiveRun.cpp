#include "Tools/LiveRun.h"

#include "Host/RegisteredDevice.h"
#include "Platform/HostClock.h"
#include "Platform/Log.h"
#include "Platform/PropertyValue.h"
#include "Platform/SignalsBlocked.h"
#include "Shared/Util.h"
#include "Tools/Failure.h"
#include "Tools/FrameView.h"
#include "Tools/LastReports.h"
#include "Tools/OutputFile.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <system_error>
#include <thread>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kPipelineDomain = "Pipeline.";
constexpr auto kDrawInterval = std::chrono::nanoseconds(1'000'000'000 / 30);

std::uint64_t nowTicks() {
    return Vexa::HostClock::system().now();
}

std::string counted(std::uint64_t count, std::string_view what) {
    return std::to_string(count) + ' ' + std::string(what) + (count == 1 ? "" : "s");
}

std::string microseconds(double ns) {
    constexpr double kNsPerUs = 1e3;
    std::array<char, 48> text{};
    std::snprintf(text.data(), text.size(), "%.1f us", ns / kNsPerUs);
    return text.data();
}

}  // namespace

/// The thread that sees to the end of a session that has begun. However the run is left, the
/// session is halted and no key is down when it is destroyed.
class LiveRun::Keeper {
public:
    /// Throws Failure.
    explicit Keeper(LiveRun& run) : run_(run) {
        try {
            const Vexa::SignalsBlocked blocked;
            thread_ = std::thread([&run] { run.keep(); });
        } catch (const std::system_error& error) {
            run.session_.halt();
            throw Failure(std::string("no thread that ends the run: ") + error.what());
        }
    }
    ~Keeper() {
        run_.enough_ = true;
        run_.wake_.notify();
        thread_.join();
    }
    Keeper(const Keeper&) = delete;
    Keeper(Keeper&&) = delete;
    Keeper& operator=(const Keeper&) = delete;
    Keeper& operator=(Keeper&&) = delete;

private:
    LiveRun& run_;
    std::thread thread_;
};

LiveRun::LiveRun(const Host::PluginLibrary& library, const std::shared_ptr<ObservedDevice>& device,
                 LiveRunOptions options, SignalWatch& signals, const WakeUp& wake, Streams& streams)
    : device_(device),
      options_(std::move(options)),
      signals_(signals),
      wake_(wake),
      streams_(streams),
      startNs_(Util::nanosecondsFromMachTime(nowTicks())),
      inbox_(work_, options_.eventRoom),
      watch_(*device, streams.patience),
      registration_(Host::registeredDevice(device)),
      session_(library, registration_.service(), [this](const Vexa::HidEvent& event) {
          const std::uint64_t now = nowTicks();
          const std::uint64_t takenUp = event.timestamp();
          const DeliveredEvent delivered =
              DeliveredEvent::of(event, arrivals_.latestUntil(takenUp).value_or(takenUp), now);
          if (keys_) {
              keys_->handle(event);
          }
          inbox_.put(delivered);
      }) {
    if (options_.keyboard != nullptr) {
        keys_.emplace(options_.keyMap, *options_.keyboard);
    }
    if (options_.show) {
        surface_ = std::make_unique<LiveSurface>(options_.depth, streams_.columns, startNs_,
                                                 options_.settings);
    }
    installHooks();
    for (const Setting& setting : options_.settings) {
        if (!session_.setProperty(std::string(kPipelineDomain) + setting.key, setting.value)) {
            throw Failure("the service does not take the setting " + setting.key);
        }
    }
}

LiveRun::~LiveRun() = default;

void LiveRun::installHooks() {
    DeviceHooks hooks;
    hooks.onStateFrame = [this](const std::string& key, const Vexa::PropertyValue& value) {
        // Closing the device waits for its player.
        const Vexa::LogWithoutBlocking logWithoutBlocking;
        session_.setProperty(std::string(kPipelineDomain) + key, value);
        if (surface_) {
            surface_->state(key, value);
        }
    };
    hooks.onFinished = [this] {
        finished_ = true;
        wake_.notify();
    };
    hooks.onUnplugged = [this] {
        unplugged_ = true;
        wake_.notify();
    };
    hooks.onArrived = [this](std::span<const std::uint8_t> report, std::uint64_t ticks) {
        arrivals_.put(ticks);
        if (gaps_.see(report)) {
            work_.notify();
        }
    };
    if (surface_) {
        hooks.onSend = [this](std::span<const std::uint8_t> report) { surface_->report(report); };
    }
    device_->setHooks(std::move(hooks));
}

void LiveRun::run() {
    session_.begin();
    const Time start = std::chrono::steady_clock::now();
    if (options_.duration) {
        deadline_ = start + *options_.duration;
    }
    static_cast<void>(watch_.lookIfDue(start));
    runToEnd();
    takeEvents();
    draw(true);
    screen_.reset();
    tellOfKeyboard();
    if (!options_.recordFile.empty()) {
        writeRecording();
    }
    // The service knows it until it ends.
    const std::string gaps = gaps_.gaps() > 0 ? "; " + gapsText() : std::string();
    session_.end();
    printSummary(gaps);
    if (unplugged_) {
        throw Failure("the device was unplugged");
    }
    if (stuck_) {
        throw Failure(ReportWatch::kFault);
    }
    if (totals_.lost > 0 && streams_.out.good()) {
        throw Failure(counted(totals_.lost, "event") +
                      " could not be printed, because those before were not read quickly enough");
    }
}

void LiveRun::runToEnd() {
    const Keeper keeper(*this);
    if (surface_) {
        screen_ = std::make_unique<LiveScreen>(streams_);
    } else if (!options_.json) {
        streams_.out << deliveredEventHeading() << std::flush;
    }
    for (handleWork(); !halted_; handleWork()) {
        endWhenEnough();
        waitForWork();
    }
}

void LiveRun::keep() {
    // The service logs while it is halted.
    const Vexa::LogWithoutBlocking logWithoutBlocking;
    while (!isOver()) {
        waitForEnd();
        stuck_ = watch_.lookIfDue(std::chrono::steady_clock::now());
        // Whatever it was, it may be something for the other as well.
        work_.notify();
    }
    // A key that is held repeats until it is released, and both of these may take seconds: last
    // reports that nobody takes, a node whose closing waits for a request. What is on its way to
    // the keyboard comes first, so that it does not press one behind the release.
    session_.drain();
    releaseKeys();
    if (unplugged_) {
        waitForLastReports();
        session_.drain();
        releaseKeys();
    }
    session_.halt();
    // Events may have come until then.
    releaseKeys();
    halted_ = true;
    work_.notify();
}

bool LiveRun::isOver() const {
    return finished_ || unplugged_ || enough_ || stuck_ || signals_.endWanted() ||
           (deadline_ && std::chrono::steady_clock::now() >= *deadline_);
}

void LiveRun::waitForEnd() {
    const Time until = deadline_ ? std::min(watch_.nextLook(), *deadline_) : watch_.nextLook();
    if (wake_.wait(until, device_->hangUpDescriptor())) {
        unplugged_ = true;
    }
}

void LiveRun::waitForLastReports() {
    LastReports last(*device_, session_, streams_.patience);
    while (!last.areTaken() && !signals_.endWanted()) {
        wake_.wait(std::chrono::steady_clock::now() + LastReports::kInterval);
    }
}

void LiveRun::releaseKeys() noexcept {
    if (keys_) {
        keys_->releaseAll();
    }
}

void LiveRun::waitForWork() const {
    std::optional<Time> until;
    if (screen_) {
        until = nextDraw_;
    }
    if (nextGapTime_ && gaps_.gaps() != gapsTold_) {
        until = until ? std::min(*until, *nextGapTime_) : *nextGapTime_;
    }
    work_.wait(until);
}

void LiveRun::endWhenEnough() {
    if (quit_ || !streams_.out.good() || (options_.count && totals_.events >= *options_.count)) {
        enough_ = true;
        wake_.notify();
    }
}

void LiveRun::handleWork() {
    takeEvents();
    if (screen_) {
        handleKeys();
        draw(false);
    } else {
        tellOfKeyboard();
    }
    tellOfGaps();
    writeRecordingOnWish();
}

void LiveRun::tellOfGaps() {
    const Time now = std::chrono::steady_clock::now();
    const std::uint64_t gaps = gaps_.gaps();
    // The picture would be torn by a line; there is the summary.
    if (gaps == gapsTold_ || screen_ || (nextGapTime_ && now < *nextGapTime_)) {
        return;
    }
    gapsTold_ = gaps;
    nextGapTime_ = now + std::chrono::seconds(1);
    streams_.error << "vexatouch run: so far " << gapsText() << std::endl;
}

std::string LiveRun::gapsText() const {
    // A report is seen here before the service gets it, so the service may not have counted yet.
    const Vexa::PropertyValue found = session_.property("DisjointImageCount");
    const std::uint64_t gaps = std::max(gaps_.gaps(), found.asUnsigned().value_or(0));
    return counted(gaps, "gap") + ", " + counted(gaps_.framesLost(), "frame") + " lost";
}

void LiveRun::takeEvents() {
    const EventInbox::Taken taken = inbox_.take();
    for (const DeliveredEvent& event : taken.events) {
        if (options_.count && totals_.events >= *options_.count) {
            return;
        }
        ++totals_.events;
        totals_.latencySumNs += event.latencyNs;
        totals_.latencyMostNs = std::max(totals_.latencyMostNs, event.latencyNs);
        print(event);
    }
    if (!options_.count || totals_.events < *options_.count) {
        totals_.lost += taken.lost;
    }
}

void LiveRun::print(const DeliveredEvent& event) {
    if (!screen_) {
        streams_.out << (options_.json ? deliveredEventJson(event) + '\n'
                                       : deliveredEventLine(event, startNs_))
                     << std::flush;
        return;
    }
    std::string line = deliveredEventLine(event, startNs_);
    line.pop_back();
    line.resize(std::min<std::size_t>(line.size(), streams_.columns));
    newest_.push_back(std::move(line));
    eventsChanged_ = true;
    // What does not fit above the cursor would scroll away instead of being drawn over.
    constexpr std::size_t kOthers = FrameView::kLines + 1;
    const std::size_t room = streams_.rows > kOthers ? streams_.rows - kOthers : 0;
    constexpr std::size_t kMost = 12;
    while (newest_.size() > std::min(room, kMost)) {
        newest_.pop_front();
    }
}

void LiveRun::handleKeys() {
    while (const char key = screen_->wait(0)) {
        quit_ = quit_ || key == 'q';
    }
}

void LiveRun::draw(bool anyway) {
    const Time now = std::chrono::steady_clock::now();
    if (!screen_ || (!anyway && now < nextDraw_)) {
        return;
    }
    nextDraw_ = now + kDrawInterval;
    const bool changed = surface_->update(Util::nanosecondsFromMachTime(nowTicks()));
    if (!changed && !std::exchange(eventsChanged_, false) && !anyway) {
        return;
    }
    std::vector<std::string> lines = surface_->lines();
    lines.insert(lines.end(), newest_.begin(), newest_.end());
    lines.resize(std::min<std::size_t>(lines.size(), std::max(streams_.rows, 2U) - 1));
    screen_->draw(lines);
}

void LiveRun::tellOfKeyboard() const {
    if (options_.keyboard == nullptr) {
        return;
    }
    if (const auto failure = options_.keyboard->takeFailure()) {
        streams_.error << "vexatouch run: " << *failure << std::endl;
    }
}

void LiveRun::writeRecordingOnWish() {
    if (!signals_.takeRecordingWanted()) {
        return;
    }
    if (options_.recordFile.empty()) {
        streams_.error << "vexatouch run: SIGUSR1 writes a recording only with --record\n";
        return;
    }
    try {
        writeRecording();
    } catch (const Failure& failure) {
        // The run is worth more than this copy; the one at the end may still succeed.
        streams_.error << "vexatouch run: " << failure.what() << '\n';
    }
}

void LiveRun::writeRecording() {
    const Vexa::PropertyValue recording = session_.property("Recording");
    const auto text = recording.asString();
    if (!text) {
        throw Failure("the service gives no recording");
    }
    OutputFile file(options_.recordFile, streams_);
    file.write(*text);
    file.commit();
    if (!screen_) {
        streams_.error << "recording written to " << options_.recordFile << std::endl;
    }
}

void LiveRun::printSummary(const std::string& gaps) const {
    streams_.error << device_->tally() << ", " << counted(totals_.events, "event");
    if (totals_.events > 0) {
        streams_.error << "; latency "
                       << microseconds(static_cast<double>(totals_.latencySumNs) /
                                       static_cast<double>(totals_.events))
                       << " on average, "
                       << microseconds(static_cast<double>(totals_.latencyMostNs)) << " at most";
    }
    if (totals_.lost > 0) {
        streams_.error << "; " << counted(totals_.lost, "event") << " lost";
    }
    streams_.error << gaps << '\n';
}

}  // namespace VexaTouch::Tools
