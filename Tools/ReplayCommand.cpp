#include "Tools/ReplayCommand.h"

#include "Tools/EventDifference.h"
#include "Tools/EventTable.h"
#include "Tools/Failure.h"
#include "Tools/LogOptions.h"
#include "Tools/OutputFile.h"
#include "Tools/PeakMemory.h"
#include "Tools/Progress.h"
#include "Tools/RecordingFile.h"
#include "Tools/Replay.h"
#include "Tools/ReplayOptions.h"
#include "Tools/TraceText.h"

#include <array>
#include <charconv>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "FILE", .help = "The recording; - reads standard input"},
}};

constexpr std::array<OptionEntry, 7> kOptions = {{
    {.name = "--speed",
     .valueName = "FACTOR",
     .help = "How fast to play: 1 as recorded, 2 twice as fast, max without waiting",
     .defaultValue = "max",
     .kind = ValueKind::Choice,
     .choices = "max 1 2 10"},
    {.name = "--set",
     .valueName = "KEY=VALUE",
     .help = "Give the algorithm a setting before the first frame; the value is JSON. Settings of "
             "the recording itself may change it later",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = kSettingChoices},
    kPinOption,
    {.name = "--json", .help = "Print each event as one JSON object on a line"},
    {.name = "--trace",
     .valueName = "TRACE",
     .help = "Write the whole state after each frame to a file, one JSON object a line; - writes "
             "it to standard output in place of the events",
     .kind = ValueKind::File},
    {.name = "--expect",
     .valueName = "EVENTS",
     .help = "Compare the events with a file of lines as --json prints them; print only what "
             "differs, side by side",
     .kind = ValueKind::File},
    kLogOption,
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "played; with --expect: and the events are as expected"},
    {kExitFailure,
     "the recording cannot be read or holds no frame, or the events differ from "
     "those expected"},
    {kExitUsage, "the command line is wrong, an unknown setting included"},
}};

constexpr std::array<ExampleEntry, 4> kExamples = {{
    {"vexatouch replay session.json", "Prints the events of a recording"},
    {"vexatouch replay --set HoldTimeoutMilliseconds=300 --json session.json",
     "Asks what a shorter hold timeout would have changed"},
    {"vexatouch replay --json session.json > events.jsonl && vexatouch replay --expect "
     "events.jsonl session.json",
     "Keeps the events of a recording and later finds what has changed"},
    {"vexatouch replay --speed 1 --log Algs=debug session.json",
     "Plays as recorded and shows what the algorithm saw on each frame"},
}};

constexpr std::string_view kDescription =
    "Each frame of the recording goes through a pipeline of its own, and the events come out as "
    "they would have on the device: index of the frame in the recording, host time since the first "
    "frame, the device's clock, the frame number, what happened and in which region. Region 1 is "
    "play/pause and the voice-assistant call, 2 volume down, 3 volume up. A summary follows on "
    "standard error.\n"
    "\n"
    "Kinds of events: may-begin, hold-start, hold-change, hold-end, tap, cancel and "
    "firmware-reset.\n"
    "\n"
    "Settings are named as the host names them, Pipeline.Algs.ActivationThreshold, or by the last "
    "part alone. A wrong --set prints the list of keys. A recording that vexatouch record made "
    "begins with all settings that were in force: with --pin those given here hold nevertheless.";

float parseSpeed(const std::string& text) {
    if (text == "max") {
        return Replay::kNoWaiting;
    }
    float speed = 0;
    const char* end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, speed);
    if (error != std::errc() || stop != end || !std::isfinite(speed) || !(speed > 0)) {
        throw UsageError("--speed " + text + ": neither max nor a factor above 0");
    }
    return speed;
}

