#include "Algorithm/StateFields.h"
#include "Platform/Json.h"
#include "Platform/Log.h"
#include "Tests/Support/FakeHostClock.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tests/Tools/VexatouchProgram.h"
#include "Tools/Replay.h"
#include "Tools/SettingKeys.h"

#include <gmock/gmock.h>

#include <array>
#include <bit>
#include <cmath>
#include <cstdint>
#include <regex>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::StartsWith;
using Vexa::Log;
using Vexa::LogCategory;
using Vexa::LogLevel;
using Vexa::PropertyValue;

constexpr const char* kMixedTable =
    "   index       host ms   device ms       frame  event           region\n"
    "       5        50.000       10050           6  may-begin       3 volume up or increment\n"
    "      17       170.000       10170          18  tap             3 volume up\n"
    "      27       270.000       10270          28  may-begin       1 play/pause or "
    "voice-assistant call\n"
    "      78       780.000       10780          79  hold-start      1 voice-assistant call\n"
    "      87       870.000       10870          88  hold-end        1 voice-assistant call\n"
    "      99       970.000       10970          98  may-begin       2 volume down or decrement\n"
    "     107      1050.000           0           0  cancel          0 none\n"
    "     107      1050.000           0           0  firmware-reset  0 none\n";

constexpr const char* kMixedJson =
    R"({"index":5,"time_ns":5050000000,"device_ms":10050,"frame":6,"kind":"may-begin","region":3,"phase":128,"mask":0}
{"index":17,"time_ns":5170000000,"device_ms":10170,"frame":18,"kind":"tap","region":3,"phase":0,"mask":131072}
{"index":27,"time_ns":5270000000,"device_ms":10270,"frame":28,"kind":"may-begin","region":1,"phase":128,"mask":0}
{"index":78,"time_ns":5780000000,"device_ms":10780,"frame":79,"kind":"hold-start","region":1,"phase":1,"mask":2}
{"index":87,"time_ns":5870000000,"device_ms":10870,"frame":88,"kind":"hold-end","region":1,"phase":4,"mask":2}
{"index":99,"time_ns":5970000000,"device_ms":10970,"frame":98,"kind":"may-begin","region":2,"phase":128,"mask":0}
{"index":107,"time_ns":6050000000,"device_ms":0,"frame":0,"kind":"cancel","region":0,"phase":8,"mask":0}
{"index":107,"time_ns":6050000000,"device_ms":0,"frame":0,"kind":"firmware-reset","region":0,"phase":0,"mask":0}
)";

std::string summary(const std::string& name, const std::string& counts) {
    return name + ": " + counts + "; read 0.0 MB in #, played in #, # in all, peak #\n";
}

constexpr const char* kMixedCounts = "125 frames, 8 events, 1 invalid report";

class ReplayCommandTest : public ::testing::Test {
protected:
    TemporaryFolder folder;
    std::string session = folder.file("session.json", mixedSession().text());

    CommandResult replay(std::vector<std::string> arguments, const std::string& input = {}) {
        arguments.insert(arguments.begin(), "replay");
        CommandResult result = runCommand(arguments, input);
        result.error = withoutTimes(result.error);
        return result;
    }

    void expectFailure(const std::string& path, const std::string& reason) {
        EXPECT_EQ(replay({path}), (CommandResult{1, "", "vexatouch replay: " + reason + "\n"}));
    }
};

TEST_F(ReplayCommandTest, EventsComeInAlignedColumns) {
    EXPECT_EQ(replay({session}), (CommandResult{0, kMixedTable, summary(session, kMixedCounts)}));
}

TEST_F(ReplayCommandTest, JsonGivesOneObjectALine) {
    EXPECT_EQ(replay({session, "--json"}),
              (CommandResult{0, kMixedJson, summary(session, kMixedCounts)}));
}

TEST_F(ReplayCommandTest, StandardInputIsARecordingToo) {
    EXPECT_EQ(replay({"-", "--json"}, mixedSession().text()),
              (CommandResult{0, kMixedJson, summary("standard input", kMixedCounts)}));
}

