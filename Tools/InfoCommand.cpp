#include "Tools/InfoCommand.h"

#include "Platform/Json.h"
#include "Tools/Progress.h"
#include "Tools/RecordingFile.h"
#include "Tools/RecordingSummary.h"
#include "Tools/Replay.h"
#include "Tools/TerminalText.h"

#include <array>
#include <cstdio>
#include <string>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "FILE", .help = "The recording; - reads standard input"},
}};

constexpr std::array<OptionEntry, 1> kOptions = {{
    {.name = "--json", .help = "Print one JSON object"},
}};

constexpr std::array<ExampleEntry, 2> kExamples = {{
    {"vexatouch info tap.json", "says what the recording holds"},
    {"vexatouch info --json tap.json | jq .image_interval_ms", "reads one figure"},
}};

constexpr std::string_view kDescription =
    R"(Replays a recording as fast as it goes and says what it holds: its frames by type, how long it is, how regularly the images came, the settings written, and the counters of events at the end.

Intervals are taken from the device's clock, by nearest rank, without the steps backward. A clock jump is such a step or one of more than a second. An image is disjoint when its number is not one more than that of the image before. Inputs that were lost while it was recorded, because the file was not written quickly enough, are counted, and a warning says so.

With --json the object has the members version, frames (input_reports, states, images, firmware_events, invalid), duration_ns, image_interval_ms (median, p99, max; null with fewer than two images), disjoint_images, clock_jumps, lost_reports, lost_settings, settings (the last value by key), stats.)";

void printJson(const RecordingFile& file, const Replay& replay, const RecordingSummary& summary,
               Streams& streams) {
    const ReplayCounts& counts = replay.counts();
    const auto intervals = summary.intervals();
    std::string text;
    Vexa::JsonWriter json(text);
    const auto number = [&json](std::string_view key, std::uint64_t value) {
        json.key(key);
        json.number(value);
    };
    const auto interval = [&](std::string_view key,
                              std::uint32_t RecordingSummary::Intervals::* of) {
        json.key(key);
        if (intervals) {
            json.number(std::uint64_t{(*intervals).*of});
        } else {
            json.null();
        }
    };
    json.beginObject();
    number("version", file.version);
    json.key("frames");
    json.beginObject();
    number("input_reports", counts.frames - counts.states);
    number("states", counts.states);
    number("images", counts.images);
    number("firmware_events", counts.firmwareEvents);
    number("invalid", counts.invalidReports);
    json.endObject();
    number("duration_ns", summary.durationNs());
    json.key("image_interval_ms");
    json.beginObject();
    interval("median", &RecordingSummary::Intervals::median);
    interval("p99", &RecordingSummary::Intervals::p99);
    interval("max", &RecordingSummary::Intervals::max);
    json.endObject();
    number("disjoint_images", summary.disjointImages());
    number("clock_jumps", summary.clockJumps());
    number("lost_reports", summary.lost().reports);
    number("lost_settings", summary.lost().settings);
    json.key("settings");
    json.value(summary.settings());
    json.key("stats");
    json.value(replay.algs().eventStats().statsDictionary());
    json.endObject();
    streams.out << text << '\n';
}

// One line of the text for a person: what, and what of it.
void line(Streams& streams, std::string_view name, std::string_view text) {
    constexpr std::size_t kNameWidth = 12;
    streams.out << "  " << name;
    for (std::size_t column = name.size(); column < kNameWidth; ++column) {
        streams.out << ' ';
    }
    streams.out << ' ' << text << '\n';
}

std::string counted(std::uint64_t count, std::string_view thing) {
    return std::to_string(count) + " " + std::string(thing) + (count == 1 ? "" : "s");
}

std::string seconds(std::uint64_t nanoseconds) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%.3f s", static_cast<double>(nanoseconds) / 1e9);
    return text.data();
}

std::string framesText(const ReplayCounts& counts) {
    return std::to_string(counts.frames) + ": " +
           counted(counts.frames - counts.states, "input report") + " (" +
           counted(counts.images, "image") + ", " +
           counted(counts.firmwareEvents, "firmware event") + ", " +
           std::to_string(counts.invalidReports) + " invalid), " +
           counted(counts.states, "setting");
}

std::string intervalText(const RecordingSummary& summary) {
    const auto intervals = summary.intervals();
    if (!intervals) {
        return "unknown (fewer than two images)";
    }
    return "median " + std::to_string(intervals->median) + " ms, p99 " +
           std::to_string(intervals->p99) + " ms, largest gap " + std::to_string(intervals->max) +
           " ms before frame " + std::to_string(intervals->maxBeforeFrame);
}

// The counters of one dictionary that are not 0.
std::string countersText(const Algs& algs, bool dispatched) {
    std::string text;
    for (const EventStats::CounterEntry& entry : EventStats::kCounterTable) {
        const std::uint64_t count = algs.eventStats()._stats.*entry.counter;
        if (entry.dispatched == dispatched && count != 0) {
            text += text.empty() ? "" : ", ";
            text += std::string(entry.name) + " " + std::to_string(count);
        }
    }
    return text.empty() ? "nothing" : text;
}

std::string lostText(const RecordingSummary& summary) {
    return counted(summary.lost().reports, "report") + " and " +
           counted(summary.lost().settings, "setting") + ", at " +
           counted(summary.lossPlaces(), "place");
}

void printText(const RecordingFile& file, const Replay& replay, const RecordingSummary& summary,
               Streams& streams) {
    streams.out << file.name << '\n';
    line(streams, "container",
         "version " + std::to_string(file.version) + ", " + counted(file.textBytes, "byte"));
    line(streams, "frames", framesText(replay.counts()));
    line(streams, "duration", seconds(summary.durationNs()));
    line(streams, "interval", intervalText(summary));
    line(streams, "disjoint", counted(summary.disjointImages(), "image"));
    line(streams, "clock jumps", std::to_string(summary.clockJumps()));
    if (summary.lossPlaces() > 0) {
        line(streams, "lost", lostText(summary));
    }
    line(streams, "mid-touch",
         summary.beginsInMidTouch() ? "begins with a finger on the surface" : "no");
    bool first = true;
    for (const auto& [key, value] : summary.settings()) {
        line(streams, first ? "settings" : "",
             forTerminal(key + " = " + Vexa::writeJson(value, Vexa::JsonWriter::Style::Compact)));
        first = false;
    }
    if (first) {
        line(streams, "settings", "none written");
    }
    line(streams, "dispatched", countersText(replay.algs(), true));
    line(streams, "rejected", countersText(replay.algs(), false));
}

int runInfo(const Arguments& arguments, Streams& streams) {
    RecordingFile file = readRecording(arguments.value("FILE"), streams);
    Replay replay(std::exchange(file.frames, {}));
    RecordingSummary summary;
    {
        Progress progress(streams, "playing " + file.name, replay.frames().size());
        while (replay.canContinue()) {
            summary.add(replay.next(), replay.algs());
            progress.update(replay.counts().frames);
        }
    }
    if (arguments.given("--json")) {
        printJson(file, replay, summary, streams);
    } else {
        printText(file, replay, summary, streams);
    }
    if (summary.lossPlaces() > 0) {
        streams.error << "vexatouch info: warning: " << file.name << ": " << lostText(summary)
                      << ", were lost while it was recorded; what follows a loss may give other "
                         "events than the service gave\n";
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command infoCommand = {
    .name = "info",
    .summary = "Say what a recording holds",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = usualExitCodes,
    .examples = kExamples,
    .run = runInfo,
};

}  // namespace VexaTouch::Tools
