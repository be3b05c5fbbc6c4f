#include "Host/PluginLibrary.h"
#include "Platform/HostClock.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/ProgramOnTerminal.h"
#include "Tests/Tools/ProgramRun.h"
#include "Tools/EventRecord.h"
#include "Tools/LiveRun.h"
#include "Tools/PlayedDevice.h"
#include "Tools/RecordedDevice.h"
#include "Tools/RecordingFile.h"
#include "Tools/SignalWatch.h"
#include "Tools/SurfaceSynthesizer.h"
#include "Tools/WakeUp.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <limits>
#include <random>
#include <regex>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

const std::filesystem::path kExamples = VEXA_SOURCE_DIR "/Examples";
constexpr const char* kVariable = "VEXATOUCH_PLUGIN";
/// So long a service that never takes a report is waited for.
constexpr std::chrono::milliseconds kImpatience{10};

/// What happened: each line from its frame number on.
std::vector<std::string> eventsIn(const std::string& lines) {
    std::vector<std::string> events;
    for (const std::string& line : linesOf(lines)) {
        const std::size_t from = line.find("\"frame\":");
        events.push_back(from == std::string::npos ? "no event: " + line : line.substr(from));
    }
    return events;
}

std::vector<std::string> replayed(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), {"replay", "--json"});
    const CommandResult result = runCommand(arguments);
    EXPECT_EQ(result.exitCode, 0) << result;
    return eventsIn(result.out);
}

std::string example(const std::string& name) {
    return kExamples / (name + ".json");
}

std::string asFastAsTaken(const std::string& name) {
    return "recording:" + example(name) + "@max";
}

class RunCommandTest : public ::testing::Test {
protected:
    RunCommandTest() { setenv(kVariable, VEXATOUCH_PLUGIN_FILE, 1); }
    ~RunCommandTest() override { unsetenv(kVariable); }

    static CommandResult run(std::vector<std::string> arguments, const std::string& input = {}) {
        arguments.insert(arguments.begin(), "run");
        return runCommand(arguments, input);
    }

    TemporaryFolder folder;
};

class LiveExampleTest : public RunCommandTest, public ::testing::WithParamInterface<std::string> {};

TEST_P(LiveExampleTest, LiveEqualsReplayOfTheExampleAndOfWhatWasRecorded) {
    const std::string recorded = folder.path("recorded.json");
    const CommandResult live =
        run({"--device", asFastAsTaken(GetParam()), "--json", "--record", recorded});
    EXPECT_EQ(live.exitCode, 0) << live;
    EXPECT_EQ(eventsIn(live.out), replayed({example(GetParam())}));
    EXPECT_EQ(eventsIn(live.out), replayed({recorded}));
}

TEST_P(LiveExampleTest, RecordingHoldsWhatTheDevicePlayed) {
    const std::string recorded = folder.path("recorded.json");
    ASSERT_EQ(run({"--device", asFastAsTaken(GetParam()), "--record", recorded}).exitCode, 0);
    Tools::Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    auto played = Tools::readRecording(example(GetParam()), streams).frames;
    auto kept = Tools::readRecording(recorded, streams).frames;
    ASSERT_EQ(kept.size(), played.size());
    auto before = played.begin();
    for (auto frame = kept.begin(); frame != kept.end(); ++frame, ++before) {
        EXPECT_EQ(frame->type, before->type);
        EXPECT_EQ(frame->key, before->key);
        EXPECT_EQ(frame->value, before->value);
        EXPECT_EQ(frame->report, before->report);
    }
}

std::vector<std::string> exampleNames() {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(kExamples)) {
        if (entry.path().extension() == ".json") {
            names.push_back(entry.path().stem());
        }
    }
    std::ranges::sort(names);
    return names;
}

INSTANTIATE_TEST_SUITE_P(All, LiveExampleTest, ::testing::ValuesIn(exampleNames()),
                         [](const auto& test) {
                             std::string name = test.param;
                             std::ranges::replace(name, '-', '_');
                             return name;
                         });

/// The reports of a recording in their order.
std::vector<std::vector<std::uint8_t>> reportsIn(const std::string& file) {
    Tools::Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    std::vector<std::vector<std::uint8_t>> reports;
    for (const auto& frame : Tools::readRecording(file, streams).frames) {
        if (frame.type == PipelineRecording::Frame::Type::InputReport) {
            reports.emplace_back(frame.report.begin(), frame.report.end());
        }
    }
    return reports;
}

