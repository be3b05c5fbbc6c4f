#include "Tests/Support/Touch.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/EventRecord.h"
#include "Tools/RecordingCut.h"
#include "Tools/RecordingRecovery.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <limits>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using Frames = std::list<PipelineRecording::Frame>;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::Pair;
using Tools::CutPlace;

/// What converting this text gives on standard output, and the lines on the error stream.
struct Converted {
    int exitCode = 0;
    std::string out;
    std::vector<std::string> error;
};

Converted convert(const std::string& text, std::vector<std::string> options) {
    options.insert(options.begin(), {"convert", "-", "-o", "-"});
    const CommandResult result = runCommand(options, text);
    return {result.exitCode, result.out, linesOf(result.error)};
}

std::string summary(std::size_t read, std::size_t written) {
    return "standard input: " + std::to_string(read) + (read == 1 ? " frame" : " frames") +
           " read, " + std::to_string(written) + " written to standard output";
}

const std::string kMidTouch =
    "vexatouch convert: warning: standard input: the cut begins in mid-touch, so that touch may "
    "end differently";

/// The container with the frames [begin, end) of these.
std::string part(const Frames& frames, std::ptrdiff_t begin, std::ptrdiff_t end) {
    return containerText(Frames(std::next(frames.begin(), begin), std::next(frames.begin(), end)));
}

TEST(ConvertCommand, AContainerStaysTheSame) {
    const std::string text = mixedSession().text();
    const Converted converted = convert(text, {});
    EXPECT_EQ(converted.out, text);
    EXPECT_EQ(converted.exitCode, 0);
    EXPECT_THAT(converted.error, ElementsAre(summary(125, 125)));
}

TEST(ConvertCommand, VersionZeroBecomesVersionOne) {
    const Converted converted =
        convert(R"({"Reports":[{"ReportData":"01 02","Timestamp":7}],"Version":0})", {});
    EXPECT_EQ(converted.out, R"({
  "Version": 1,
  "Frames": [
    {
      "Type": "InputReport",
      "Timestamp": 7,
      "Report": "01 02 "
    }
  ]
}
)");
    EXPECT_THAT(converted.error, ElementsAre(summary(1, 1)));
}

TEST(ConvertCommand, WritesTheFileWholeAndNothingBesideIt) {
    const TemporaryFolder folder;
    const std::string text = mixedSession().text();
    const std::string in = folder.file("in.json", text);
    const std::string out = folder.file("out.json", "what was there before");
    EXPECT_EQ(runCommand({"convert", in, "-o", out}),
              (CommandResult{.exitCode = 0,
                             .out = {},
                             .error = in + ": 125 frames read, 125 written to " + out + "\n"}));
    EXPECT_EQ(contentOf(out), text);
    EXPECT_THAT(folder.names(), ElementsAre("in.json", "out.json"));
}

TEST(ConvertCommand, InputAndOutputMayBeTheSameFile) {
    const TemporaryFolder folder;
    const std::string file = folder.file("in.json", R"({"Version":0})");
    EXPECT_EQ(runCommand({"convert", file, "-o", file}).exitCode, 0);
    EXPECT_EQ(contentOf(file), containerText({}));
}

TEST(ConvertCommand, AFailureLeavesTheOldFile) {
    const TemporaryFolder folder;
    const std::string in = folder.file("in.json", "{\"Version\":1,\"Frames\":[");
    const std::string out = folder.file("out.json", "what was there before");
    EXPECT_EQ(runCommand({"convert", in, "-o", out}),
              (CommandResult{.exitCode = 1,
                             .out = {},
                             .error = "vexatouch convert: " + in +
                                      ": cut off after 23 bytes: migrateSerializedContainer "
                                      "failed: invalid container (incomplete JSON)\n"}));
    EXPECT_EQ(contentOf(out), "what was there before");
    EXPECT_THAT(folder.names(), ElementsAre("in.json", "out.json"));
}

