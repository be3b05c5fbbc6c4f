#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/ProgramOnTerminal.h"
#include "Tests/Tools/ProgramRun.h"
#include "Tests/Tools/VexatouchProgram.h"
#include "Tools/RecordingFile.h"

#include <gmock/gmock.h>

#include <sys/wait.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;
using ::testing::Not;
using ::testing::SizeIs;
using ::testing::StartsWith;

constexpr const char* kVariable = "VEXATOUCH_PLUGIN";

std::string asFastAsTaken(const std::string& name) {
    return "recording:" VEXA_SOURCE_DIR "/Examples/" + name + ".json@max";
}

bool endedInOrder(int status) {
    return WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

class RecordCommandTest : public ::testing::Test {
protected:
    RecordCommandTest() { setenv(kVariable, VEXATOUCH_PLUGIN_FILE, 1); }
    ~RecordCommandTest() override { unsetenv(kVariable); }

    static CommandResult record(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), "record");
        // Those of the daemon are tested with it.
        if (std::ranges::find(arguments, "--device") == arguments.end()) {
            arguments.insert(arguments.end(), {"--device", "sim"});
        }
        return runCommand(arguments);
    }
    /// A thousand images a second, forever.
    std::vector<std::string> endless(const std::string& path) const {
        const std::string script =
            folder.file("taps.gesture", "rate 1000\ntap play 60ms\nidle 20ms\n");
        return {"record", path, "--endless", "--device", "sim:" + script};
    }
    static FrameList framesIn(const std::string& path) {
        Tools::Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
        return Tools::readRecording(path, streams).frames;
    }
    /// Returns when so many bytes are in the file.
    static void waitForBytes(const std::string& path, std::uintmax_t bytes) {
        std::error_code error;
        for (std::uintmax_t size = 0; size < bytes; sched_yield()) {
            size = std::filesystem::file_size(path, error);
            size = error ? 0 : size;
        }
    }

    TemporaryFolder folder;
};

TEST_F(RecordCommandTest, SaysWhatTheFileHolds) {
    const std::string path = folder.path("session.json");
    const CommandResult result = record({path, "--device", asFastAsTaken("swipe")});
    EXPECT_EQ(result, (CommandResult{0, "",
                                     path + ": 37 reports and 27 settings, " +
                                         std::to_string(contentOf(path).size()) + " bytes\n"}));
    EXPECT_THAT(folder.names(), ElementsAre("session.json"));
}

TEST_F(RecordCommandTest, DashIsStandardOutput) {
    const CommandResult result = record({"-", "--device", asFastAsTaken("swipe")});
    EXPECT_EQ(result.exitCode, 0) << result;
    EXPECT_THAT(result.error, StartsWith("standard output: 37 reports and 27 settings, "));
    EXPECT_THAT(framesIn(folder.file("session.json", result.out)), SizeIs(64));
}

TEST_F(RecordCommandTest, RecordingThatIsThereIsKeptUnlessForced) {
    const std::string path = folder.file("session.json", "precious");
    const CommandResult kept = record({path, "--device", asFastAsTaken("swipe")});
    EXPECT_EQ(kept, (CommandResult{1, "",
                                   "vexatouch record: " + path +
                                       ": is there already and would be lost (--force replaces it, "
                                       "another name keeps it)\n"}));
    EXPECT_EQ(contentOf(path), "precious");
    EXPECT_EQ(record({path, "--force", "--device", asFastAsTaken("swipe")}).exitCode, 0);
    EXPECT_THAT(framesIn(path), SizeIs(64));
    // What fails before there is anything to record replaces nothing.
    const std::string before = contentOf(path);
    setenv(kVariable, folder.path("none.so").c_str(), 1);
    EXPECT_EQ(record({path, "--force"}).exitCode, 1);
    EXPECT_EQ(record({folder.path("new.json")}).exitCode, 1);
    EXPECT_EQ(contentOf(path), before);
    EXPECT_THAT(folder.names(), ElementsAre("session.json"));
}

