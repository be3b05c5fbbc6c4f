#include "Pipeline/PipelineRecording.h"
#include "Platform/Json.h"
#include "Tests/Support/FakeHostClock.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/DeviceReader.h"
#include "Tests/Tools/RecordedSession.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <limits>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::StartsWith;

class GetCommandTest : public ::testing::Test {
protected:
    GetCommandTest() { setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1); }
    ~GetCommandTest() override { unsetenv("VEXATOUCH_PLUGIN"); }

    static CommandResult get(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), "get");
        // Those of the daemon are tested with it.
        if (std::ranges::find(arguments, "--device") == arguments.end()) {
            arguments.insert(arguments.end(), {"--device", "sim"});
        }
        return runCommand(arguments);
    }
    [[nodiscard]] std::string sessionAtOnce() const {
        return "recording:" + folder.file("session.json", mixedSession().text()) + "@max";
    }

    TemporaryFolder folder;
};

/// A pipeline that the mixed session went through.
PipelineRecording played() {
    FakeHostClock clock;
    PipelineRecording recording(mixedSession().frames(), clock);
    recording.playReset();
    while (recording.playCanContinue()) {
        recording.playNextFrame(std::numeric_limits<float>::infinity());
    }
    return recording;
}

TEST_F(GetCommandTest, ASingleValueStandsAlone) {
    EXPECT_EQ(get({"Version"}), (CommandResult{0, "[13,0,0]\n", ""}));
    EXPECT_EQ(get({"FactoryResetHoldDuration"}), (CommandResult{0, "10000\n", ""}));
    EXPECT_EQ(get({"Pipeline.Algs.ActivationThreshold"}), (CommandResult{0, "200.0\n", ""}));
    EXPECT_EQ(get({"Product"}), (CommandResult{0, "Vexa Touch Surface\n", ""}));
}

TEST_F(GetCommandTest, ServiceThatTakesNoReportsIsNotWaitedForForever) {
    setenv("VEXATOUCH_PLUGIN", VEXATOUCH_SAMPLE_PLUGINS "/TakesNoReports.so", 1);
    EXPECT_EQ(
        runCommand({"get", "Product", "--device", sessionAtOnce()}, {}, Vexa::HostClock::system(),
                   std::chrono::milliseconds(10)),
        (CommandResult{1, "", "vexatouch get: the service takes no reports; its log says why\n"}));
    // Without something to be played to its end there is nothing to wait for.
    EXPECT_EQ(get({"Product"}), (CommandResult{0, "Vexa Touch Surface\n", ""}));
}

TEST_F(GetCommandTest, SeveralKeysHaveALineEach) {
    EXPECT_EQ(get({"Version", "Product", "FirmwareVersion", "--device", "sim", "CriticalErrors"}),
              (CommandResult{0,
                             "Version: [13,0,0]\n"
                             "Product: \"Vexa Touch Surface\"\n"
                             "FirmwareVersion: [1,0]\n"
                             "CriticalErrors: 0\n",
                             ""}));
}

TEST_F(GetCommandTest, AsJsonEachKeyIsAMember) {
    EXPECT_EQ(get({"--json", "Version"}),
              (CommandResult{0, "{\n  \"Version\": [\n    13,\n    0,\n    0\n  ]\n}\n", ""}));
    const CommandResult result =
        get({"Product", "--json", "Pipeline.Algs.HoldTimeoutMilliseconds"});
    EXPECT_EQ(Vexa::readJson(result.out), Vexa::PropertyValue(Vexa::PropertyValue::Dictionary{
                                              {"Product", "Vexa Touch Surface"},
                                              {"Pipeline.Algs.HoldTimeoutMilliseconds", 500U}}));
}

TEST_F(GetCommandTest, AKeyThatIsAskedForTwiceIsAnsweredOnce) {
    const CommandResult result =
        get({"--json", "EventStats", "Pipeline.Algs.EventStats", "EventStats"});
    const Vexa::PropertyValue object = Vexa::readJson(result.out);
    ASSERT_TRUE(object.asDictionary()) << result;
    EXPECT_EQ(result.out.find("Pipeline.Algs.EventStats"),
              result.out.rfind("Pipeline.Algs.EventStats"));
}

TEST_F(GetCommandTest, ASeedIsForASimulatedSurface) {
    EXPECT_EQ(get({"Version", "--seed", "1", "--device", sessionAtOnce()}),
              (CommandResult{2, "",
                             "vexatouch get: --seed is for a simulated surface\nTry 'vexatouch get "
                             "--help'.\n"}));
}