TEST(ConvertCommand, CutsByFrames) {
    const Frames frames = mixedSession().frames();
    const Converted converted = convert(containerText(frames), {"--from", "2", "--to", "4"});
    EXPECT_EQ(converted.out, part(frames, 2, 4));
    EXPECT_THAT(converted.error, ElementsAre(summary(125, 2)));
}

TEST(ConvertCommand, CutsByTime) {
    const Frames frames = mixedSession().frames();
    const std::string text = containerText(frames);
    EXPECT_EQ(convert(text, {"--to", "30ms"}).out, part(frames, 0, 3));
    EXPECT_EQ(convert(text, {"--to", "30.5ms"}).out, part(frames, 0, 4));
    EXPECT_EQ(convert(text, {"--to", "0.03s"}).out, part(frames, 0, 3));
    EXPECT_EQ(convert(text, {"--from", "20ms", "--to", "3"}).out, part(frames, 2, 3));
    EXPECT_EQ(convert(text, {"--to", "9999"}).out, text);
}

TEST(ConvertCommand, TwoPartsHoldWhatTheWholeDid) {
    const Frames frames = mixedSession().frames();
    const std::string text = containerText(frames);
    EXPECT_EQ(convert(text, {"--to", "40"}).out, part(frames, 0, 40));
    EXPECT_EQ(convert(text, {"--from", "40"}).out, part(frames, 40, 125));
}

// Settings in force where the cut begins are kept, and so is what they set: the newest of each key.
TEST(ConvertCommand, ACutKeepsTheSettingsInForce) {
    RecordedSession session;
    session.set("a", 1).set("b", 1).feel(nothing()).set("a", 2).feel(nothing()).set("a", 3);
    session.feel(nothing());
    const Frames& frames = session.frames();
    Frames expected;
    for (const std::ptrdiff_t index : {1, 3, 4, 5, 6}) {  // b=1, a=2, image, a=3, image
        expected.push_back(*std::next(frames.begin(), index));
    }
    const Converted converted = convert(session.text(), {"--from", "4"});
    EXPECT_EQ(converted.out, containerText(expected));
    EXPECT_THAT(converted.error, ElementsAre(summary(7, 5)));
}

TEST(ConvertCommand, WarnsWhenACutBeginsInMidTouch) {
    const std::string text = mixedSession().text();
    // The first touch is in the frames 5 to 16; frame 17 lifts off.
    EXPECT_THAT(convert(text, {"--from", "5"}).error, ElementsAre(summary(125, 120)));
    EXPECT_THAT(convert(text, {"--from", "6"}).error, ElementsAre(kMidTouch, summary(125, 119)));
    EXPECT_THAT(convert(text, {"--from", "17"}).error, ElementsAre(kMidTouch, summary(125, 108)));
    EXPECT_THAT(convert(text, {"--from", "18"}).error, ElementsAre(summary(125, 107)));
}

/// The events of a recording, as kind and recorded time in ms.
std::vector<std::pair<std::string, std::uint64_t>> eventsOf(const std::string& container) {
    std::vector<std::pair<std::string, std::uint64_t>> events;
    for (const std::string& line : linesOf(runCommand({"replay", "--json", "-"}, container).out)) {
        const Tools::EventRecord event = Tools::eventFromJson(line);
        events.emplace_back(Tools::eventKindName(event.kind), event.timeNs / 1'000'000);
    }
    return events;
}

// What a cut loses: the touch begins anew where the recording does, and its hold starts that much
// later. What follows is as before.
TEST(ConvertCommand, ACutInMidTouchBeginsTheTouchAnew) {
    RecordedSession session;
    session.feel(nothing().forMs(50))
        .feel(touch("A").at(350).with("B", 150).forMs(1000))
        .feel(nothing().forMs(2000))
        .feel(touch("H").at(350).with("I", 150).forMs(100))
        .feel(nothing());
    EXPECT_THAT(eventsOf(session.text()),
                ElementsAre(Pair("may-begin", 5050), Pair("hold-start", 5560),
                            Pair("hold-end", 6050), Pair("may-begin", 8050), Pair("tap", 8150)));
    for (const std::vector<std::string>& cut :
         {std::vector<std::string>{"--from", "300ms"}, {"--trim", "286"}}) {
        EXPECT_THAT(
            eventsOf(convert(session.text(), cut).out),
            ElementsAre(Pair("may-begin", 5300), Pair("hold-start", 5810), Pair("hold-end", 6050),
                        Pair("may-begin", 8050), Pair("tap", 8150)));
    }
}

