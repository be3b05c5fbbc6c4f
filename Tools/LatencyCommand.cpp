#include "Tools/LatencyCommand.h"

#include "Platform/JsonWriter.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/LatencyRun.h"
#include "Tools/OptionValues.h"
#include "Tools/SimulatedSurface.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr double kHighestRate = 100'000.0;
/// Bounds the memory of a run: forty bytes a report.
constexpr std::uint64_t kMostReports = 2'000'000;

constexpr std::array<OptionEntry, 8> kOptions = {{
    {.name = "--rate", .valueName = "HZ", .help = "Reports a second", .defaultValue = "1000"},
    {.name = "--duration",
     .valueName = "TIME",
     .help = "How long each measurement takes: 10, 10s, 500ms, 2min",
     .defaultValue = "10s"},
    {.name = "--count",
     .valueName = "N",
     .help = "How many reports each measurement takes, instead of a time"},
    {.name = "--device",
     .valueName = "DEVICE",
     .help =
         "Whose reports are sent: sim sends short taps, sim:SCRIPT the gestures of a script "
         "over and over, recording:FILE the reports of a recording once; hidraw and hidraw:NODE "
         "are measured as the surface sends them",
     .defaultValue = "sim",
     .kind = ValueKind::Choice,
     .choices = "sim sim: recording: hidraw hidraw:"},
    kMatchOption,
    {.name = "--reader",
     .valueName = "MODE",
     .help = "Whether a thread reads \"Recording\" meanwhile, without pause: on, off or both",
     .defaultValue = "both",
     .kind = ValueKind::Choice,
     .choices = "both on off"},
    {.name = "--priority",
     .valueName = "MODE",
     .help = "What the input thread and the queue may have: realtime, normal or both",
     .defaultValue = "both",
     .kind = ValueKind::Choice,
     .choices = "both realtime normal"},
    {.name = "--json", .help = "Print one JSON document instead of the table"},
}};

constexpr std::array<ExampleEntry, 4> kExamples = {{
    {"vexatouch latency", "Measures all there is, forty seconds long"},
    {"vexatouch latency --priority realtime --duration 60s --json > latency.json",
     "Keeps the figures of a longer measurement"},
    {"vexatouch latency --rate 100 --device sim:Examples/mixed.gesture --reader off",
     "Measures at the surface's own rate; not every report makes an event"},
    {"vexatouch latency --device hidraw --reader off --count 1000",
     "Measures the next thousand reports of the surface that is plugged in"},
}};

constexpr std::string_view kDescription =
    "Sends reports at a steady rate through the whole chain (device, input thread, pipeline, host "
    "queue, host callback) and says how long they take, in microseconds from the moment at which a "
    "report is written to the device: until the pipeline takes it up, until the input callback has "
    "returned, until its events come to the host's queue, and until the host's callback gets the "
    "first of them.\n"
    "\n"
    "Each measurement has a service of its own, whose recording is full (2699 frames) when it "
    "begins. The reader, a thread that reads the recording without pause, takes turns with its "
    "absence every half second, so that whatever else the machine does meets both alike. Without "
    "real-time priority, the input thread and the host's queue are put back to the normal policy. "
    "A live surface sends when it likes: its reports are measured from the moment at which each "
    "was "
    "read from the kernel, the recording is as it comes, and a measurement ends with the number of "
    "reports or after the time, whichever comes first.\n"
    "\n"
    "A percentile is too large by a thousandth at most, the maximum is exact. A report that makes "
    "no event has no sample in the last two rows; "
    "of the short taps that are sent by default, each image makes one.";

std::optional<bool> choiceOption(const Arguments& arguments, std::string_view name,
                                 std::string_view yes, std::string_view no) {
    const std::string text = arguments.value(name);
    if (text == "both") {
        return std::nullopt;
    }
    if (text != yes && text != no) {
        throw UsageError(std::string(name) + ": expected both, " + std::string(yes) + " or " +
                         std::string(no) + ", found \"" + text + "\"");
    }
    return text == yes;
}

/// What was asked for, one measurement after the other.
struct Plan {
    LatencyRunOptions options;
    std::vector<bool> realTime;
};

std::size_t reportsOf(const Arguments& arguments, double rate) {
    if (const auto count = numberOption(arguments, "--count", 1, kMostReports)) {
        if (arguments.given("--duration")) {
            throw UsageError("--count takes the place of --duration");
        }
        return static_cast<std::size_t>(*count);
    }
    const double seconds =
        std::chrono::duration<double>(durationOption(arguments, "--duration").value()).count();
    const double reports = std::max(1.0, seconds * rate);
    if (reports > static_cast<double>(kMostReports)) {
        throw UsageError("--duration: at this rate more than " + std::to_string(kMostReports) +
                         " reports");
    }
    return static_cast<std::size_t>(reports);
}