TEST_F(ReplayCommandTest, AFrameOlderThanTheFirstHasANegativeHostTime) {
    RecordedSession recorded;
    recorded.feel(nothing().forMs(20)).feel(touch("H").at(350)).feel(nothing().forMs(20));
    auto frames = recorded.frames();
    frames.front().timestamp += 1'000'000'000;
    const CommandResult result = replay({folder.file("back.json", containerText(frames))});
    EXPECT_THAT(result.out, HasSubstr("       2      -980.000       10020           3  may-begin"));
    EXPECT_EQ(result.exitCode, 0);
}

TEST_F(ReplayCommandTest, ASettingChangesWhatHappens) {
    for (const std::string key :
         {"HoldTimeoutMilliseconds", "Pipeline.Algs.HoldTimeoutMilliseconds"}) {
        const CommandResult result = replay({session, "--json", "--set", key + "=300"});
        EXPECT_THAT(linesOf(result.out)[3], StartsWith(R"({"index":58,"time_ns":5580000000,)"))
            << key;
        EXPECT_EQ(result.exitCode, 0) << key;
    }
}

TEST_F(ReplayCommandTest, OfTheSameSettingTheLastOneStands) {
    const CommandResult result = replay({session, "--json", "--set", "HoldTimeoutMilliseconds=300",
                                         "--set", "HoldTimeoutMilliseconds=500"});
    EXPECT_EQ(result.out, kMixedJson);
}

TEST_F(ReplayCommandTest, ASettingOfTheRecordingComesLater) {
    RecordedSession recorded;
    recorded.set("Algs.HoldTimeoutMilliseconds", 300)
        .feel(nothing().forMs(20))
        .feel(touch("A").at(350).with("B", 150).forMs(400))
        .feel(nothing().forMs(20));
    const CommandResult result =
        replay({folder.file("set.json", recorded.text()), "--set", "HoldTimeoutMilliseconds=2000"});
    EXPECT_THAT(result.out, HasSubstr("hold-start"));
    EXPECT_THAT(result.error, EndsWith("vexatouch replay: --set Algs.HoldTimeoutMilliseconds held "
                                       "until frame 0 only, in which the recording sets it; with "
                                       "--pin it holds to the end\n"));
    const CommandResult pinned =
        replay({folder.path("set.json"), "--set", "HoldTimeoutMilliseconds=2000", "--pin"});
    EXPECT_THAT(pinned.out, Not(HasSubstr("hold-start")));
    EXPECT_THAT(pinned.error, Not(HasSubstr("held until")));
}

TEST_F(ReplayCommandTest, SettingsThatCannotBeAreUsageErrorsWithTheListOfKeys) {
    const auto expectRefused = [&](const std::string& text, const std::string& reason) {
        EXPECT_EQ(
            replay({session, "--set", text}),
            (CommandResult{2, "",
                           "vexatouch replay: --set " + text + ": " + reason +
                               "\nKeys that can be set (with or without Pipeline.Algs. "
                               "before them):\n" +
                               Tools::settingKeysText() + "\nTry 'vexatouch replay --help'.\n"}));
    };
    expectRefused("Treshold=1", "nothing knows the key Treshold");
    expectRefused("EventStats=1", "the key EventStats is read-only");
    expectRefused("VirtualNormalizationFactors.23=1", "the index is not below 23");
    expectRefused("ActivationThreshold=abc", "the value is no JSON");
    expectRefused("ActivationThreshold", "KEY=VALUE is needed");
}

// What is opened next must not become the standard error.
TEST_F(ReplayCommandTest, ResultsAreWholeWhenTheStandardErrorIsClosed) {
    const std::string program = vexatouchProgram();
    const std::string both = " replay --log Algs=debug '" + session + "' --trace '";
    const std::string quiet = folder.path("quiet.jsonl");
    const std::string closed = folder.path("closed.jsonl");
    ASSERT_EQ(std::system((program + both + quiet + "' >/dev/null 2>/dev/null").c_str()), 0);
    ASSERT_EQ(std::system((program + both + closed + "' >/dev/null 2>&-").c_str()), 0);
    EXPECT_FALSE(contentOf(closed).empty());
    EXPECT_EQ(contentOf(closed), contentOf(quiet));
}