TEST(ConvertCommand, TrimsAsABoundedRecordingDoes) {
    RecordedSession session;
    session.set("a", 1).feel(nothing()).set("a", 2).set("a", 3).feel(nothing()).feel(nothing());
    const Frames& frames = session.frames();
    const Converted converted = convert(session.text(), {"--trim", "2"});
    EXPECT_EQ(converted.out, part(frames, 3, 6));
    EXPECT_THAT(converted.error, ElementsAre(summary(6, 3)));
    EXPECT_EQ(convert(session.text(), {"--trim", "3"}).out,
              convert(session.text(), {"--trim", "99"}).out);
}

TEST(ConvertCommand, WarnsWhenTrimmingBeginsInMidTouch) {
    RecordedSession session;
    session.feel(touch("N").at(350).forMs(20)).feel(nothing());
    EXPECT_THAT(convert(session.text(), {"--trim", "3"}).error, ElementsAre(summary(3, 3)));
    EXPECT_THAT(convert(session.text(), {"--trim", "2"}).error,
                ElementsAre(kMidTouch, summary(3, 2)));
}

TEST(ConvertCommand, TrimmingFollowsTheCut) {
    const Frames frames = mixedSession().frames();
    EXPECT_EQ(convert(containerText(frames), {"--to", "4", "--trim", "2"}).out, part(frames, 2, 4));
}

TEST(ConvertCommand, ACutThatHoldsNothingFails) {
    const std::string text = mixedSession().text();
    const auto fault = [&](std::vector<std::string> options) {
        const Converted converted = convert(text, std::move(options));
        EXPECT_EQ(converted.exitCode, 1);
        EXPECT_EQ(converted.out, "");
        return converted.error.at(0);
    };
    EXPECT_EQ(fault({"--from", "125"}),
              "vexatouch convert: standard input: the cut from frame 125 to frame 125 holds none "
              "of its 125 frames");
    EXPECT_EQ(fault({"--from", "20", "--to", "100ms"}),
              "vexatouch convert: standard input: the cut from frame 20 to frame 10 holds none of "
              "its 125 frames");
    EXPECT_EQ(fault({"--from", "10s"}),
              "vexatouch convert: standard input: the cut from frame 125 to frame 125 holds none "
              "of its 125 frames");
}

TEST(ConvertCommand, FormatAndPlaceGoTogether) {
    const Frames frames = mixedSession().frames();
    const std::string hid =
        convert(containerText(frames), {"--to", "hid-recorder", "--to", "4"}).out;
    EXPECT_THAT(linesOf(hid), ::testing::SizeIs(10));  // five of heading, start, four events
    EXPECT_EQ(convert(hid, {"--from", "hid-recorder", "--from", "2"}).out, part(frames, 2, 4));
}

TEST(ConvertCommand, WhatTheHidToolsGetComesBackTheSame) {
    const std::string text = mixedSession().set("key \"\n", 200.0).text();
    const std::string hid = convert(text, {"--to", "hid-recorder"}).out;
    const Converted back = convert(hid, {"--from", "hid-recorder"});
    EXPECT_EQ(back.out, text);
    EXPECT_EQ(convert(back.out, {"--to", "hid-recorder"}).out, hid);
}

TEST(ConvertCommand, EventsOfOtherDevicesAreLeftOutWithAWarning) {
    const Converted converted = convert(
        "D: 0\nE: 000000.000000 1 01\nD: 1\nE: 000000.000000 1 02\n", {"--from", "hid-recorder"});
    EXPECT_THAT(converted.error,
                ElementsAre("vexatouch convert: warning: standard input: left out 1 event of "
                            "other devices than the first",
                            summary(1, 1)));
}

