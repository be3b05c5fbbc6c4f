#include "Tools/SynthCommand.h"

#include "Pipeline/ContainerWriter.h"
#include "Tools/Failure.h"
#include "Tools/InputFile.h"
#include "Tools/OutputFile.h"
#include "Tools/SurfaceSynthesizer.h"

#include <array>
#include <charconv>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "SCRIPT", .help = "The script of gestures; - reads standard input", .required = false},
}};

constexpr std::array<OptionEntry, 4> kOptions = {{
    {.name = "--output",
     .shortName = "-o",
     .valueName = "OUT",
     .help = "Write the recording there; - is standard output",
     .required = true,
     .kind = ValueKind::File},
    {.name = "--seed",
     .valueName = "N",
     .help = "Seed of the random numbers, instead of the script's own"},
    {.name = "--random",
     .valueName = "SECONDS",
     .help = "Make up a mixed session of about that long instead of reading a script"},
    {.name = "--script", .help = "Write the script that --random made up instead of its recording"},
}};

constexpr std::array<ExampleEntry, 3> kExamples = {{
    {"vexatouch synth Examples/mixed.gesture -o mixed.json", "Makes a recording from a script"},
    {"printf 'tap vol+\\nhold play 900ms\\n' | vexatouch synth - -o - | vexatouch replay -",
     "Shows the events of two gestures"},
    {"vexatouch synth --random 600 --seed 7 -o session.json",
     "Makes up ten minutes of touches, the same ones for the same seed"},
}};

std::string describeLanguage() {
    return "Makes a recording from a script of gestures, one command a line; # begins a comment. "
           "Places are names (play, vol+, vol-), pixel letters (A to O), grid places (A1 at the "
           "upper left to G7 at the lower right, D4 in the middle) or coordinates such as -10,4 in "
           "surface units around the middle. The same script and seed give the same bytes "
           "everywhere.\n\nCommands:\n\n" +
           gestureCommandHelp();
}

const std::string kDescription = describeLanguage();

/// No more than one byte above the limit, which the parser then refuses.
std::string readScript(const std::string& path, Streams& streams) {
    InputFile file(path, streams);
    std::string text;
    for (std::string_view piece = file.next(); !piece.empty() && text.size() <= kMaximumScriptBytes;
         piece = file.next()) {
        text += piece.substr(0, kMaximumScriptBytes + 1 - text.size());
    }
    return text;
}

std::optional<std::uint64_t> numberOption(const Arguments& arguments, std::string_view name,
                                          std::uint64_t lowest, std::uint64_t highest) {
    if (!arguments.given(name)) {
        return std::nullopt;
    }
    const std::string text = arguments.value(name);
    std::uint64_t value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (error != std::errc{} || end != text.data() + text.size() || value < lowest ||
        value > highest) {
        throw UsageError(std::string(name) + ": expected a number from " + std::to_string(lowest) +
                         " to " + std::to_string(highest) + ", found \"" + text + "\"");
    }
    return value;
}

std::string scriptText(const Arguments& arguments, std::uint64_t seed, Streams& streams) {
    constexpr std::uint64_t kLongestSeconds = 18'000;
    const auto seconds = numberOption(arguments, "--random", 1, kLongestSeconds);
    if (seconds.has_value() == arguments.given("SCRIPT")) {
        throw UsageError("synth: expected either a SCRIPT or --random SECONDS");
    }
    if (arguments.given("--script") && !seconds) {
        throw UsageError("synth: --script goes with --random");
    }
    return seconds ? randomScript(seed, *seconds * 1000)
                   : readScript(arguments.value("SCRIPT"), streams);
}

GestureScript parseScript(const std::string& text, const std::string& name) {
    try {
        return GestureScript::parse(text);
    } catch (const GestureScriptError& error) {
        throw Failure(name + ": " + error.what());
    }
}

void writeFrames(const GestureScript& script, std::optional<std::uint64_t> seed, OutputFile& file) {
    ContainerWriter writer([&file](std::string_view piece) { file.write(piece); });
    SurfaceSynthesizer synthesizer(
        [&writer](const PipelineRecording::Frame& frame) { writer.write(frame); }, seed);
    synthesizer.perform(script);
    writer.finish();
}

int runSynth(const Arguments& arguments, Streams& streams) {
    const auto seed = numberOption(arguments, "--seed", 0, UINT64_MAX);
    const std::string text = scriptText(arguments, seed.value_or(kDefaultSeed), streams);
    if (arguments.given("--script")) {
        OutputFile file(arguments.value("--output"), streams, OutputFile::Content::Derivable);
        file.write(text);
        file.commit();
        return kExitSuccess;
    }
    const std::string path = arguments.given("SCRIPT") ? arguments.value("SCRIPT") : "--random";
    const std::string name = path == "-" ? "standard input" : path;
    const GestureScript script = parseScript(text, name);
    if (script.frames == 0) {
        throw Failure(name + ": the script makes no frames (add a gesture, or idle 100ms)");
    }
    OutputFile file(arguments.value("--output"), streams, OutputFile::Content::Derivable);
    writeFrames(script, seed, file);
    file.commit();
    streams.error << file.name() << ": " << script.frames << " frames\n";
    return kExitSuccess;
}

}  // namespace

const Command synthCommand = {
    .name = "synth",
    .summary = "Make a recording from a script of gestures",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = usualExitCodes,
    .examples = kExamples,
    .run = runSynth,
};

}  // namespace VexaTouch::Tools