/// A recording is sent once: there is not more to measure than it holds.
void fitToSource(LatencyRunOptions& options, const std::string& path) {
    std::size_t held = 0;
    options.source([&held](const PlayedDevice::Frame& frame) {
        held += frame.type == PlayedDevice::Frame::Type::InputReport ? 1U : 0U;
    });
    const std::size_t parts = options.reader == LatencyReader::Turns ? 2 : 1;
    if (held < parts) {
        throw Failure(path + ": holds " + std::to_string(held) + " reports, too few to measure");
    }
    options.reports = std::min(options.reports, held / parts);
}

Plan planOf(const Arguments& arguments, Streams& streams) {
    Plan plan;
    plan.options.patience = streams.patience;
    plan.options.rate = rateOption(arguments, "--rate", kHighestRate).value();
    plan.options.reports = reportsOf(arguments, plan.options.rate);
    const auto reader = choiceOption(arguments, "--reader", "on", "off");
    plan.options.reader = !reader   ? LatencyReader::Turns
                          : *reader ? LatencyReader::On
                                    : LatencyReader::Off;
    const auto realTime = choiceOption(arguments, "--priority", "realtime", "normal");
    plan.realTime = realTime ? std::vector<bool>{*realTime} : std::vector<bool>{true, false};
    const DeviceChoice choice = DeviceChoice::parse(arguments.value("--device"));
    DeviceWishes wishes;
    wishes.match = matchOption(arguments, choice);
    if (choice.kind == DeviceChoice::Kind::Hidraw) {
        if (arguments.given("--rate")) {
            throw UsageError("--rate: a live surface has its own");
        }
        if (!arguments.given("--count")) {
            plan.options.longest = durationOption(arguments, "--duration").value();
        }
        plan.options.live = makeDevice(choice, wishes, streams);
        return plan;
    }
    plan.options.source = choice.path.empty()
                              ? gestureSource(GestureScript::parse(kLatencyGestures), {}, true)
                              : frameSource(choice, streams);
    if (choice.kind == DeviceChoice::Kind::Recording) {
        fitToSource(plan.options, choice.path);
    }
    return plan;
}

std::string priorityText(const ThreadPriority& priority) {
    return priority.realTime ? "real-time priority " + std::to_string(priority.priority)
                             : "normal priority";
}

std::string prioritiesText(const LatencyResult& result) {
    return "input thread at " + priorityText(result.inputThread) + ", queue at " +
           priorityText(result.queueThread);
}

template <typename... Values>
std::string formatted(const char* format, Values... values) {
    std::array<char, 256> text{};
    const int length = std::snprintf(text.data(), text.size(), format, values...);
    return std::string(text.data(), static_cast<std::size_t>(length));
}

/// A measurement is silent until it is done.
void tellHowLong(const LatencyRunOptions& options, bool realTime, Streams& streams) {
    const int parts = options.reader == LatencyReader::Turns ? 2 : 1;
    const double seconds = options.live
                               ? std::chrono::duration<double>(options.longest).count() * parts
                               : static_cast<double>(options.reports) * parts / options.rate;
    streams.error << "measuring " << (realTime ? "with real-time" : "at normal") << " priority";
    constexpr double kLongest = 1e9;  // a live device may have no limit
    if (seconds < kLongest) {
        streams.error << formatted(", about %.0f s", std::ceil(seconds));
    }
    streams.error << " ..." << std::endl;
}

/// The results of each priority.
using Measurements = std::vector<std::vector<LatencyResult>>;

Measurements measure(Plan& plan, Streams& streams) {
    Measurements measurements;
    for (const bool realTime : plan.realTime) {
        plan.options.mayBeRealTime = realTime;
        tellHowLong(plan.options, realTime, streams);
        const std::vector<LatencyResult>& results =
            measurements.emplace_back(measureLatency(plan.options));
        streams.error << "measured with the " << prioritiesText(results.front()) << '\n';
        if (realTime && !results.front().inputThread.realTime) {
            streams.error << "real-time priority was not granted\n";
            break;  // the other measurement would be the same
        }
    }
    return measurements;
}

constexpr std::array<std::string_view, kLatencyStages.size()> kStageTexts = {
    "report to pipeline", "report to pipeline done", "report to queue", "report to callback"};
constexpr std::array<std::string_view, kLatencyStages.size()> kStageNames = {
    "pipeline", "pipeline_done", "queue", "callback"};

constexpr std::array<std::uint64_t LatencySummary::*, 5> kFigures = {
    &LatencySummary::p50, &LatencySummary::p90, &LatencySummary::p99, &LatencySummary::p999,
    &LatencySummary::most};
constexpr std::array<std::string_view, kFigures.size()> kFigureTexts = {"p50", "p90", "p99",
                                                                        "p99.9", "max"};
constexpr std::array<std::string_view, kFigures.size()> kFigureNames = {
    "p50_ns", "p90_ns", "p99_ns", "p999_ns", "max_ns"};

const LatencySummary& toCallback(const LatencyResult& result) {
    return result.stages[static_cast<std::size_t>(LatencyStage::Delivered)];
}

double microseconds(std::uint64_t ns) {
    return static_cast<double>(ns) / 1000.0;
}