TEST(ConvertCommand, WritesTablesAndTraces) {
    const std::string text = mixedSession().text();
    EXPECT_THAT(linesOf(convert(text, {"--to", "csv"}).out), ::testing::SizeIs(126));
    const std::string trace = convert(text, {"--to", "perfetto"}).out;
    EXPECT_TRUE(trace.starts_with("{\"displayTimeUnit\":\"ms\",\"traceEvents\":["));
    EXPECT_TRUE(trace.ends_with("]}\n"));
}

TEST(ConvertCommand, WrongOptionsAreUsageErrors) {
    const std::string text = mixedSession().text();
    const auto fault = [&](std::vector<std::string> options) {
        const Converted converted = convert(text, std::move(options));
        EXPECT_EQ(converted.exitCode, 2);
        EXPECT_EQ(converted.out, "");
        return converted.error.at(0);
    };
    EXPECT_EQ(fault({"--from", "csv"}),
              "vexatouch convert: --from csv: this format can be written, not read");
    for (const std::string place : {"x", "-1", "1.5", "1 ms", "5m", "ms", "infms", "nans", "1e300s",
                                    "18446744073709551616"}) {
        EXPECT_EQ(fault({"--to=" + place}), "vexatouch convert: --to " + place +
                                                ": neither a format, a frame number nor a time "
                                                "such as 1500ms");
    }
    EXPECT_EQ(fault({"--to", "csv", "--to", "perfetto"}),
              "vexatouch convert: --to gives two formats");
    EXPECT_EQ(fault({"--from", "1", "--from", "2ms"}),
              "vexatouch convert: --from gives two places");
    for (const std::string count : {"0", "-1", "x", "18446744073709551616"}) {
        EXPECT_EQ(fault({"--trim=" + count}),
                  "vexatouch convert: --trim " + count + ": not a number of reports from 1 on");
    }
    EXPECT_EQ(runCommand({"convert", "-"}, text).exitCode, 2);  // no -o
}

TEST(ConvertCommand, BadInputIsNamed) {
    const TemporaryFolder folder;
    const auto fault = [&](std::vector<std::string> arguments) {
        const CommandResult result = runCommand(arguments);
        EXPECT_EQ(result.exitCode, 1);
        EXPECT_THAT(folder.names(), Not(::testing::Contains("out")));
        return result.error;
    };
    const std::string out = folder.path("out");
    const std::string missing = folder.path("missing");
    const std::string hidFormat = "hid-recorder";
    for (const std::string& format : {std::string("container"), hidFormat}) {
        EXPECT_EQ(fault({"convert", missing, "-o", out, "--from", format}),
                  "vexatouch convert: " + missing + ": cannot open: No such file or directory\n");
        EXPECT_EQ(fault({"convert", folder.path(""), "-o", out, "--from", format}),
                  "vexatouch convert: " + folder.path("") + ": is a folder, not a recording\n");
        EXPECT_EQ(fault({"convert", missing, "-o", out, "--from", format, "--recover"}),
                  "vexatouch convert: " + missing + ": cannot open: No such file or directory\n");
    }
    const std::string empty = folder.file("empty", "");
    EXPECT_EQ(fault({"convert", empty, "-o", out, "--from", hidFormat}),
              "vexatouch convert: " + empty + ": is empty: no line of a HID recording\n");
    const std::string cut = folder.file("cut", "N: x\nE: 0.0 2 01\n");
    EXPECT_EQ(fault({"convert", cut, "-o", out, "--from", hidFormat}),
              "vexatouch convert: " + cut + ": line 2: an event of 2 bytes has 1\n");
    const std::string good = folder.file("good", containerText({}));
    EXPECT_EQ(fault({"convert", good, "-o", folder.path("no/such/out")}),
              "vexatouch convert: " + folder.path("no/such/out") +
                  ": cannot write: No such file or directory\n");
}