TEST_F(ReplayCommandTest, AClosedStandardOutputIsAFailure) {
    const std::string errors = folder.path("errors");
    const std::string program = vexatouchProgram();
    const int status =
        std::system((program + " replay '" + session + "' >&- 2>'" + errors + "'").c_str());
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 1) << status;
    EXPECT_THAT(contentOf(errors),
                HasSubstr("vexatouch replay: cannot write the results: Bad file descriptor\n"));
}

TEST_F(ReplayCommandTest, AWrongSettingIsFoundBeforeTheFileIsOpened) {
    EXPECT_EQ(replay({folder.path("nowhere.json"), "--set", "X=1"}).exitCode, 2);
}

TEST_F(ReplayCommandTest, SpeedIsMaxOrAFactorAboveZero) {
    for (const std::string speed : {"0", "-1", "nan", "inf", "fast", "", "1x", "1e99"}) {
        EXPECT_EQ(replay({session, "--speed", speed}),
                  (CommandResult{2, "",
                                 "vexatouch replay: --speed " + speed +
                                     ": neither max nor a factor above 0\n"
                                     "Try 'vexatouch replay --help'.\n"}));
    }
    EXPECT_EQ(replay({session, "--json", "--speed", "max"}).out, kMixedJson);
    EXPECT_EQ(replay({session, "--json", "--speed", "100000"}).out, kMixedJson);
}

TEST_F(ReplayCommandTest, PlayingAtASpeedWaitsBetweenReportsAndMaxNeverWaits) {
    RecordedSession recorded;
    recorded.feel(nothing().forMs(30)).set("Algs.ResetEventStats", 0);
    const std::string file = folder.file("short.json", recorded.text());
    FakeHostClock clock;
    EXPECT_EQ(runCommand({"replay", file, "--speed", "2"}, {}, clock).exitCode, 0);
    EXPECT_THAT(clock.sleeps, ElementsAre(5000, 5000));
    FakeHostClock untouched;
    EXPECT_EQ(runCommand({"replay", file}, {}, untouched).exitCode, 0);
    EXPECT_THAT(untouched.sleeps, IsEmpty());
}

TEST_F(ReplayCommandTest, ExpectedEventsThatComePrintNothing) {
    const std::string events =
        folder.file("events.jsonl", "# a comment\n\n" + std::string(kMixedJson));
    EXPECT_EQ(replay({session, "--expect", events}),
              (CommandResult{0, "", summary(session, kMixedCounts)}));
}

TEST_F(ReplayCommandTest, EventsThatDifferStandSideBySide) {
    std::vector<std::string> lines = linesOf(kMixedJson);
    lines.erase(lines.begin() + 1);  // the tap was not expected
    lines[2] = std::regex_replace(lines[2], std::regex("10780"), "10790");
    lines.emplace_back(
        R"({"index":120,"time_ns":6180000000,"device_ms":10180,"frame":110,"kind":"tap","region":1,"phase":0,"mask":131072})");
    std::string text;
    for (const std::string& line : lines) {
        text += line + "\n";
    }
    const std::string events = folder.file("events.jsonl", text);
    const std::string heading =
        "   index        time_ns  device_ms      frame kind           region phase   mask";
    const std::string nothing(heading.size(), ' ');
    const std::string begin1 =
        "       5     5050000000      10050          6 may-begin           3   128      0";
    const std::string tap =
        "      17     5170000000      10170         18 tap                 3     0 131072";
    const std::string begin2 =
        "      27     5270000000      10270         28 may-begin           1   128      0";
    const std::string wrong =
        "      78     5780000000      10790         79 hold-start          1     1      2";
    const std::string right =
        "      78     5780000000      10780         79 hold-start          1     1      2";
    const std::string end =
        "      87     5870000000      10870         88 hold-end            1     4      2";
    const std::string begin3 =
        "      99     5970000000      10970         98 may-begin           2   128      0";
    const std::string cancel =
        "     107     6050000000          0          0 cancel              0     8      0";
    const std::string reset =
        "     107     6050000000          0          0 firmware-reset      0     0      0";
    const std::string missing =
        "     120     6180000000      10180        110 tap                 1     0 131072";
    std::string expected = "expected" + std::string(heading.size() - 8, ' ') + "   replayed\n";
    expected += heading + "   " + heading + "\n";
    expected += begin1 + "   " + begin1 + "\n";
    expected += nothing + " > " + tap + "\n";
    expected += begin2 + "   " + begin2 + "\n";
    expected += wrong + " | " + right + "\n";
    for (const std::string& same : {end, begin3, cancel, reset}) {
        expected += same + "   " + same + "\n";
    }
    expected += missing + " <\n";
    EXPECT_EQ(replay({session, "--expect", events}),
              (CommandResult{1, expected,
                             summary(session, kMixedCounts) + "vexatouch replay: " + events +
                                 ": 3 differences to the events expected\n"}));
}