TEST_F(RunCommandTest, RandomSessionsLiveEqualReplayAndTheNewestReportsAreKept) {
    constexpr std::size_t kCap = 1350;
    constexpr std::uint64_t kDurationMs = 40'000;
    const std::uint64_t first = std::random_device()();
    for (std::uint64_t seed = first; seed < first + 5; ++seed) {
        SCOPED_TRACE("seed " + std::to_string(seed));
        const std::string script =
            folder.file("random.gesture", Tools::randomScript(seed, kDurationMs));
        const std::string session = folder.path("session.json");
        const std::string recorded = folder.path("recorded.json");
        ASSERT_EQ(runCommand({"synth", script, "-o", session}).exitCode, 0);
        const CommandResult live =
            run({"--device", "recording:" + session + "@max", "--json", "--record", recorded});
        EXPECT_EQ(live.exitCode, 0) << live;
        EXPECT_EQ(eventsIn(live.out), replayed({session}));
        auto played = reportsIn(session);
        ASSERT_GT(played.size(), 2 * kCap);
        played.erase(played.begin(), played.end() - static_cast<std::ptrdiff_t>(kCap));
        EXPECT_EQ(reportsIn(recorded), played);
    }
}

/// A random session of gestures, with one pause after which nothing is left of what was before:
/// settings and the device's clock stay as they are.
std::string sessionWithPause(std::uint64_t seed) {
    constexpr std::uint64_t kBeforeMs = 30'000;
    constexpr std::uint64_t kAfterMs = 8'000;
    const auto gestures = [](std::uint64_t of, std::uint64_t durationMs) {
        std::string kept;
        for (const std::string& line : linesOf(Tools::randomScript(of, durationMs))) {
            if (!line.starts_with("seed ") && !line.starts_with("set ") &&
                !line.starts_with("clock ")) {
                kept += line + '\n';
            }
        }
        return kept;
    };
    // A touch that nobody could miss on either side of it.
    const std::string pause =
        "idle 500ms\nstrength 500\nfinger 12\nnoise 4\ndrift 0\ntap play 100ms\nidle 2s\ntap play "
        "100ms\n";
    return "seed " + std::to_string(seed) + '\n' + gestures(seed, kBeforeMs) + pause +
           gestures(~seed, kAfterMs);
}

/// What happened from the first touch on that came when the surface had been left alone for so
/// long that the algorithm remembers nothing; of the lines that replay prints.
std::vector<std::string> eventsAfterPause(const std::vector<std::string>& lines) {
    constexpr std::uint32_t kPauseMs = 1500;
    for (std::size_t next = 1; next < lines.size(); ++next) {
        const Tools::EventRecord before = Tools::eventFromJson(lines[next - 1]);
        const Tools::EventRecord after = Tools::eventFromJson(lines[next]);
        if (after.kind == Tools::EventKind::MayBegin &&
            after.deviceMs - before.deviceMs >= kPauseMs && before.deviceMs != 0) {
            std::string rest;
            for (std::size_t line = next; line < lines.size(); ++line) {
                rest += lines[line] + '\n';
            }
            return eventsIn(rest);
        }
    }
    return {};
}

TEST_F(RunCommandTest, NewestReportsOfALongSessionMakeTheSameEventsAfterAPause) {
    const std::uint64_t first = std::random_device()();
    for (std::uint64_t seed = first; seed < first + 5; ++seed) {
        SCOPED_TRACE("seed " + std::to_string(seed));
        const std::string session = folder.path("session.json");
        const std::string recorded = folder.path("recorded.json");
        ASSERT_EQ(runCommand({"synth", folder.file("pause.gesture", sessionWithPause(seed)), "-o",
                              session})
                      .exitCode,
                  0);
        const CommandResult live =
            run({"--device", "recording:" + session + "@max", "--json", "--record", recorded});
        EXPECT_EQ(live.exitCode, 0) << live;
        ASSERT_LT(reportsIn(recorded).size(), reportsIn(session).size());
        const CommandResult kept = runCommand({"replay", "--json", recorded});
        EXPECT_EQ(kept.exitCode, 0) << kept;
        const std::vector<std::string> expected = eventsAfterPause(linesOf(kept.out));
        ASSERT_THAT(expected, Not(IsEmpty()));
        std::vector<std::string> events = eventsIn(live.out);
        ASSERT_GE(events.size(), expected.size());
        events.erase(events.begin(), events.end() - static_cast<std::ptrdiff_t>(expected.size()));
        EXPECT_EQ(events, expected);
    }
}

