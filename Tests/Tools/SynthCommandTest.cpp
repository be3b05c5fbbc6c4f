#include "Pipeline/PipelineRecording.h"
#include "Tests/Tools/CommandRun.h"
#include "Tools/SurfaceSynthesizer.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;
using Tools::GestureScript;
using Tools::kMaximumScriptBytes;
using Tools::randomScript;
using Tools::synthesize;

std::string recordingOf(const std::string& script, std::optional<std::uint64_t> seed = {}) {
    return containerText(synthesize(GestureScript::parse(script), seed));
}

TEST(SynthCommandTest, WritesTheScriptsRecordingIntoAFile) {
    const TemporaryFolder folder;
    const std::string script = folder.file("a.gesture", "tap vol+\n");
    const std::string out = folder.path("a.json");
    EXPECT_EQ(runCommand({"synth", script, "-o", out}),
              (CommandResult{0, "", out + ": 22 frames\n"}));
    EXPECT_EQ(contentOf(out), recordingOf("tap vol+\n"));
    EXPECT_THAT(folder.names(), ElementsAre("a.gesture", "a.json"));
}

TEST(SynthCommandTest, ReadsStandardInputAndWritesStandardOutput) {
    const CommandResult result = runCommand({"synth", "-", "-o", "-"}, "rate 50\ntap play\n");
    EXPECT_EQ(result.exitCode, 0);
    EXPECT_EQ(result.out, recordingOf("rate 50\ntap play\n"));
    EXPECT_EQ(result.error, "standard output: 11 frames\n");
}

TEST(SynthCommandTest, ASeedOnTheCommandLineReplacesTheScripts) {
    const std::string script = "seed 5\ntap play\n";
    EXPECT_EQ(runCommand({"synth", "-", "-o", "-", "--seed", "9"}, script).out,
              recordingOf(script, 9));
    EXPECT_EQ(runCommand({"synth", "-", "-o", "-", "--seed", "5"}, script).out,
              runCommand({"synth", "-", "-o", "-"}, script).out);
}

TEST(SynthCommandTest, MakesUpASessionOrItsScript) {
    const std::string script = randomScript(7, 20'000);
    EXPECT_EQ(runCommand({"synth", "--random", "20", "--seed", "7", "--script", "-o", "-"}),
              (CommandResult{0, script, ""}));
    EXPECT_EQ(runCommand({"synth", "--random", "20", "--seed", "7", "-o", "-"}).out,
              recordingOf(script, 7));
}

TEST(SynthCommandTest, AFaultyScriptIsOneLineThatNamesItAndLeavesNoFile) {
    const TemporaryFolder folder;
    const std::string script = folder.file("a.gesture", "tap K\ntap Z9\n");
    const CommandResult result = runCommand({"synth", script, "-o", folder.path("a.json")});
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_THAT(result.error, HasSubstr(script + ": line 2: tap: expected a place"));
    EXPECT_THAT(linesOf(result.error).size(), 1U);
    EXPECT_THAT(folder.names(), ElementsAre("a.gesture"));
}

TEST(SynthCommandTest, AScriptThatMakesNoFramesIsAFailureAndLeavesTheFileAlone) {
    const TemporaryFolder folder;
    const std::string out = folder.file("a.json", "kept");
    const CommandResult result = runCommand({"synth", "-", "-o", out}, "# nothing\n");
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_THAT(result.error, HasSubstr("standard input: the script makes no frames"));
    EXPECT_EQ(contentOf(out), "kept");
    EXPECT_THAT(folder.names(), ElementsAre("a.json"));
}

TEST(SynthCommandTest, AHugeScriptIsRefusedWithoutReadingItAll) {
    const CommandResult result =
        runCommand({"synth", "-", "-o", "-"}, std::string(4 * kMaximumScriptBytes, '#'));
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_THAT(result.error, HasSubstr("larger than 1048576 bytes"));
}

TEST(SynthCommandTest, AScriptThatIsNotThereIsAFailure) {
    const CommandResult result = runCommand({"synth", "/nonexistent/a.gesture", "-o", "-"});
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_THAT(result.error, HasSubstr("/nonexistent/a.gesture"));
    EXPECT_THAT(result.error, HasSubstr("No such file or directory"));
    EXPECT_THAT(result.out, IsEmpty());
}

TEST(SynthCommandTest, WrongArgumentsAreUsageErrors) {
    const std::vector<std::vector<std::string>> wrong = {
        {"synth"},
        {"synth", "a.gesture"},
        {"synth", "-o", "-"},
        {"synth", "a.gesture", "--random", "5", "-o", "-"},
        {"synth", "a.gesture", "--script", "-o", "-"},
        {"synth", "--random", "0", "-o", "-"},
        {"synth", "--random", "18001", "-o", "-"},
        {"synth", "--random", "x", "-o", "-"},
        {"synth", "a.gesture", "--seed", "-1", "-o", "-"},
        {"synth", "a.gesture", "--seed", "18446744073709551616", "-o", "-"},
        {"synth", "a.gesture", "--seed", "1x", "-o", "-"},
    };
    for (const auto& arguments : wrong) {
        const CommandResult result = runCommand(arguments);
        EXPECT_EQ(result.exitCode, 2) << testing::PrintToString(arguments);
        EXPECT_THAT(result.out, IsEmpty());
        EXPECT_THAT(result.error, StartsWith("vexatouch synth: "));
    }
}

TEST(SynthCommandTest, HelpExplainsTheLanguage) {
    const CommandResult result = runCommand({"synth", "--help"});
    EXPECT_EQ(result.exitCode, 0);
    EXPECT_THAT(result.out, HasSubstr("\n  tap PLACE [DURATION] [STRENGTH]\n      A short touch"));
    EXPECT_THAT(result.error, IsEmpty());
}

}  // namespace
}  // namespace VexaTouch::Testing