TEST(ConvertCommand, RecoverLeavesAGoodRecordingAlone) {
    const std::string text = mixedSession().text();
    const Converted converted = convert(text, {"--recover"});
    EXPECT_EQ(converted.out, text);
    EXPECT_THAT(converted.error,
                ElementsAre("standard input: not damaged, 125 whole frames", summary(125, 125)));
}

TEST(ConvertCommand, RecoverSaysWhatWasLost) {
    const Frames frames = mixedSession().frames();
    const std::string text = containerText(frames);
    const Converted converted = convert(text.substr(0, 3000), {"--recover"});
    EXPECT_EQ(converted.out, part(frames, 0, 9));
    EXPECT_THAT(converted.error,
                ElementsAre("standard input: lost: cut off after 3000 bytes (incomplete JSON)",
                            "standard input: recovered 9 whole frames", summary(9, 9)));
    EXPECT_EQ(converted.exitCode, 0);
}

TEST(ConvertCommand, RecoverFailsWithoutAWholeFrame) {
    const Converted converted = convert("not a recording", {"--recover"});
    EXPECT_EQ(converted.exitCode, 1);
    EXPECT_EQ(converted.out, "");
    ASSERT_EQ(converted.error.size(), 2U);
    EXPECT_TRUE(converted.error[0].starts_with("standard input: lost: no JSON at byte 0 ("));
    EXPECT_EQ(converted.error[1], "vexatouch convert: standard input: no whole frame to recover");
}

TEST(ConvertCommand, RecoversAHidRecording) {
    const Converted converted =
        convert("N: x\nE: 000000.000000 1 01\nE: 000000.000001 9 01\nE: 000000.000002 1 03\nE: 0",
                {"--recover", "--from", "hid-recorder", "--to", "hid-recorder"});
    EXPECT_THAT(linesOf(converted.out),
                ::testing::IsSupersetOf({"E: 000000.000000 1 01", "E: 000000.000002 1 03"}));
    EXPECT_THAT(converted.error,
                ElementsAre("standard input: lost: line 3: an event of 9 bytes has 1",
                            "standard input: lost: line 5: time '0' is not seconds.microseconds",
                            "standard input: recovered 2 whole frames", summary(2, 2)));
}

/// A small recording with settings of every shape.
Frames smallSession() {
    RecordedSession session;
    session.set("a", Vexa::PropertyValue::Dictionary{{"x", Vexa::PropertyValue::Array{1, "{"}}})
        .report({1, 2})
        .set("b \\ \"", "text { with } braces")
        .report({})
        .report({0xFF, 0, 3});
    return session.frames();
}

// Wherever a recording is cut off, its whole frames come back.
TEST(RecordingRecovery, ACutAtEveryByteKeepsTheWholeFrames) {
    const Frames frames = smallSession();
    const std::string text = containerText(frames);
    std::vector<std::size_t> ends;  // of the frames' text
    for (std::size_t at = text.find("\n    }"); at != std::string::npos;
         at = text.find("\n    }", at + 1)) {
        ends.push_back(at + 6);
    }
    ASSERT_EQ(ends.size(), frames.size());
    for (std::size_t length = 0; length < text.size() - 1; ++length) {
        const Tools::RecordingRecovery recovery =
            Tools::recoverContainer(std::string_view(text).substr(0, length));
        const auto whole =
            std::ranges::count_if(ends, [length](std::size_t end) { return end <= length; });
        ASSERT_EQ(containerText(recovery.frames), part(frames, 0, whole)) << "cut at " << length;
        ASSERT_THAT(recovery.damages, ElementsAre(::testing::StartsWith(
                                          "cut off after " + std::to_string(length) + " bytes")));
    }
    EXPECT_THAT(Tools::recoverContainer(text).damages, IsEmpty());
}