TEST_F(ReplayCommandTest, ExpectedEventsThatCannotBeReadAreAFailure) {
    const auto expectRefused = [&](const std::string& events, const std::string& reason) {
        EXPECT_EQ(replay({session, "--expect", events}),
                  (CommandResult{1, "", "vexatouch replay: " + events + ": " + reason + "\n"}));
    };
    expectRefused(folder.path("nowhere"), "cannot open: No such file or directory");
    expectRefused(folder.path(""), "is a folder, not a file of events");
    expectRefused(folder.file("broken", std::string(kMixedJson) + "{\n"),
                  "line 9: not an event: no JSON object");
}

TEST_F(ReplayCommandTest, FilesThatAreNoRecordingAreNamedWithWhatIsWrong) {
    const std::string nowhere = folder.path("nowhere.json");
    expectFailure(nowhere, nowhere + ": cannot open: No such file or directory");
    const std::string itself = folder.path("");
    expectFailure(itself, itself + ": is a folder, not a recording");
    const std::string empty = folder.file("empty.json", "");
    expectFailure(empty,
                  empty + ": is empty: migrateSerializedContainer failed: invalid container");
    const std::string prose = folder.file("prose.json", "dear diary");
    expectFailure(prose, prose +
                             ": no JSON at byte 0: migrateSerializedContainer failed: invalid "
                             "container (syntax error)");
    const std::string text = mixedSession().text();
    const std::string cut = folder.file("cut.json", text.substr(0, 5000));
    expectFailure(cut, cut +
                           ": cut off after 5000 bytes: migrateSerializedContainer failed: "
                           "invalid container (incomplete JSON)");
    const std::string noVersion = folder.file("version.json", "{}");
    expectFailure(noVersion, noVersion + ": migrateSerializedContainer failed: invalid version");
    const std::string future = folder.file("future.json", R"({"Version": 2})");
    expectFailure(future,
                  future + ": migrateSerializedContainer failed: invalid container version: 2");
    const std::string noFrames = folder.file("noframes.json", R"({"Version": 1})");
    expectFailure(noFrames, noFrames + ": invalid frames");
    const std::string badFrame = folder.file(
        "badframe.json",
        R"({"Version": 1, "Frames": [{"Type": "InputReport", "Timestamp": 1, "Report": "01"},
            {"Type": "InputReport", "Timestamp": 2, "Report": "fff"}]})");
    expectFailure(badFrame, badFrame + ": frame 1: invalid hex string");
}

TEST_F(ReplayCommandTest, ARecordingWithoutFramesIsAFailure) {
    const std::string none = folder.file("none.json", R"({"Version": 1, "Frames": []})");
    expectFailure(none, none + ": holds no frame to replay");
}

/// What goes past the command's streams to the process's standard error, with the command's result.
template <typename Call>
std::string loggedDuring(const Call& call) {
    testing::internal::CaptureStderr();
    call();
    return testing::internal::GetCapturedStderr();
}