TEST_F(RecordCommandTest, CountAndDurationEndIt) {
    const std::string path = folder.path("session.json");
    EXPECT_EQ(
        record({path, "--rate", "1000", "--count", "5", "--set", "EnableTapSuppression=false"})
            .exitCode,
        0);
    const FrameList frames = framesIn(path);
    // Every setting in force comes first; random gestures may bring further ones between the
    // reports.
    const auto isReport = [](const RecordedFrame& frame) {
        return frame.type == RecordedFrame::Type::InputReport;
    };
    EXPECT_EQ(std::ranges::count_if(frames, isReport), 5);
    EXPECT_EQ(std::ranges::distance(frames.begin(), std::ranges::find_if(frames, isReport)), 27);
    EXPECT_THAT(contentOf(path), HasSubstr("\"Key\": \"Algs.EnableTapSuppression\",\n"
                                           "      \"Value\": false"));
    EXPECT_EQ(record({folder.path("short.json"), "--duration", "30ms", "--sync", "1ms"}).exitCode,
              0);
    EXPECT_THAT(framesIn(folder.path("short.json")), Not(IsEmpty()));
}

TEST_F(RecordCommandTest, WrongCommandLinesAreUsageErrorsAndLeaveNoFile) {
    const std::string path = folder.path("session.json");
    const std::vector<std::pair<std::vector<std::string>, std::string>> cases = {
        {{"--count", "0"}, "--count: expected a number from 1 to"},
        {{"--sync", "soon"}, "--sync: expected a time such as"},
        {{"--duration", "5 apples"}, "--duration: expected a time such as"},
        {{"--set", "Nothing=1"}, "--set Nothing=1: nothing knows the key Nothing"},
        {{"--device", "mouse"}, "--device mouse"},
        {{"--device", asFastAsTaken("taps"), "--rate", "1"}, "--rate is for a simulated surface"},
    };
    for (auto [arguments, text] : cases) {
        arguments.insert(arguments.begin(), path);
        const CommandResult result = record(arguments);
        EXPECT_EQ(result.exitCode, 2) << text;
        EXPECT_THAT(result.error, StartsWith("vexatouch record: " + text));
    }
    EXPECT_EQ(record({}).exitCode, 2);
    EXPECT_THAT(folder.names(), IsEmpty());
}

