#include "Tools/ConvertCommand.h"

#include "Tools/CsvExport.h"
#include "Tools/Failure.h"
#include "Tools/HidRecorderReader.h"
#include "Tools/HidRecorderWriter.h"
#include "Tools/InputFile.h"
#include "Tools/OutputFile.h"
#include "Tools/PerfettoExport.h"
#include "Tools/Progress.h"
#include "Tools/RecordingCut.h"
#include "Tools/RecordingFile.h"
#include "Tools/RecordingRecovery.h"
#include "Tools/Replay.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "FILE", .help = "The recording; - reads standard input"},
}};

constexpr std::array<OptionEntry, 5> kOptions = {{
    {.name = "--output",
     .shortName = "-o",
     .valueName = "OUT",
     .help = "The file to write, which appears whole or not at all; - writes to standard output",
     .required = true,
     .kind = ValueKind::File},
    {.name = "--from",
     .valueName = "FORMAT|PLACE",
     .help = "The format of FILE (container, hid-recorder), or where the cut begins: a frame "
             "number (120) or a recorded time since the first frame (1500ms, 1.5s). Give it twice "
             "for both",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = "container hid-recorder"},
    {.name = "--to",
     .valueName = "FORMAT|PLACE",
     .help = "The format of OUT (container, hid-recorder, csv, perfetto), or where the cut ends: "
             "before that frame or time. Give it twice for both",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = "container hid-recorder csv perfetto"},
    {.name = "--trim",
     .valueName = "N",
     .help = "Keep the newest N input reports and the settings that still matter, as a bounded "
             "recording does; after a cut by --from and --to"},
    {.name = "--recover",
     .help = "Keep every whole frame of a damaged or cut-off file and say what was lost"},
}};

constexpr std::array<ExampleEntry, 6> kExamples = {{
    {"vexatouch convert old.json -o new.json", "brings a version-0 recording to version 1"},
    {"vexatouch convert long.json -o cut.json --from 1500ms --to 4s",
     "cuts out two and a half seconds"},
    {"vexatouch convert long.json -o end.json --trim 1350", "keeps the newest 1350 reports"},
    {"vexatouch convert broken.json -o whole.json --recover", "saves what can be read"},
    {"vexatouch convert tap.json -o tap.hid --to hid-recorder",
     "makes a recording for the Linux HID tools"},
    {"vexatouch convert tap.json -o - --to csv --from 100 --to 200 | column -s, -t",
     "looks at a hundred frames as a table"},
}};

constexpr std::string_view kDescription =
    R"(Reads a recording, cuts it if asked to, and writes it as:

  container     the recording itself, version 1 (also from version 0)
  hid-recorder  the text format of the Linux HID tools; settings travel in comments
                and come back with --from hid-recorder
  csv           a row for each frame, as the algorithm saw it
  perfetto      a trace for the Perfetto viewer: counters per pixel, slices for
                touches and holds, instants for events

A cut begins with the settings in force where it begins; what else the algorithm knew is lost. When a finger was on the surface there, a warning says so: that touch may end in other events than it did.)";

// How the values of --from and --to that name a format are written.
enum class Format : std::uint8_t { Container, HidRecorder, Csv, Perfetto };
struct FormatEntry {
    std::string_view name;
    Format format;
    bool readable;
};
constexpr std::array<FormatEntry, 4> kFormats = {{
    {"container", Format::Container, true},
    {"hid-recorder", Format::HidRecorder, true},
    {"csv", Format::Csv, false},
    {"perfetto", Format::Perfetto, false},
}};

// What the values of --from or --to say together.
struct Side {
    Format format = Format::Container;
    std::optional<CutPlace> place;
};

Side parseSide(std::string_view option, const std::vector<std::string>& values) {
    Side side;
    bool formatGiven = false;
    const auto twice = [&](const char* what) {
        throw UsageError(std::string(option) + " gives two " + what);
    };
    for (const std::string& value : values) {
        const auto* entry = std::ranges::find(kFormats, value, &FormatEntry::name);
        if (entry != kFormats.end()) {
            if (formatGiven) {
                twice("formats");
            }
            if (option == "--from" && !entry->readable) {
                throw UsageError("--from " + value + ": this format can be written, not read");
            }
            side.format = entry->format;
            formatGiven = true;
            continue;
        }
        const auto place = CutPlace::fromText(value);
        if (!place) {
            throw UsageError(std::string(option) + " " + value +
                             ": neither a format, a frame number nor a time such as 1500ms");
        }
        if (side.place) {
            twice("places");
        }
        side.place = place;
    }
    return side;
}

std::optional<std::uint64_t> parseTrim(const Arguments& arguments) {
    if (!arguments.given("--trim")) {
        return std::nullopt;
    }
    const std::string text = arguments.value("--trim");
    std::uint64_t count = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), count);
    if (error != std::errc() || end != text.data() + text.size() || count == 0) {
        throw UsageError("--trim " + text + ": not a number of reports from 1 on");
    }
    return count;
}

std::string counted(std::uint64_t count, std::string_view thing) {
    return std::to_string(count) + " " + std::string(thing) + (count == 1 ? "" : "s");
}

void warn(Streams& streams, std::string_view text) {
    streams.error << "vexatouch convert: warning: " << text << '\n';
}