TEST_F(ReplayCommandTest, LogMessagesGoToStandardErrorAndStopAfterwards) {
    CommandResult result;
    EXPECT_THAT(loggedDuring([&] {
                    result = replay({session, "--log", "Algs=debug", "--log", "Pipeline=off"});
                }),
                HasSubstr(" Algs debug: Frame 6 @10050ms, *** Event Stats ***\n"));
    EXPECT_EQ(result.out, kMixedTable);
    EXPECT_EQ(result.error, summary(session, kMixedCounts));
    EXPECT_EQ(loggedDuring([&] { result = replay({session}); }), "");
}

TEST_F(ReplayCommandTest, LogLevelsWinOverThoseOfTheEnvironmentWhileTheCommandRuns) {
    const std::array categories = {LogCategory::HIDService, LogCategory::Pipeline,
                                   LogCategory::Recording, LogCategory::Algs};
    for (const LogCategory category : categories) {
        Log::setLevel(category, LogLevel::Debug);
    }
    EXPECT_THAT(loggedDuring([&] { replay({session}); }), HasSubstr(" Algs debug: "));
    EXPECT_EQ(loggedDuring([&] { replay({session, "--log", "Algs=info"}); }), "");
    EXPECT_EQ(loggedDuring([&] { replay({session, "--log", "off"}); }), "");
    EXPECT_THAT(loggedDuring([&] { replay({session, "--log", "off", "--log", "Algs=debug"}); }),
                HasSubstr(" Algs debug: "));
    EXPECT_EQ(loggedDuring([&] { replay({session, "--log", "Algs=debug", "--log", "OFF"}); }), "");
    for (const LogCategory category : categories) {
        EXPECT_EQ(Log::level(category), LogLevel::Debug);
        Log::setLevel(category, LogLevel::Error);
    }
}

TEST_F(ReplayCommandTest, LogLevelsThatDoNotExistAreUsageErrors) {
    for (const std::string text : {"Algs", "Algs=loud", "Fingers=debug", "=", "=debug", ""}) {
        EXPECT_EQ(replay({session, "--log", text}),
                  (CommandResult{2, "",
                                 "vexatouch replay: --log " + text +
                                     ": LEVEL or CATEGORY=LEVEL is needed; CATEGORY is one of "
                                     "HIDService Pipeline Recording Algs, LEVEL one of debug info "
                                     "error off\n"
                                     "Try 'vexatouch replay --help'.\n"}));
    }
}

// --trace

/// The lines of a trace as values.
std::vector<PropertyValue> traceOf(const std::string& text) {
    std::vector<PropertyValue> all;
    for (const std::string& line : linesOf(text)) {
        all.push_back(Vexa::readJson(line));
    }
    return all;
}

std::vector<std::string> memberNames(const PropertyValue& object) {
    std::vector<std::string> names;
    for (const auto [name, value] : *object.asDictionary()) {
        names.emplace_back(name);
    }
    return names;
}

PropertyValue element(const PropertyValue& array, std::size_t index) {
    return array.asArray()->at(index);
}