TEST_F(RunCommandTest, EventsComeInAlignedColumns) {
    const CommandResult result = run({"--device", asFastAsTaken("swipe")});
    EXPECT_EQ(result.exitCode, 0);
    EXPECT_THAT(
        result.out,
        MatchesRegex("     host ms  latency us  event           region\n"
                     "( *[0-9]+\\.[0-9]{3}  {1,10}[0-9]+\\.[0-9]  [a-z-]+ +[0-3] [a-z/ -]+\n)+"));
    EXPECT_THAT(result.error,
                MatchesRegex("37 reports sent, 0 dropped, [0-9]+ events; latency [0-9.]+ us on "
                             "average, [0-9.]+ us at most\n"));
}

TEST_F(RunCommandTest, JsonNamesTimeAndLatencyFirst) {
    const CommandResult result = run({"--device", asFastAsTaken("swipe"), "--json"});
    for (const std::string& line : linesOf(result.out)) {
        EXPECT_THAT(line,
                    MatchesRegex("\\{\"time_ns\":[0-9]+,\"latency_ns\":[0-9]+,\"frame\":[0-9]+"
                                 ",\"kind\":\"[a-z-]+\",\"region\":[0-3],\"phase\":[0-9]+,"
                                 "\"mask\":[0-9]+\\}"));
    }
    EXPECT_THAT(linesOf(result.out), Not(IsEmpty()));
}

TEST_F(RunCommandTest, SettingsReachTheServiceBeforeTheFirstReport) {
    for (const std::string setting :
         {"HoldTimeoutMilliseconds=100", "Pipeline.Algs.ActivationThreshold=900.0"}) {
        const CommandResult live =
            run({"--device", asFastAsTaken("holds"), "--json", "--set", setting});
        EXPECT_EQ(eventsIn(live.out), replayed({"--set", setting, example("holds")}));
        EXPECT_NE(eventsIn(live.out), replayed({example("holds")}));
    }
}

TEST_F(RunCommandTest, CountEndsAfterSoManyEvents) {
    const std::vector<std::string> all = replayed({example("taps")});
    const CommandResult result = run({"--device", asFastAsTaken("taps"), "--json", "--count", "3"});
    EXPECT_EQ(result.exitCode, 0);
    EXPECT_EQ(eventsIn(result.out), std::vector<std::string>(all.begin(), all.begin() + 3));
    EXPECT_THAT(result.error, HasSubstr(" 3 events"));
}

TEST_F(RunCommandTest, DurationEndsASurfaceThatNeverDoes) {
    const CommandResult result = run({"--device", "sim", "--seed", "7", "--duration", "30ms"});
    EXPECT_EQ(result.exitCode, 0) << result;
    EXPECT_THAT(result.out, StartsWith("     host ms"));
    EXPECT_THAT(result.error, HasSubstr(" sent, 0 dropped, "));
}

TEST_F(RunCommandTest, ScriptIsPlayedToItsEnd) {
    const std::string script = folder.file("one.gesture", "rate 1000\ntap play 60ms\n");
    const CommandResult result = run({"--device", "sim:" + script, "--json"});
    EXPECT_EQ(result.exitCode, 0) << result;
    EXPECT_THAT(result.out, HasSubstr("\"kind\":\"tap\",\"region\":1"));
}

TEST_F(RunCommandTest, MissingPluginIsNamed) {
    setenv(kVariable, folder.path("none.so").c_str(), 1);
    EXPECT_EQ(run({"--device", asFastAsTaken("taps")}),
              (CommandResult{1, "",
                             "vexatouch run: there is no plug-in at " + folder.path("none.so") +
                                 ", which VEXATOUCH_PLUGIN names\n"}));
}