// One byte lost anywhere costs no more than the frame it was in, and the one that a text without
// its end has run into.
TEST(RecordingRecovery, AByteLostAnywhereCostsTheFrameItWasIn) {
    const Frames frames = smallSession();
    const std::string text = containerText(frames);
    const std::size_t firstFrame = text.find("    {");
    for (std::size_t at = firstFrame; at < text.size(); ++at) {
        std::string damaged = text;
        damaged.erase(at, 1);
        const Tools::RecordingRecovery recovery = Tools::recoverContainer(damaged);
        // A digit, a letter of a name or of a text may go without the JSON being wrong.
        std::size_t kept = 0;
        for (const PipelineRecording::Frame& frame : frames) {
            kept += std::ranges::count(recovery.frames, frame) > 0 ? 1U : 0U;
        }
        ASSERT_GE(kept, frames.size() - 1) << "without byte " << at << ": " << damaged;
        ASSERT_LE(recovery.frames.size(), frames.size()) << "without byte " << at;
    }
}

TEST(RecordingRecovery, FramesBehindADamagedPlaceComeBack) {
    const Frames frames = mixedSession().frames();
    std::string text = containerText(frames);
    const std::size_t at = text.find("\"Timestamp\": 5010000000");  // of frame 1
    text.replace(at, 11, "\x01");
    const Tools::RecordingRecovery recovery = Tools::recoverContainer(text);
    Frames expected = frames;
    expected.erase(std::next(expected.begin()));
    EXPECT_EQ(recovery.frames, expected);
    EXPECT_EQ(recovery.version, 1U);
    const std::size_t next = text.find("    {", at) + 4;
    EXPECT_THAT(recovery.damages,
                ElementsAre("no JSON at byte " + std::to_string(at) +
                            " (syntax error), read on at byte " + std::to_string(next)));
}

TEST(RecordingRecovery, ElementsThatAreNoFramesAreCounted) {
    const std::string text =
        R"({"Version":1,"Frames":[5,{"Type":"InputReport","Timestamp":1,"Report":"01"},{}]})";
    const Tools::RecordingRecovery recovery = Tools::recoverContainer(text);
    ASSERT_EQ(recovery.frames.size(), 1U);
    EXPECT_EQ(recovery.frames.front().report, std::vector<std::uint8_t>{1});
    EXPECT_THAT(recovery.damages, ElementsAre("invalid frame type", "2 elements are no frames"));
}

// Each brace may begin the next frame; reading on to the end at each would take hours here.
TEST(RecordingRecovery, ManyElementsThatAreNoFramesAreSearchedOnce) {
    std::string text = R"({"Version":1,"Frames":[!)";
    for (int i = 0; i < 200'000; ++i) {
        text += "{},";
    }
    const std::string frame = R"({"Type":"InputReport","Timestamp":1,"Report":"01"})";
    text += frame + "]}";
    const Tools::RecordingRecovery recovery = Tools::recoverContainer(text);
    ASSERT_EQ(recovery.frames.size(), 1U);
    EXPECT_EQ(recovery.frames.front().report, std::vector<std::uint8_t>{1});
    ASSERT_EQ(recovery.damages.size(), 2U);
    EXPECT_EQ(recovery.damages[1], "200000 elements are no frames");
}

TEST(RecordingRecovery, ElementsBehindAFaultAreCountedToTheEndOfTheText) {
    EXPECT_THAT(
        Tools::recoverContainer(R"({"Version":1,"Frames":[!{},{"X":{}},{}]})").damages,
        ElementsAre(::testing::StartsWith("no JSON at byte 23"), "3 elements are no frames"));
    // The value of a damaged state frame is no element.
    EXPECT_THAT(Tools::recoverContainer(
                    R"({"Version":1,"Frames":[{"Type":"State",!"Value":{"x":1},"Key":"a"},{}]})")
                    .damages,
                ElementsAre(::testing::StartsWith("no JSON at byte 39"), "1 element is no frame"));
}

// What looks like a frame inside of an element that is none was never an input.
TEST(RecordingRecovery, ObjectInsideOfAnElementThatIsNoFrameIsNoFrame) {
    const Tools::RecordingRecovery recovery = Tools::recoverContainer(
        R"({"Version":1,"Frames":[!{"X":{"Type":"InputReport","Timestamp":7,"Report":"07"}},)"
        R"({"Type":"InputReport","Timestamp":1,"Report":"01"}]})");
    ASSERT_EQ(recovery.frames.size(), 1U);
    EXPECT_EQ(recovery.frames.front().report, std::vector<std::uint8_t>{1});
    EXPECT_THAT(recovery.damages,
                ElementsAre(::testing::HasSubstr("read on at byte 81"), "1 element is no frame"));
}