double secondsSince(std::chrono::steady_clock::time_point start) {
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

/// The value with some decimals and its unit.
std::string measured(double value, int decimals, std::string_view unit) {
    std::array<char, 64> text{};
    const int length = std::snprintf(text.data(), text.size(), "%.*f ", decimals, value);
    return std::string(text.data(), static_cast<std::size_t>(length)) + std::string(unit);
}

std::string megabytes(std::uint64_t bytes) {
    constexpr double bytesPerMb = 1e6;
    return measured(static_cast<double>(bytes) / bytesPerMb, 1, "MB");
}

std::string counted(std::uint64_t count, std::string_view what) {
    return std::to_string(count) + ' ' + std::string(what) + (count == 1 ? "" : "s");
}

/// Where the events go while a recording is played.
class EventOutput {
public:
    enum class Form : std::uint8_t { Table, Json, Nothing };

    EventOutput(Form form, bool atOnce, std::uint64_t startNs, Streams& streams)
        : form_(form), atOnce_(atOnce), table_(startNs), streams_(streams) {
        if (form_ == Form::Table) {
            streams_.out << EventTable::heading();
        }
    }

    void write(const EventRecord& event) {
        if (form_ == Form::Nothing) {
            return;
        }
        if (form_ == Form::Json) {
            streams_.out << eventJson(event) << '\n';
        } else {
            streams_.out << table_.line(event);
        }
        if (atOnce_) {
            streams_.out.flush();
        }
    }

private:
    Form form_;
    bool atOnce_;
    EventTable table_;
    Streams& streams_;
};

EventOutput::Form outputForm(const Arguments& arguments) {
    if (arguments.given("--expect") || arguments.value("--trace") == "-") {
        return EventOutput::Form::Nothing;
    }
    return arguments.given("--json") ? EventOutput::Form::Json : EventOutput::Form::Table;
}

void printSummary(const RecordingFile& file, const ReplayCounts& counts, double readSeconds,
                  double playSeconds, Streams& streams) {
    const double allSeconds = readSeconds + playSeconds;
    const double rate = allSeconds > 0 ? static_cast<double>(counts.frames) / allSeconds : 0;
    streams.error << file.name << ": " << counted(counts.frames, "frame") << ", "
                  << counted(counts.events, "event") << ", "
                  << counted(counts.invalidReports, "invalid report") << "; read "
                  << megabytes(file.textBytes) << " in " << measured(readSeconds, 3, "s")
                  << ", played in " << measured(playSeconds, 3, "s") << ", "
                  << measured(rate, 0, "frames/s in all");
    if (const auto peak = peakMemoryBytes()) {
        streams.error << ", peak memory " << megabytes(*peak);
    }
    streams.error << '\n';
}

int reportDifference(const std::vector<EventRecord>& expected,
                     const std::vector<EventRecord>& actual, const std::string& expectedName,
                     Streams& streams) {
    const EventDifference difference = compareEvents(expected, actual);
    if (difference.differences == 0) {
        return kExitSuccess;
    }
    streams.out << difference.text;
    streams.error << "vexatouch replay: " << expectedName << ": "
                  << counted(difference.differences, "difference") << " to the events expected\n";
    return kExitFailure;
}

int runReplay(const Arguments& arguments, Streams& streams) {
    const float speed = parseSpeed(arguments.value("--speed"));
    ReplaySettings settings{.list = parseSettings(arguments.values("--set")),
                            .pinned = arguments.given(kPinOption.name)};
    const bool expecting = arguments.given("--expect");
    if (expecting && arguments.value("--trace") == "-") {
        throw UsageError("--expect and --trace - both want standard output");
    }
    const LogOptions logging(arguments.values(kLogOption.name));
    std::vector<EventRecord> expected;
    if (expecting) {
        expected = readExpectedEvents(arguments.value("--expect"));
    }

    const auto readStart = std::chrono::steady_clock::now();
    RecordingFile file = readRecording(arguments.value("FILE"), streams);
    if (file.frames.empty()) {
        throw Failure(file.name + ": holds no frame to replay");
    }
    const double readSeconds = secondsSince(readStart);

    std::unique_ptr<OutputFile> trace;
    if (arguments.given("--trace")) {
        trace = std::make_unique<OutputFile>(arguments.value("--trace"), streams);
    }
    TraceText traceText;
    const bool realTime = speed != Replay::kNoWaiting;
    EventOutput output(outputForm(arguments), realTime || streams.outIsTerminal,
                       file.frames.front().timestamp, streams);
    std::vector<EventRecord> actual;

    const auto playStart = std::chrono::steady_clock::now();
    Replay replay(std::exchange(file.frames, {}), std::move(settings), streams.clock);
    {
        Progress progress(streams, "playing " + file.name, replay.frames().size());
        while (replay.canContinue()) {
            const PlayedFrame& played = replay.next(speed);
            for (const EventRecord& event : played.events) {
                output.write(event);
                if (expecting) {
                    actual.push_back(event);
                }
            }
            if (trace) {
                trace->write(traceText.line(played, replay.algs()));
            }
            if (!realTime) {
                progress.update(replay.counts().frames);
            }
        }
    }
    const double playSeconds = secondsSince(playStart);
    if (trace) {
        trace->commit();
    }
    streams.out.flush();
    printSummary(file, replay.counts(), readSeconds, playSeconds, streams);
    warnOfLostSetting(replay, "replay", "--set", streams);
    return expecting ? reportDifference(expected, actual, arguments.value("--expect"), streams)
                     : kExitSuccess;
}

}  // namespace

constinit const Command replayCommand = {
    .name = "replay",
    .summary = "Play a recording and print the gesture events as they come",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runReplay,
};

}  // namespace VexaTouch::Tools