FrameList readHidRecording(const std::string& path, Streams& streams) {
    InputFile file(path, streams);
    HidRecorderReader reader;
    Progress progress(streams, "reading " + file.name(), file.size(), 16);
    std::uint64_t bytes = 0;
    try {
        for (std::string_view piece = file.next(); !piece.empty(); piece = file.next()) {
            bytes += piece.size();
            reader.write(piece);
            progress.update(bytes);
        }
        FrameList frames = reader.finish();
        if (reader.otherDevicesEvents() > 0) {
            warn(streams, file.name() + ": left out " +
                              counted(reader.otherDevicesEvents(), "event") +
                              " of other devices than the first");
        }
        return frames;
    } catch (const std::invalid_argument& fault) {
        throw Failure(file.name() + ": " + (bytes == 0 ? "is empty: " : "") + fault.what());
    }
}

// Says what was lost, one line for each damaged place.
FrameList recover(const std::string& path, Format format, Streams& streams) {
    constexpr std::size_t kMostLines = 10;
    InputFile file(path, streams);
    const std::string text = file.rest();
    RecordingRecovery recovery =
        format == Format::HidRecorder ? recoverHidRecording(text) : recoverContainer(text);
    for (std::size_t i = 0; i < std::min(recovery.damages.size(), kMostLines); ++i) {
        streams.error << file.name() << ": lost: " << recovery.damages[i] << '\n';
    }
    if (recovery.damages.size() > kMostLines) {
        streams.error << file.name() << ": lost: "
                      << counted(recovery.damages.size() - kMostLines, "further damaged place")
                      << '\n';
    }
    if (recovery.frames.empty() && !recovery.damages.empty()) {
        throw Failure(file.name() + ": no whole frame to recover");
    }
    streams.error << file.name() << ": "
                  << (recovery.damages.empty() ? "not damaged, " : "recovered ")
                  << counted(recovery.frames.size(), "whole frame") << '\n';
    return std::move(recovery.frames);
}

// True if a finger was on the surface where what is left begins.
bool cut(FrameList& frames, const Side& from, const Side& to, const std::string& name) {
    const std::uint64_t begin = from.place ? frameAt(frames, *from.place) : 0;
    const std::uint64_t end = to.place ? frameAt(frames, *to.place) : frames.size();
    if (begin >= end) {
        throw Failure(name + ": the cut from frame " + std::to_string(begin) + " to frame " +
                      std::to_string(end) + " holds none of its " +
                      counted(frames.size(), "frame"));
    }
    return cutFrames(frames, begin, end);
}

template <class Writer>
void writeFrames(const FrameList& frames, OutputFile& file, Streams& streams) {
    Writer writer([&file](std::string_view piece) { file.write(piece); });
    Progress progress(streams, "writing " + file.name(), frames.size());
    std::uint64_t written = 0;
    for (const PipelineRecording::Frame& frame : frames) {
        writer.write(frame);
        progress.update(++written);
    }
    writer.finish();
}

template <class Export>
void writeReplay(FrameList frames, OutputFile& file, Streams& streams) {
    Replay replay(std::move(frames));
    Export writer([&file](std::string_view piece) { file.write(piece); });
    Progress progress(streams, "writing " + file.name(), replay.frames().size());
    while (replay.canContinue()) {
        writer.write(replay.next(), replay.algs());
        progress.update(replay.counts().frames);
    }
    writer.finish();
}

void writeAs(Format format, FrameList frames, const std::string& path, Streams& streams) {
    if (format == Format::Container) {
        writeRecording(frames, path, streams);
        return;
    }
    OutputFile file(path, streams, OutputFile::Content::Derivable);
    if (format == Format::HidRecorder) {
        writeFrames<HidRecorderWriter>(frames, file, streams);
    } else if (format == Format::Csv) {
        writeReplay<CsvExport>(std::move(frames), file, streams);
    } else {
        writeReplay<PerfettoExport>(std::move(frames), file, streams);
    }
    file.commit();
}

int runConvert(const Arguments& arguments, Streams& streams) {
    const Side from = parseSide("--from", arguments.values("--from"));
    const Side to = parseSide("--to", arguments.values("--to"));
    const std::optional<std::uint64_t> trim = parseTrim(arguments);
    const std::string input = arguments.value("FILE");
    const std::string name = input == "-" ? "standard input" : input;

    FrameList frames;
    if (arguments.given("--recover")) {
        frames = recover(input, from.format, streams);
    } else if (from.format == Format::HidRecorder) {
        frames = readHidRecording(input, streams);
    } else {
        frames = readRecording(input, streams).frames;
    }
    const std::uint64_t framesRead = frames.size();

    bool midTouch = false;
    if (from.place || to.place) {
        midTouch = cut(frames, from, to, name);
    }
    if (trim) {
        midTouch = keepNewestReports(frames, *trim) || midTouch;
    }
    if (midTouch) {
        warn(streams, name + ": the cut begins in mid-touch, so that touch may end differently");
    }
    const std::uint64_t framesWritten = frames.size();
    const std::string output = arguments.value("--output");
    writeAs(to.format, std::move(frames), output, streams);
    streams.error << name << ": " << counted(framesRead, "frame") << " read, " << framesWritten
                  << " written to " << (output == "-" ? "standard output" : output) << '\n';
    return kExitSuccess;
}

}  // namespace

constinit const Command convertCommand = {
    .name = "convert",
    .summary = "Cut a recording, recover a damaged one, or write it in another format",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = usualExitCodes,
    .examples = kExamples,
    .run = runConvert,
};

}  // namespace VexaTouch::Tools