TEST_F(ReplayCommandTest, TraceHasALineForEveryFrameOfWhateverType) {
    const std::string trace = folder.path("trace.jsonl");
    EXPECT_EQ(replay({session, "--trace", trace}),
              (CommandResult{0, kMixedTable, summary(session, kMixedCounts)}));
    const std::vector<PropertyValue> lines = traceOf(contentOf(trace));
    ASSERT_EQ(lines.size(), 125U);
    std::size_t index = 0;
    auto frame = mixedSession().frames();
    for (const PropertyValue& line : lines) {
        EXPECT_EQ(line.member("index"), PropertyValue(index));
        EXPECT_EQ(line.member("time_ns"), PropertyValue(frame.front().timestamp));
        frame.pop_front();
        ++index;
    }
    EXPECT_EQ(lines[0].member("type"), PropertyValue("image"));
    EXPECT_EQ(lines[97].member("type"), PropertyValue("invalid"));
    EXPECT_EQ(lines[98].member("type"), PropertyValue("state"));
    EXPECT_EQ(lines[107].member("type"), PropertyValue("firmware"));
    EXPECT_THAT(memberNames(lines[0]),
                ElementsAre("device_ms", "events", "frame", "hand", "index", "lastDispatchedPhase",
                            "pixels", "stats", "time_ns", "type", "virtual"));
    EXPECT_EQ(lines[0].member("frame"), PropertyValue(1));
    EXPECT_EQ(lines[0].member("device_ms"), PropertyValue(10'000));
    EXPECT_THAT(memberNames(lines[107]),
                ElementsAre("events", "hand", "index", "lastDispatchedPhase", "pixels", "stats",
                            "time_ns", "type", "virtual"));
}

TEST_F(ReplayCommandTest, TraceHoldsTheStateAsItStandsAfterTheFrame) {
    const std::vector<PropertyValue> lines =
        traceOf(replay({session, "--json", "--trace", "-"}).out);
    ASSERT_EQ(lines.size(), 125U);
    const PropertyValue& touchdown = lines[5];
    const PropertyValue pixelH = element(touchdown.member("pixels"), 7);
    EXPECT_EQ(pixelH, (PropertyValue::Dictionary{{"_value", 350},
                                                 {"_normalizationFactor", 1.0},
                                                 {"_progress", 1.75},
                                                 {"_peakProgress", 1.75},
                                                 {"_valleyProgress", 1.75},
                                                 {"_isActive", true},
                                                 {"_isAboveNoise", true},
                                                 {"_wasAboveNoise", true},
                                                 {"_wasActive", true},
                                                 {"_maxProgressAboveNoise", 1.75},
                                                 {"_index", 7}}));
    EXPECT_EQ(touchdown.member("pixels").asArray()->size(), 15U);
    EXPECT_EQ(touchdown.member("virtual").asArray()->size(), 23U);
    // GHI: (350 + 222) * 0.5714, its strongest member is H.
    const PropertyValue group = element(touchdown.member("virtual"), 15);
    EXPECT_THAT(memberNames(group),
                ElementsAre("_index", "_isAboveNoise", "_isActive", "_maxProgressAboveNoise",
                            "_name", "_normalizationFactor", "_peakProgress", "_progress",
                            "_valleyProgress", "_value", "_wasAboveNoise", "_wasActive"));
    EXPECT_EQ(group.member("_name"), PropertyValue("GHI"));
    EXPECT_EQ(group.member("_value"), PropertyValue(326));
    EXPECT_EQ(group.member("_index"), PropertyValue(7));
    EXPECT_EQ(group.member("_normalizationFactor"), PropertyValue(0.5714));

    const PropertyValue hand = touchdown.member("hand");
    EXPECT_THAT(
        memberNames(hand),
        ElementsAre(
            "_aboveNoiseTimestamp_ms", "_activationThreshold", "_activeRegion",
            "_belowNoiseTimestamp_ms", "_enableHoldSuppression", "_enableTapSuppression",
            "_hold_timeout_ms", "_isAboveNoiseLevel", "_isHoldSuppressed", "_isHolding", "_isTap",
            "_isTapSuppressed", "_isTouching", "_lastEventTimestamp_ms", "_last_event_activeRegion",
            "_liftoffTimestamp_ms", "_max_pixel_value", "_maybeTap", "_nonActivePixels_thresholded",
            "_peak_pixel_index", "_peak_pixel_progress", "_previousActiveRegion",
            "_regionChangeThresh", "_regionMax", "_signalDerivative_thresholded", "_svm",
            "_tap_svm_score", "_timeDurationRatio_thresholded", "_touch_score",
            "_touch_score_barrier", "_touch_score_threshold", "_touchdownTimestamp_ms",
            "_touchingSignalDerivative_thresholded", "_wasAboveNoiseLevel", "_wasHoldSuppressed",
            "_wasHolding", "_wasTouching", "_wouldBeIsHolding", "_wouldBeWasHolding", "_y_cutoff"));
    EXPECT_EQ(hand.member("_isTouching"), PropertyValue(true));
    EXPECT_EQ(hand.member("_activeRegion"), PropertyValue(3));
    EXPECT_EQ(hand.member("_touchdownTimestamp_ms"), PropertyValue(10'050));
    EXPECT_EQ(hand.member("_y_cutoff"), PropertyValue(7.389056));
    EXPECT_EQ(hand.member("_regionMax"), (PropertyValue::Array{0.0, 0.0, 0.0, 275.0}));
    EXPECT_THAT(memberNames(hand.member("_svm")), ElementsAre("_score"));
    EXPECT_EQ(touchdown.member("lastDispatchedPhase"), PropertyValue(128));

    EXPECT_EQ(writeJson(touchdown.member("events"), Vexa::JsonWriter::Style::Compact),
              writeJson(PropertyValue::Array{Vexa::readJson(linesOf(kMixedJson)[0])},
                        Vexa::JsonWriter::Style::Compact));
    EXPECT_EQ(lines[4].member("events"), PropertyValue(PropertyValue::Array{}));
    EXPECT_EQ(lines[107].member("events").asArray()->size(), 2U);

    const PropertyValue stats = lines.back().member("stats");
    EXPECT_THAT(memberNames(stats), ElementsAre("Dispatched", "Rejected"));
    EXPECT_EQ(stats.member("Dispatched").member("numTaps"), PropertyValue(1));
    EXPECT_EQ(stats.member("Dispatched").member("numBeginHold"), PropertyValue(1));
    EXPECT_EQ(stats.member("Rejected").asDictionary()->size(), 12U);
    EXPECT_EQ(touchdown.member("stats").member("Dispatched").member("numTaps"), PropertyValue(0));
}

TEST_F(ReplayCommandTest, TraceOfAStateBeforeTheFirstImageIsTheInitialState) {
    RecordedSession recorded;
    recorded.set("Algs.ActivationThreshold", 100).feel(nothing());
    const std::string file = folder.file("state.json", recorded.text());
    const std::vector<PropertyValue> lines = traceOf(replay({file, "--trace", "-"}).out);
    ASSERT_EQ(lines.size(), 2U);
    EXPECT_EQ(lines[0].member("type"), PropertyValue("state"));
    EXPECT_EQ(element(lines[0].member("pixels"), 0).member("_value"), PropertyValue(0));
    EXPECT_EQ(element(lines[0].member("virtual"), 0).member("_index"), PropertyValue(65));
    EXPECT_EQ(lines[0].member("hand").member("_activationThreshold"), PropertyValue(100.0));
}

TEST_F(ReplayCommandTest, TracedFloatsReadBackToTheSameBitsAndNonFiniteOnesAreNamed) {
    // A threshold of 0 makes progress infinite or not a number.
    const std::string out = replay({session, "--trace", "-", "--set", "ActivationThreshold=0"}).out;
    EXPECT_THAT(out, HasSubstr(R"("_progress":"nan")"));
    EXPECT_THAT(out, HasSubstr(R"("_progress":"inf")"));
    for (const std::string& line : linesOf(out)) {
        EXPECT_TRUE(Vexa::readJson(line)) << line;
    }
    // 1.9219 is the shortest text of its float; its double would be 1.9219000339508057.
    const std::string plain = replay({session, "--trace", "-"}).out;
    EXPECT_THAT(plain, HasSubstr(R"("_normalizationFactor":1.9219,)"));
    EXPECT_THAT(plain, HasSubstr(R"("_activationThreshold":200.0,)"));
}

/// Holds a traced member to the field of the state that it is to be.
struct ExpectTraced {
    const PropertyValue& object;

    void operator()(std::string_view name, bool field) const {
        EXPECT_EQ(object.member(name), PropertyValue(field)) << name;
    }
    void operator()(std::string_view name, std::int32_t field) const {
        EXPECT_EQ(object.member(name), PropertyValue(field)) << name;
    }
    void operator()(std::string_view name, std::uint32_t field) const {
        EXPECT_EQ(object.member(name), PropertyValue(field)) << name;
    }
    void operator()(std::string_view name, float field) const {
        const PropertyValue value =
            name == "_svm._score" ? object.member("_svm").member("_score") : object.member(name);
        expectFloat(value, field, name);
    }
    void operator()(std::string_view name, const std::array<float, kRegionCount>& field) const {
        const PropertyValue array = object.member(name);
        ASSERT_EQ(array.asArray()->size(), field.size());
        for (std::size_t i = 0; i < field.size(); ++i) {
            expectFloat(element(array, i), field[i], name);
        }
    }

    static void expectFloat(const PropertyValue& value, float field, std::string_view name) {
        if (std::isfinite(field)) {
            EXPECT_EQ(std::bit_cast<std::uint32_t>(value.toFloat()),
                      std::bit_cast<std::uint32_t>(field))
                << name;
        } else {
            const std::string text =
                std::isnan(field) ? "nan" : std::string(field > 0 ? "inf" : "-inf");
            EXPECT_EQ(value, PropertyValue(text)) << name;
        }
    }
};

/// The lines of a trace, held to the states of a replay of the frames.
void expectTraced(const std::vector<PropertyValue>& lines, const FrameList& frames,
                  const std::vector<Tools::Setting>& settings) {
    Tools::Replay played(frames, {.list = settings});
    for (const PropertyValue& line : lines) {
        ASSERT_TRUE(played.canContinue());
        played.next();
        const Algs& algs = played.algs();
        for (std::size_t i = 0; i < kPixelCount; ++i) {
            forEachPixelField(algs.touchPixels()[i],
                              ExpectTraced{element(line.member("pixels"), i)});
        }
        for (std::size_t i = 0; i < kVirtualPixelCount; ++i) {
            forEachPixelField(algs.virtualPixels()[i],
                              ExpectTraced{element(line.member("virtual"), i)});
        }
        forEachHandStatsField(algs.handStats(), ExpectTraced{line.member("hand")});
        EXPECT_EQ(line.member("stats"), algs.eventStats().statsDictionary());
        EXPECT_EQ(line.member("lastDispatchedPhase"), PropertyValue(algs.lastDispatchedPhase()));
    }
    EXPECT_FALSE(played.canContinue());
}

TEST_F(ReplayCommandTest, EveryTracedFieldReadsBackToTheStateOfItsFrame) {
    for (const std::string threshold : {"200.0", "0", "-3.7", "1e-40", "3e38"}) {
        const std::string setting = "ActivationThreshold=" + threshold;
        expectTraced(traceOf(replay({session, "--trace", "-", "--set", setting}).out),
                     mixedSession().frames(), {Tools::parseSetting(setting)});
    }
}

// No setting may be beyond what a float holds, but a recording may bring one.
TEST_F(ReplayCommandTest, FieldsThatAreNotFiniteAreTracedToo) {
    RecordedSession recorded;
    recorded.set("Algs.ActivationThreshold", 1e39)
        .feel(touch("A").at(350).with("B", 150).forMs(50))
        .feel(nothing().forMs(20));
    const std::string file = folder.file("infinite.json", recorded.text());
    expectTraced(traceOf(replay({file, "--trace", "-"}).out), recorded.frames(), {});
}

TEST_F(ReplayCommandTest, ATraceThatCannotBeWrittenIsAFailure) {
    const std::string nowhere = folder.path("nowhere/trace.jsonl");
    EXPECT_EQ(replay({session, "--trace", nowhere}),
              (CommandResult{
                  1, "",
                  "vexatouch replay: " + nowhere + ": cannot write: No such file or directory\n"}));
    EXPECT_EQ(replay({session, "--trace", "-", "--expect", session}).exitCode, 2);
    EXPECT_THAT(folder.names(), ElementsAre("session.json"));
}

TEST_F(ReplayCommandTest, TheRecordingIsLeftAsItIs) {
    const std::string before = contentOf(session);
    EXPECT_EQ(replay({session, "--set", "ActivationThreshold=1"}).exitCode, 0);
    EXPECT_EQ(contentOf(session), before);
    EXPECT_THAT(folder.names(), ElementsAre("session.json"));
}

}  // namespace
}  // namespace VexaTouch::Testing