TEST_F(RunCommandTest, WhatIsNoPluginIsRefused) {
    const std::string file = folder.file("text.so", "no library");
    setenv(kVariable, file.c_str(), 1);
    const CommandResult result = run({"--device", asFastAsTaken("taps")});
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_EQ(result.out, "");
    EXPECT_THAT(result.error, StartsWith("vexatouch run: cannot load the plug-in " + file + ": "));
}

TEST_F(RunCommandTest, BrokenScriptAndMissingRecordingAreNamed) {
    const std::string script = folder.file("bad.gesture", "tap play\ntapp\n");
    const CommandResult bad = run({"--device", "sim:" + script});
    EXPECT_EQ(bad.exitCode, 1);
    EXPECT_EQ(bad.out, "");
    EXPECT_THAT(bad.error, StartsWith("vexatouch run: " + script));
    const CommandResult missing = run({"--device", "recording:" + folder.path("none.json")});
    EXPECT_EQ(missing.exitCode, 1);
    EXPECT_THAT(missing.error, StartsWith("vexatouch run: " + folder.path("none.json")));
}

TEST_F(RunCommandTest, RecordingThatCannotBeWrittenIsToldBeforeTheRun) {
    const std::string nowhere = folder.path("none/recorded.json");
    EXPECT_EQ(
        run({"--record", nowhere}),
        (CommandResult{
            1, "", "vexatouch run: " + nowhere + ": cannot write: No such file or directory\n"}));
    EXPECT_THAT(folder.names(), IsEmpty());
}

TEST_F(RunCommandTest, WrongCommandLinesAreUsageErrors) {
    const std::vector<std::pair<std::vector<std::string>, std::string>> cases = {
        {{"--count", "0"}, "--count: expected a number from 1 to 18446744073709551615, found"},
        {{"--duration", "5 apples"}, "--duration: expected a time such as 10, 10s, 500ms or 2min"},
        {{"--rate", "0"}, "--rate: expected a number above 0, at most 1000000, found \"0\""},
        {{"--seed", "x"}, "--seed: expected a number from 0 to"},
        {{"--json", "--show"}, "--json and --show both want standard output"},
        {{"--record", "-"}, "--record -: standard output is for the events"},
        {{"--color", "red"}, "--color red: not auto"},
        {{"--set", "Nothing=1"}, "--set Nothing=1: nothing knows the key Nothing"},
        {{"--device", "mouse"}, "--device mouse"},
        {{"--device", asFastAsTaken("taps"), "--seed", "1"}, "--seed is for a simulated surface"},
    };
    for (const auto& [arguments, text] : cases) {
        const CommandResult result = run(arguments);
        EXPECT_EQ(result.exitCode, 2) << text;
        EXPECT_EQ(result.out, "") << text;
        EXPECT_THAT(result.error, StartsWith("vexatouch run: " + text));
    }
}

TEST_F(RunCommandTest, ServiceThatTakesNoReportsEndsTheRunInOrder) {
    setenv(kVariable, VEXATOUCH_SAMPLE_PLUGINS "/TakesNoReports.so", 1);
    for (const std::string& device : {asFastAsTaken("taps"), std::string("sim")}) {
        const CommandResult result =
            runCommand({"run", "--device", device}, {}, Vexa::HostClock::system(), kImpatience);
        EXPECT_EQ(result.exitCode, 1);
        EXPECT_EQ(result.out, "     host ms  latency us  event           region\n");
        EXPECT_THAT(result.error,
                    MatchesRegex("(simulated surface: random gestures, seed [0-9]+\n)?"
                                 "[0-9]+ reports? sent, [0-9]+ dropped, 0 events\n"
                                 "vexatouch run: the service takes no reports; its log says "
                                 "why\n"));
    }
}