TEST_F(RecordCommandTest, SignalsEndItInOrder) {
    for (const int signal : {SIGINT, SIGTERM, SIGHUP}) {
        const std::string path = folder.path("session" + std::to_string(signal) + ".json");
        ProgramRun program(endless(path));
        waitForBytes(path, 50'000);
        program.signal(signal);
        EXPECT_TRUE(endedInOrder(program.end())) << program.error();
        EXPECT_THAT(program.error(),
                    MatchesRegex(".*: [0-9]+ reports and 27 settings, [0-9]+ bytes\n"));
        EXPECT_EQ(runCommand({"replay", path}).exitCode, 0);
    }
}

TEST_F(RecordCommandTest, UserSignalSaysHowMuchIsThereAndTheRecordingGoesOn) {
    const std::string path = folder.path("session.json");
    ProgramRun program(endless(path));
    waitForBytes(path, 50'000);
    program.signal(SIGUSR1);
    ASSERT_TRUE(program.readErrorUntil("\n")) << program.error();
    EXPECT_THAT(program.error(),
                MatchesRegex("vexatouch record: [0-9]+ frames are in .*/session.json; what is "
                             "written there is whole without SIGUSR1\n"));
    program.signal(SIGTERM);
    EXPECT_TRUE(endedInOrder(program.end())) << program.error();
}

// Whatever it was doing, a killed program leaves a file that is read as it is, or one of which
// every frame that was written is restored.
TEST_F(RecordCommandTest, KilledProgramLeavesEveryFrameThatWasWritten) {
    for (int round = 0; round < 10; ++round) {
        const std::string path = folder.path("session" + std::to_string(round) + ".json");
        ProgramRun program(endless(path));
        waitForBytes(path, 20'000 + 777 * static_cast<std::uintmax_t>(round));
        program.signal(SIGKILL);
        program.end();
        const std::string restored = folder.path("restored.json");
        const CommandResult result = runCommand({"convert", "--recover", path, "-o", restored});
        ASSERT_EQ(result.exitCode, 0) << result;
        const FrameList frames = framesIn(restored);
        // A frame has fewer than 350 bytes.
        EXPECT_GE(frames.size() + 1, contentOf(path).size() / 350);
        EXPECT_EQ(runCommand({"replay", restored}).exitCode, 0);
    }
}

TEST_F(RecordCommandTest, FileMayBeReadWhileItGrows) {
    const std::string path = folder.path("session.json");
    ProgramRun program(endless(path));
    std::size_t before = 0;
    for (int round = 0; round < 20; ++round) {
        waitForBytes(path, static_cast<std::uintmax_t>(round) * 3000);
        // A reader that comes in the middle of a write sees half of it.
        const std::string copy = folder.file("copy.json", contentOf(path));
        const std::string restored = folder.path("restored.json");
        if (runCommand({"convert", "--recover", copy, "-o", restored}).exitCode == 0) {
            const std::size_t count = framesIn(restored).size();
            EXPECT_GE(count, before);
            before = count;
        }
    }
    EXPECT_GT(before, 27U);
    program.signal(SIGTERM);
    EXPECT_TRUE(endedInOrder(program.end()));
}

TEST_F(RecordCommandTest, FullDiskEndsItWithAWholeFile) {
    const std::string path = folder.path("session.json");
    const std::string errors = folder.path("errors");
    // No file may be longer than 20 blocks of 1024 bytes.
    const std::string line = "ulimit -f 20; exec '" + std::string(vexatouchProgram()) +
                             "' record '" + path + "' --device '" + asFastAsTaken("mixed") +
                             "' 2> '" + errors + "'";
    const int status = std::system(("bash -c \"" + line + "\"").c_str());
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1) << status;
    const FrameList frames = framesIn(path);
    EXPECT_THAT(contentOf(errors),
                EndsWith("vexatouch record: " + path + ": cannot write: File too large; " +
                         std::to_string(frames.size()) + " frames are safe in it\n"));
    EXPECT_GT(contentOf(path).size(), 20U * 1024 - 350);
    EXPECT_THAT(record({"/dev/full"}).error,
                HasSubstr("vexatouch record: /dev/full: cannot write: No space left on device; 0 "
                          "frames are written to it\n"));
}

TEST_F(RecordCommandTest, DiskWithoutRoomForAFrameLeavesTheOldRecording) {
    const std::string path = folder.file("session.json", "precious");
    const std::string errors = folder.path("errors");
    const std::string line = "(ulimit -f 0; exec '" + std::string(vexatouchProgram()) +
                             "' record '" + path + "' --force --device '" + asFastAsTaken("mixed") +
                             "') 2>&1 | cat > '" + errors + "'";
    ASSERT_NE(std::system(("bash -c \"" + line + "\"").c_str()), -1);
    EXPECT_EQ(contentOf(errors), "vexatouch record: " + path +
                                     ": cannot write: File too large; no report was recorded, " +
                                     path + " is as it was\n");
    EXPECT_EQ(contentOf(path), "precious");
    EXPECT_THAT(folder.names(), ElementsAre("errors", "session.json"));
}

TEST_F(RecordCommandTest, ServiceThatTakesNoReportsLeavesTheOldRecording) {
    setenv(kVariable, VEXATOUCH_SAMPLE_PLUGINS "/TakesNoReports.so", 1);
    const std::string path = folder.file("session.json", "precious");
    EXPECT_EQ(runCommand({"record", path, "--force", "--device", asFastAsTaken("taps")}, {},
                         Vexa::HostClock::system(), std::chrono::milliseconds(10)),
              (CommandResult{1, "",
                             "vexatouch record: the service takes no reports; its log says why; no "
                             "report was recorded, " +
                                 path + " is as it was\n"}));
    EXPECT_EQ(contentOf(path), "precious");
    EXPECT_THAT(folder.names(), ElementsAre("session.json"));
}

TEST_F(RecordCommandTest, NobodyReadingThePipeEndsItInOrder) {
    ProgramRun program(endless("-"));
    ASSERT_TRUE(program.readOutUntil("InputReport"));
    program.closeOut();
    const int status = program.end();
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1) << status;
    EXPECT_THAT(program.error(),
                MatchesRegex("vexatouch record: standard output: cannot write: .*; [0-9]+ frames "
                             "are written to it\n"));
}

TEST_F(RecordCommandTest, TerminalShowsHowFarItIs) {
    const std::string path = folder.path("session.json");
    ProgramOnTerminal program(endless(path));
    ASSERT_TRUE(program.readUntil(" frames, 0.")) << program.output();
    ASSERT_TRUE(program.readUntil(" frames, ")) << program.output();
    program.type("\x03");
    EXPECT_TRUE(endedInOrder(program.end()));
    EXPECT_THAT(program.output(), HasSubstr("\r\x1B[K" + path + ": "));
}

}  // namespace
}  // namespace VexaTouch::Testing