void printRow(const LatencyResult& result, std::size_t stage, Streams& streams) {
    const LatencySummary& summary = result.stages[stage];
    std::string row = formatted("%-24s%-8s%9zu", std::string(kStageTexts[stage]).c_str(),
                                result.hadReader ? "reader" : "-", summary.samples);
    for (const auto figure : kFigures) {
        row += formatted("%11.1f", microseconds(summary.*figure));
    }
    streams.out << row << '\n';
}

/// The measurements of one priority, side by side: each stage without and with the reader.
void printTable(std::span<const LatencyResult> results, Streams& streams) {
    streams.out << prioritiesText(results.front()) << '\n';
    std::string head = formatted("%-24s%-8s%9s", "  microseconds", "", "samples");
    for (const std::string_view figure : kFigureTexts) {
        head += formatted("%11s", std::string(figure).c_str());
    }
    streams.out << head << '\n';
    for (std::size_t stage = 0; stage < kLatencyStages.size(); ++stage) {
        for (const LatencyResult& result : results) {
            printRow(result, stage, streams);
        }
    }
    for (const LatencyResult& result : results) {
        if (result.hadReader) {
            streams.out << "the reader read the recording " << result.recordingReads << " times, "
                        << formatted("%.1f", microseconds(result.recordingReadNs) / 1000.0)
                        << " ms each, " << result.recordingBytes << " bytes in the end\n";
        }
    }
}

void printRatio(std::span<const LatencyResult> results, Streams& streams) {
    if (results.size() == 2 && toCallback(results[0]).samples != 0 &&
        toCallback(results[1]).samples != 0) {
        streams.out << formatted(
            "p99.9 of report to callback with the reader is %.2f times that "
            "without\n",
            static_cast<double>(toCallback(results[1]).p999) /
                static_cast<double>(toCallback(results[0]).p999));
    }
}

void printTables(const Plan& plan, const Measurements& measurements, Streams& streams) {
    if (plan.options.live) {
        streams.out << "at most " << plan.options.reports
                    << " reports of a live surface, from the moment at which each was read\n";
    } else {
        streams.out << plan.options.reports << " reports, " << formatted("%g", plan.options.rate)
                    << " a second; the recording was full when each measurement began\n";
    }
    for (const std::vector<LatencyResult>& results : measurements) {
        streams.out << '\n';
        printTable(results, streams);
        printRatio(results, streams);
    }
}

void writePriority(Vexa::JsonWriter& writer, std::string_view name,
                   const ThreadPriority& priority) {
    writer.key(name);
    writer.beginObject();
    writer.key("real_time");
    writer.boolean(priority.realTime);
    writer.key("priority");
    writer.number(std::int64_t{priority.priority});
    writer.endObject();
}

void writeMeasurement(Vexa::JsonWriter& writer, const LatencyResult& result) {
    writer.beginObject();
    writePriority(writer, "input_thread", result.inputThread);
    writePriority(writer, "queue_thread", result.queueThread);
    writer.key("reader");
    writer.boolean(result.hadReader);
    writer.key("recording_reads");
    writer.number(result.recordingReads);
    writer.key("recording_read_ns");
    writer.number(result.recordingReadNs);
    writer.key("recording_bytes");
    writer.number(result.recordingBytes);
    for (std::size_t stage = 0; stage < kLatencyStages.size(); ++stage) {
        writer.key(kStageNames[stage]);
        writer.beginObject();
        writer.key("samples");
        writer.number(std::uint64_t{result.stages[stage].samples});
        for (std::size_t figure = 0; figure < kFigures.size(); ++figure) {
            writer.key(kFigureNames[figure]);
            writer.number(result.stages[stage].*kFigures[figure]);
        }
        writer.endObject();
    }
    writer.endObject();
}

void printJson(const Plan& plan, const Measurements& measurements, Streams& streams) {
    std::string text;
    Vexa::JsonWriter writer(text);
    writer.beginObject();
    writer.key("live");
    writer.boolean(plan.options.live != nullptr);
    writer.key("rate");
    writer.number(plan.options.rate);
    writer.key("reports");
    writer.number(std::uint64_t{plan.options.reports});
    writer.key("measurements");
    writer.beginArray();
    for (const std::vector<LatencyResult>& results : measurements) {
        for (const LatencyResult& result : results) {
            writeMeasurement(writer, result);
        }
    }
    writer.endArray();
    writer.endObject();
    streams.out << text << '\n';
}

int runLatency(const Arguments& arguments, Streams& streams) {
    Plan plan = planOf(arguments, streams);
    const Measurements measurements = measure(plan, streams);
    if (arguments.given("--json")) {
        printJson(plan, measurements, streams);
    } else {
        printTables(plan, measurements, streams);
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command latencyCommand = {
    .name = "latency",
    .summary = "Measure how long a report takes through the service to the host",
    .description = kDescription,
    .positionals = {},
    .options = kOptions,
    .exitCodes = usualExitCodes,
    .examples = kExamples,
    .run = runLatency,
};

}  // namespace VexaTouch::Tools