TEST_F(RunCommandTest, UnpluggedDeviceEndsTheRunInOrder) {
    Tools::Streams quiet{.in = std::cin, .out = std::cout, .error = std::cerr};
    const auto frames = Tools::readRecording(example("taps"), quiet).frames;
    Tools::PlayedDevice* unplugged = nullptr;
    const auto device = std::make_shared<Tools::PlayedDevice>(
        [&](const Tools::PlayedDevice::FrameSink& sink) {
            // A setting has its turn when all reports before it have been handled.
            std::size_t left = frames.size() / 2;
            for (const auto& frame : frames) {
                sink(frame);
                if (--left == 0) {
                    Tools::PlayedDevice::Frame setting;
                    setting.type = Tools::PlayedDevice::Frame::Type::State;
                    setting.key = "Nothing";
                    setting.value = Vexa::PropertyValue::null();
                    sink(setting);
                    unplugged->unplug();
                }
            }
        },
        Tools::PlayedPace{.speed = std::numeric_limits<double>::infinity()},
        Tools::SurfaceIdentity{}, Vexa::HostClock::system());
    unplugged = device.get();
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Tools::Streams streams{.in = in, .out = out, .error = error};
    const Tools::WakeUp wake;
    Tools::SignalWatch signals(wake);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    const std::string recorded = folder.path("recorded.json");
    Tools::LiveRun live(library, device, {.json = true, .recordFile = recorded}, signals, wake,
                        streams);
    try {
        live.run();
        ADD_FAILURE() << "the run does not say that the device is gone";
    } catch (const Tools::Failure& failure) {
        EXPECT_STREQ(failure.what(), "the device was unplugged");
    }
    // What was handled until then was delivered and recorded.
    EXPECT_THAT(eventsIn(out.str()), Not(IsEmpty()));
    EXPECT_EQ(eventsIn(out.str()), replayed({recorded}));
    EXPECT_THAT(error.str(), HasSubstr(" sent, 0 dropped, "));
}

/// A thousand images a second, forever.
std::vector<std::string> endlessRun(const TemporaryFolder& folder) {
    const std::string script = folder.file("taps.gesture", "rate 1000\ntap play 60ms\nidle 20ms\n");
    return {"run", "--json", "--endless", "--device", "sim:" + script};
}

bool endedInOrder(int status) {
    return WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

TEST_F(RunCommandTest, SignalsEndItInOrder) {
    for (const int signal : {SIGINT, SIGTERM, SIGHUP}) {
        const std::string recorded = folder.path("recorded" + std::to_string(signal) + ".json");
        std::vector<std::string> arguments = endlessRun(folder);
        arguments.insert(arguments.end(), {"--record", recorded});
        ProgramRun program(arguments);
        ASSERT_TRUE(program.readOutUntil("\"tap\"")) << program.error();
        program.signal(signal);
        EXPECT_TRUE(endedInOrder(program.end())) << program.error();
        EXPECT_THAT(program.error(), HasSubstr("recording written to " + recorded));
        EXPECT_THAT(program.error(), HasSubstr("us at most\n"));
        EXPECT_THAT(program.out(), EndsWith("}\n"));
        EXPECT_THAT(replayed({recorded}), Not(IsEmpty()));
    }
}

TEST_F(RunCommandTest, InterruptThatWasIgnoredBeforeStaysIgnored) {
    ProgramRun program(endlessRun(folder), SIG_IGN);
    ASSERT_TRUE(program.readOutUntil("\"tap\"")) << program.error();
    program.signal(SIGINT);
    for (int taps = 0; taps < 3; ++taps) {
        EXPECT_TRUE(program.readOutUntil("\"tap\"")) << program.error();
    }
    // The first that asks for an end.
    program.signal(SIGTERM);
    EXPECT_TRUE(endedInOrder(program.end())) << program.error();
}

TEST_F(RunCommandTest, SecondSignalEndsItAtOnceEvenWhenStuck) {
    ProgramRun program({"run", "--json", "--device", asFastAsTaken("mixed")});
    program.waitUntilStuck();
    program.signal(SIGINT);
    program.signal(SIGTERM);
    const int status = program.wait();
    EXPECT_TRUE(WIFSIGNALED(status)) << status;
}

TEST_F(RunCommandTest, UserSignalWritesTheRecordingAndTheRunGoesOn) {
    const std::string recorded = folder.path("recorded.json");
    std::vector<std::string> arguments = endlessRun(folder);
    arguments.insert(arguments.end(), {"--record", recorded});
    ProgramRun program(arguments);
    std::size_t before = 0;
    for (int i = 0; i < 3; ++i) {
        ASSERT_TRUE(program.readOutUntil("\"tap\"")) << program.error();
        program.signal(SIGUSR1);
        ASSERT_TRUE(program.readErrorUntil("recording written to " + recorded + "\n"));
        const std::size_t events = replayed({recorded}).size();
        EXPECT_GT(events, before);
        before = events;
        EXPECT_THAT(folder.names(), SizeIs(2));  // the script, and nothing half written
    }
    ASSERT_TRUE(program.readOutUntil("\"tap\""));
    program.signal(SIGTERM);
    EXPECT_TRUE(endedInOrder(program.end()));
}

TEST_F(RunCommandTest, UserSignalWithoutAFileOnlySaysSo) {
    ProgramRun program(endlessRun(folder));
    ASSERT_TRUE(program.readOutUntil("\"tap\"")) << program.error();
    program.signal(SIGUSR1);
    EXPECT_TRUE(program.readErrorUntil("SIGUSR1 writes a recording only with --record\n"));
    program.signal(SIGTERM);
    EXPECT_TRUE(endedInOrder(program.end()));
}

TEST_F(RunCommandTest, NobodyReadingTheEventsEndsItInOrder) {
    const std::string recorded = folder.path("recorded.json");
    std::vector<std::string> arguments = endlessRun(folder);
    arguments.insert(arguments.end(), {"--record", recorded});
    ProgramRun program(arguments);
    ASSERT_TRUE(program.readOutUntil("\"tap\"")) << program.error();
    program.closeOut();
    const int status = program.end();
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1) << status;
    EXPECT_THAT(program.error(),
                HasSubstr("vexatouch run: cannot write the results: Broken pipe\n"));
    EXPECT_THAT(replayed({recorded}), Not(IsEmpty()));
}