TEST_F(GetCommandTest, AllIsWhatTheServiceTellsForDiagnosis) {
    const CommandResult result = get({"--all", "--json", "--device", sessionAtOnce()});
    EXPECT_EQ(result.exitCode, 0) << result;
    const Vexa::PropertyValue all = Vexa::readJson(result.out);
    ASSERT_TRUE(all.asDictionary());
    std::vector<std::string> keys;
    for (const auto& [key, value] : *all.asDictionary()) keys.emplace_back(key);
    EXPECT_THAT(keys, ElementsAre("CriticalErrors", "DisjointImageCount", "FirmwareVersion",
                                  "Pipeline.Algs.DebugInfo", "Recording", "Version"));
    EXPECT_EQ(all.member("Pipeline.Algs.DebugInfo"), played().getState("Algs.DebugInfo"));
    EXPECT_TRUE(all.member("Recording").asString());

    const std::vector<std::string> lines = linesOf(get({"--all"}).out);
    ASSERT_EQ(lines.size(), 6U);
    EXPECT_THAT(lines[3], StartsWith("Pipeline.Algs.DebugInfo: {"));
}

TEST_F(GetCommandTest, ARecordingIsPlayedBeforeItIsAsked) {
    const CommandResult result = get({"Pipeline.Algs.EventStats", "--device", sessionAtOnce()});
    EXPECT_EQ(Vexa::readJson(result.out), played().getState("Algs.EventStats")) << result;
    EXPECT_EQ(get({"Pipeline.Algs.HoldTimeoutMilliseconds", "--device", sessionAtOnce()}),
              (CommandResult{0, "300\n", ""}));
}

TEST_F(GetCommandTest, TheRecordingComesOutAsTheDocumentThatItIs) {
    const CommandResult result = get({"Recording", "--device", sessionAtOnce()});
    EXPECT_EQ(result.exitCode, 0) << result.error;
    const PipelineRecording recording((std::optional<std::string_view>(result.out)));
    EXPECT_EQ(untimed(recording.frames()), untimed(mixedSession().frames()));
}

TEST_F(GetCommandTest, AScriptIsPlayedToItsEnd) {
    const std::string script = folder.file("a.gesture", "rate 1000\nidle 30ms\n");
    const CommandResult result = get({"Recording", "--device", "sim:" + script});
    const PipelineRecording recording((std::optional<std::string_view>(result.out)));
    EXPECT_EQ(recording.frames().size(), 30U);
}

TEST_F(GetCommandTest, AKeyWithoutAValueIsAFailure) {
    EXPECT_EQ(
        get({"Colour"}),
        (CommandResult{1, "",
                       "vexatouch get: Colour: there is no such property, or it has no value\n"}));
    EXPECT_EQ(get({"Version", "Pipeline.DebugInfo"}).exitCode, 1);
    EXPECT_EQ(get({"Pipeline.Algs.ResetEventStats"}).exitCode, 1);
    EXPECT_EQ(get({""}).exitCode, 1);
}

TEST_F(GetCommandTest, TheCommandLineNamesEitherKeysOrAll) {
    EXPECT_THAT(get({}).error, HasSubstr("expected either a KEY or --all"));
    EXPECT_EQ(get({}).exitCode, 2);
    EXPECT_EQ(get({"--all", "Version"}).exitCode, 2);
    EXPECT_EQ(get({"Version", "--device", "mouse"}).exitCode, 2);
    EXPECT_EQ(get({"Version", "--seed", "x"}).exitCode, 2);
}

TEST_F(GetCommandTest, WhatCannotBeUsedIsAFailure) {
    EXPECT_EQ(get({"Version", "--device", "recording:" + folder.path("none.json")}).exitCode, 1);
    setenv("VEXATOUCH_PLUGIN", folder.path("none.so").c_str(), 1);
    const CommandResult result = get({"Version"});
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_THAT(result.error, HasSubstr(folder.path("none.so")));
}

TEST_F(GetCommandTest, NothingIsLeftBehind) {
    EXPECT_EQ(get({"Version"}).exitCode, 0);
    const auto threads = threadCount();
    const auto descriptors = descriptorCount();
    for (int i = 0; i < 20; ++i) EXPECT_EQ(get({"--all"}).exitCode, 0);
    EXPECT_TRUE(waitForThreads(threads));
    EXPECT_EQ(descriptorCount(), descriptors);
}

}  // namespace
}  // namespace VexaTouch::Testing