TEST(RecordingRecovery, WholeContainerBehindAFaultGivesItsFrames) {
    const Frames frames = smallSession();
    const std::string text = containerText(frames);
    EXPECT_EQ(containerText(Tools::recoverContainer("!" + text).frames), text);
    EXPECT_EQ(Tools::recoverContainer(text + text).frames.size(), 2 * frames.size());
}

// Each of these braces begins what only the end of the text shows to be no frame.
TEST(RecordingRecovery, DeepNestingIsSearchedOnce) {
    const std::string frame = R"({"Type":"InputReport","Timestamp":1,"Report":"01"})";
    for (const std::string level : {R"({"a":)", R"({"x":[{"y":[)", R"({"a":{"b":1},"c":)"}) {
        std::string text = R"({"Version":1,"Frames":[!)";
        for (int i = 0; i < 100'000; ++i) {
            text += level;
        }
        EXPECT_EQ(Tools::recoverContainer(text + "!" + frame).frames.size(), 1U) << level;
    }
}

TEST(RecordingRecovery, WithoutItsBeginningARecordingStillHoldsFrames) {
    const Frames frames = smallSession();
    const std::string text = containerText(frames);
    const std::string_view end = std::string_view(text).substr(text.find("\"Report\""));
    EXPECT_EQ(containerText(Tools::recoverContainer(end).frames), part(frames, 2, 5));
    const std::string old = R"(ata":"01"},{"Timestamp":2,"ReportData":"02"}],"Version":0})";
    const Tools::RecordingRecovery recovery = Tools::recoverContainer(old);
    ASSERT_EQ(recovery.frames.size(), 1U);
    EXPECT_EQ(recovery.frames.front().timestamp, 2U);
}

TEST(RecordingCut, PlacesAreFramesOrTimes) {
    using Unit = CutPlace::Unit;
    const auto place = [](std::string_view text) { return CutPlace::fromText(text); };
    EXPECT_EQ(place("0"), (CutPlace{Unit::Frames, 0}));
    EXPECT_EQ(place("120"), (CutPlace{Unit::Frames, 120}));
    EXPECT_EQ(place("18446744073709551615"),
              (CutPlace{Unit::Frames, std::numeric_limits<std::uint64_t>::max()}));
    EXPECT_EQ(place("1500ms"), (CutPlace{Unit::Nanoseconds, 1'500'000'000}));
    EXPECT_EQ(place("1.5s"), (CutPlace{Unit::Nanoseconds, 1'500'000'000}));
    EXPECT_EQ(place("0.000001ms"), (CutPlace{Unit::Nanoseconds, 1}));
    EXPECT_EQ(place("-0s"), std::nullopt);
}

TEST(RecordingCut, ATimeIsAtTheFirstFrameRecordedThenOrLater) {
    Frames frames(4);
    const std::uint64_t times[] = {1000, 3000, 500, 4000};  // the clock steps back once
    std::size_t next = 0;
    for (PipelineRecording::Frame& frame : frames) {
        frame.timestamp = times[next++];
    }
    const auto at = [&](std::uint64_t ns) {
        return Tools::frameAt(frames, {CutPlace::Unit::Nanoseconds, ns});
    };
    EXPECT_EQ(at(0), 0U);
    EXPECT_EQ(at(1), 1U);
    EXPECT_EQ(at(2000), 1U);
    EXPECT_EQ(at(2001), 3U);
    EXPECT_EQ(at(3001), 4U);
    EXPECT_EQ(Tools::frameAt({}, {CutPlace::Unit::Nanoseconds, 0}), 0U);
}

}  // namespace
}  // namespace VexaTouch::Testing