TEST_F(RunCommandTest, PluginBesideTheProgramIsFoundWithoutBeingNamed) {
    unsetenv(kVariable);
    ProgramRun program({"run", "--json", "--device", asFastAsTaken("taps")});
    EXPECT_TRUE(endedInOrder(program.end())) << program.error();
    EXPECT_EQ(eventsIn(program.out()), replayed({example("taps")}));
}

TEST_F(RunCommandTest, ShowDrawsTheSurfaceAndTheEventsUntilQ) {
    const std::string script = folder.file("hold.gesture", "hold play 900ms\n");
    ProgramOnTerminal program({"run", "--show", "--endless", "--device", "sim:" + script});
    ASSERT_TRUE(program.readUntil("region")) << program.output();
    ASSERT_TRUE(program.readUntil("hold-start")) << program.output();
    program.type("q");
    const int status = program.end();
    EXPECT_TRUE(endedInOrder(status)) << status;
    EXPECT_TRUE(program.keyboardIsAsBefore());
    EXPECT_LT(program.output().rfind("\x1B[?25l"), program.output().rfind("\x1B[?25h"));
    EXPECT_THAT(program.output(), HasSubstr("voice-assistant call"));
}

TEST_F(RunCommandTest, ShowIsTidiedByAnInterruptAndByTwo) {
    for (const int interrupts : {1, 2}) {
        ProgramOnTerminal program({"run", "--show", "--seed", "1"});
        ASSERT_TRUE(program.readUntil("region")) << program.output();
        program.type(std::string(static_cast<std::size_t>(interrupts), '\x03'));
        program.end();  // the second one may come too late to end it at once
        EXPECT_LT(program.output().rfind("\x1B[?25l"), program.output().rfind("\x1B[?25h"));
        EXPECT_TRUE(program.keyboardIsAsBefore());
    }
}

TEST_F(RunCommandTest, SecondSignalEndsShowOnATerminalThatTakesNothing) {
    ProgramOnTerminal program({"run", "--show", "--seed", "1"});
    ASSERT_TRUE(program.readUntil("region")) << program.output();
    program.stopOutput();
    // The end in order would write to the terminal.
    program.signal(SIGINT);
    program.signal(SIGTERM);
    const int status = program.wait();
    EXPECT_TRUE(WIFSIGNALED(status)) << status;
    EXPECT_TRUE(program.keyboardIsAsBefore());
}

TEST_F(RunCommandTest, ShowPrintsLinesWhereThereIsNoTerminal) {
    const CommandResult result = run({"--show", "--device", asFastAsTaken("swipe")});
    EXPECT_EQ(result.exitCode, 0);
    EXPECT_THAT(result.out, StartsWith("     host ms  latency us  event           region\n"));
    EXPECT_THAT(result.out, Not(HasSubstr("\x1B")));
}

}  // namespace
}  // namespace VexaTouch::Testing
