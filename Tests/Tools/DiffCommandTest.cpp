#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/RecordedSession.h"

#include <gmock/gmock.h>

namespace VexaTouch::Testing {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StartsWith;

class DiffCommandTest : public ::testing::Test {
protected:
    TemporaryFolder folder;
    std::string session = folder.file("session.json", mixedSession().text());

    static CommandResult diff(std::vector<std::string> arguments, const std::string& input = {}) {
        arguments.insert(arguments.begin(), "diff");
        return runCommand(arguments, input);
    }
};

TEST_F(DiffCommandTest, TheSameRecordingIsTheSame) {
    EXPECT_EQ(diff({session, session}), (CommandResult{0, "", "0 of 125 frames differ\n"}));
    EXPECT_EQ(diff({session, session, "--json"}),
              (CommandResult{0,
                             R"({"frames_a":125,"frames_b":125,"frames_different":0,)"
                             R"("first":null,"counts":{}})"
                             "\n",
                             "0 of 125 frames differ\n"}));
}

TEST_F(DiffCommandTest, AnotherSettingShowsTheFirstFrameAndACountPerField) {
    const std::string expected =
        "First difference at frame index 58:\n"
        "  hand._isHolding              false | true\n"
        "  hand._wouldBeIsHolding       false | true\n"
        "  lastDispatchedPhase          128 | 1\n"
        "  stats.numBeginHold           0 | 1\n"
        "  stats.numQuarnCall           0 | 1\n"
        "  events                       [] | "
        R"([{"index":58,"time_ns":5580000000,"device_ms":10580,"frame":59,"kind":"hold-start",)"
        R"("region":1,"phase":1,"mask":2}])"
        "\n"
        "Frames that differ, by field:\n"
        "  hand._isHolding              20\n"
        "  hand._wasHolding             20\n"
        "  hand._wouldBeIsHolding       20\n"
        "  hand._wouldBeWasHolding      20\n"
        "  hand._previousActiveRegion   20\n"
        "  lastDispatchedPhase          20\n"
        "  stats.numBeginHold           20\n"
        "  stats.numIncrementHold       66\n"
        "  stats.numQuarnCall           20\n"
        "  stats.numQuarnCallIncrement  66\n"
        "  events                       2\n";
    EXPECT_EQ(diff({session, "--set-b", "HoldTimeoutMilliseconds=300"}),
              (CommandResult{1, expected, "67 of 125 frames differ\n"}));
    EXPECT_EQ(diff({session, "--set-a", "HoldTimeoutMilliseconds=500", "--set-b",
                    "Pipeline.Algs.HoldTimeoutMilliseconds=300"})
                  .out,
              expected);
}

TEST_F(DiffCommandTest, JsonHoldsTheSame) {
    EXPECT_EQ(
        diff({session, "--json", "--set-a", "HoldTimeoutMilliseconds=300"}),
        (CommandResult{
            1,
            R"({"frames_a":125,"frames_b":125,"frames_different":67,"first":{"index":58,)"
            R"("fields":{"hand._isHolding":[true,false],"hand._wouldBeIsHolding":[true,false],)"
            R"("lastDispatchedPhase":[1,128],"stats.numBeginHold":[1,0],)"
            R"("stats.numQuarnCall":[1,0],"events":[[{"device_ms":10580,"frame":59,"index":58,)"
            R"("kind":"hold-start","mask":2,"phase":1,"region":1,"time_ns":5580000000}],[]]}},)"
            R"("counts":{"hand._isHolding":20,"hand._wasHolding":20,"hand._wouldBeIsHolding":20,)"
            R"("hand._wouldBeWasHolding":20,"hand._previousActiveRegion":20,)"
            R"("lastDispatchedPhase":20,"stats.numBeginHold":20,"stats.numIncrementHold":66,)"
            R"("stats.numQuarnCall":20,"stats.numQuarnCallIncrement":66,"events":2}})"
            "\n",
            "67 of 125 frames differ\n"}));
}

TEST_F(DiffCommandTest, ASettingThatTheRecordingSetsItselfHoldsWhenItIsPinned) {
    RecordedSession recorded;
    recorded.set("Algs.HoldTimeoutMilliseconds", 500)
        .feel(nothing().forMs(20))
        .feel(touch("A").at(350).with("B", 150).forMs(900))
        .feel(nothing().forMs(500));
    const std::string file = folder.file("set.json", recorded.text());
    EXPECT_EQ(
        diff({file, "--set-b", "HoldTimeoutMilliseconds=300"}).error,
        "0 of 143 frames differ\nvexatouch diff: --set-b Algs.HoldTimeoutMilliseconds held "
        "until frame 0 only, in which the recording sets it; with --pin it holds to the end\n");
    const CommandResult pinned = diff({file, "--pin", "--set-b", "HoldTimeoutMilliseconds=300"});
    EXPECT_EQ(pinned.exitCode, 1);
    EXPECT_THAT(pinned.out, HasSubstr("hold-start"));
    EXPECT_THAT(pinned.error, Not(HasSubstr("held until")));
}

TEST_F(DiffCommandTest, ManyFieldsOfTheFirstFrameAreCutShort) {
    RecordedSession recorded;
    recorded.feel(touch("AB").at(100));
    const std::string file = folder.file("one.json", recorded.text());
    const CommandResult result = diff({file, "--set-b", "ActivationThreshold=150"});
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_THAT(result.out, StartsWith("First difference at frame index 0:\n"
                                       "  pixels[A]._progress"));
    EXPECT_THAT(result.out, HasSubstr(" more fields of that frame\nFrames that differ, by field:"));
}

TEST_F(DiffCommandTest, TwoRecordingsAreComparedFrameByFrame) {
    auto frames = mixedSession().frames();
    std::next(frames.begin(), 2)->timestamp += 1;
    const std::string other = folder.file("other.json", containerText(frames));
    EXPECT_EQ(diff({session, other}), (CommandResult{1,
                                                     "First difference at frame index 2:\n"
                                                     "  time_ns  5020000000 | 5020000001\n"
                                                     "Frames that differ, by field:\n"
                                                     "  time_ns  1\n",
                                                     "1 of 125 frames differ\n"}));
}

TEST_F(DiffCommandTest, ARecordingThatEndsEarlierDiffers) {
    auto frames = mixedSession().frames();
    frames.pop_back();
    frames.pop_back();
    const std::string other = folder.file("other.json", containerText(frames));
    const CommandResult expected{1,
                                 "First difference at frame index 123:\n"
                                 "  presence  a frame | no frame\n"
                                 "Frames that differ, by field:\n"
                                 "  presence  2\n",
                                 "2 of 125 frames differ\n"};
    EXPECT_EQ(diff({session, other}), expected);
    EXPECT_EQ(diff({"--json", other, session}).out,
              R"({"frames_a":123,"frames_b":125,"frames_different":2,"first":{"index":123,)"
              R"("fields":{"presence":["no frame","a frame"]}},)"
              R"("counts":{"presence":2}})"
              "\n");
}

TEST_F(DiffCommandTest, OneSideMayComeFromStandardInput) {
    EXPECT_EQ(diff({session, "-"}, mixedSession().text()).exitCode, 0);
    EXPECT_EQ(diff({"-", "--set-b", "ResetEventStats=0"}, mixedSession().text()).exitCode, 0);
}

TEST_F(DiffCommandTest, NothingToCompareIsAUsageError) {
    EXPECT_EQ(diff({session}),
              (CommandResult{2, "",
                             "vexatouch diff: nothing to compare A with: give B, --set-a or "
                             "--set-b\nTry 'vexatouch diff --help'.\n"}));
    EXPECT_EQ(diff({"-", "-"}),
              (CommandResult{2, "",
                             "vexatouch diff: only one recording can come from standard input\n"
                             "Try 'vexatouch diff --help'.\n"}));
    EXPECT_THAT(diff({session, "--set-b", "X=1"}).error,
                StartsWith("vexatouch diff: --set-b X=1: nothing knows the key X\n"));
}

TEST_F(DiffCommandTest, ARecordingThatCannotBeReadIsAFailure) {
    const std::string nowhere = folder.path("nowhere.json");
    EXPECT_EQ(
        diff({session, nowhere}),
        (CommandResult{
            1, "", "vexatouch diff: " + nowhere + ": cannot open: No such file or directory\n"}));
    const std::string none = folder.file("none.json", R"({"Version": 1, "Frames": []})");
    EXPECT_EQ(diff({none, session}),
              (CommandResult{1, "", "vexatouch diff: " + none + ": holds no frame to replay\n"}));
}

}  // namespace
}  // namespace VexaTouch::Testing
