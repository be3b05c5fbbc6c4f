#include "Tools/DeviceChoice.h"

#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/DeviceReader.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/Failure.h"
#include "Tools/RecordedDevice.h"
#include "Tools/SurfaceSynthesizer.h"

#include <gmock/gmock.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <list>
#include <memory>
#include <ostream>
#include <sstream>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {

void PrintTo(const DeviceChoice& choice, std::ostream* stream) {
    constexpr std::array kKinds = {"sim", "recording", "hidraw"};
    *stream << kKinds.at(static_cast<std::size_t>(choice.kind)) << " \"" << choice.path << "\" @"
            << choice.speed;
}

namespace {

using Kind = DeviceChoice::Kind;

using Testing::DeviceReader;
using ::testing::HasSubstr;
using Testing::mixedSession;
using Testing::TemporaryFolder;
using Testing::untimed;

std::string refusal(const std::string& text) {
    try {
        DeviceChoice::parse(text);
    } catch (const UsageError& error) {
        return error.what();
    }
    return "none";
}

TEST(DeviceChoiceTest, TheSimulatedSurfacePlaysRandomGesturesOrAScript) {
    EXPECT_EQ(DeviceChoice::parse("sim"), (DeviceChoice{Kind::Simulated, "", 1.0}));
    EXPECT_EQ(DeviceChoice::parse("sim:a.gesture"),
              (DeviceChoice{Kind::Simulated, "a.gesture", 1.0}));
    EXPECT_EQ(DeviceChoice::parse("sim:-"), (DeviceChoice{Kind::Simulated, "-", 1.0}));
    // No speed, and colons as they are.
    EXPECT_EQ(DeviceChoice::parse("sim:a:b@2"), (DeviceChoice{Kind::Simulated, "a:b@2", 1.0}));
}

TEST(DeviceChoiceTest, ADeviceOfTheKernelIsTheFirstOrThatOfANode) {
    EXPECT_EQ(DeviceChoice::parse("hidraw"), (DeviceChoice{Kind::Hidraw, "", 1.0}));
    EXPECT_EQ(DeviceChoice::parse("hidraw:/dev/hidraw1"),
              (DeviceChoice{Kind::Hidraw, "/dev/hidraw1", 1.0}));
    EXPECT_EQ(refusal("hidraw:"),
              "--device hidraw:: the node is missing (without the colon: the first surface there "
              "is)");
}

TEST(DeviceChoiceTest, OnlyWhatComesToAnEndHasRoomForAllOfItsEvents) {
    const auto room = [](std::string_view text, bool endless = false) {
        const DeviceWishes wishes{.endless = endless};
        const DeviceChoice choice = DeviceChoice::parse(text);
        EXPECT_EQ(comesToAnEnd(choice, wishes), eventRoom(choice, wishes) == SIZE_MAX) << text;
        return eventRoom(choice, wishes);
    };
    EXPECT_EQ(room("hidraw:/dev/hidraw1"), 65'536U);
    EXPECT_EQ(room("sim"), 65'536U);
    EXPECT_EQ(room("sim:a"), SIZE_MAX);
    EXPECT_EQ(room("sim:a", true), 65'536U);
    EXPECT_EQ(room("recording:a@max"), SIZE_MAX);
}

TEST(DeviceChoiceTest, ARecordingMayHaveASpeed) {
    const auto recording = [](const char* path, double speed) {
        return DeviceChoice{Kind::Recording, path, speed};
    };
    EXPECT_EQ(DeviceChoice::parse("recording:a.json"), recording("a.json", 1.0));
    EXPECT_EQ(DeviceChoice::parse("recording:a.json@2"), recording("a.json", 2.0));
    EXPECT_EQ(DeviceChoice::parse("recording:a.json@0.25"), recording("a.json", 0.25));
    EXPECT_EQ(DeviceChoice::parse("recording:a.json@1e3"), recording("a.json", 1000.0));
    EXPECT_EQ(DeviceChoice::parse("recording:a.json@max"),
              recording("a.json", RecordedDevice::kAsFastAsTaken));
    EXPECT_EQ(DeviceChoice::parse("recording:-@max"),
              recording("-", RecordedDevice::kAsFastAsTaken));
    EXPECT_EQ(DeviceChoice::parse("recording:C:a.json"), recording("C:a.json", 1.0));
}

TEST(DeviceChoiceTest, AnAtSignThatNoSpeedFollowsBelongsToTheName) {
    const auto path = [](const char* text) { return DeviceChoice::parse(text).path; };
    EXPECT_EQ(path("recording:me@home/a.json"), "me@home/a.json");
    EXPECT_EQ(path("recording:a@"), "a@");
    EXPECT_EQ(path("recording:a@2x"), "a@2x");
    EXPECT_EQ(path("recording:a@+2"), "a@+2");
    EXPECT_EQ(path("recording:a@ 2"), "a@ 2");
    EXPECT_EQ(path("recording:a@Max"), "a@Max");
    EXPECT_EQ(path("recording:a@2@1"), "a@2");
    EXPECT_EQ(path("recording:a@max@max"), "a@max");
}

TEST(DeviceChoiceTest, WhatIsNoDeviceIsRefused) {
    EXPECT_EQ(
        refusal("mouse"),
        "--device mouse: expected sim, sim:SCRIPT, recording:FILE (with @2 or @max behind the "
        "file for a speed), hidraw or hidraw:NODE");
    EXPECT_THAT(refusal(""), HasSubstr("expected sim"));
    EXPECT_THAT(refusal("Sim"), HasSubstr("expected sim"));
    EXPECT_THAT(refusal("simulated"), HasSubstr("expected sim"));
    EXPECT_THAT(refusal("sim:"), HasSubstr("the script's file is missing"));
    EXPECT_THAT(refusal("recording"), HasSubstr("the recording's file is missing"));
    EXPECT_THAT(refusal("recording:"), HasSubstr("the recording's file is missing"));
    EXPECT_THAT(refusal("recording:@2"), HasSubstr("the recording's file is missing"));
    for (const char* speed : {"0", "-1", "nan", "inf", "0.0", "-0"}) {
        EXPECT_EQ(refusal("recording:a@" + std::string(speed)),
                  "--device recording:a@" + std::string(speed) +
                      ": the speed is a number above 0, or max (for a file of that name add @1)");
    }
}

class MakeDeviceTest : public ::testing::Test {
protected:
    std::shared_ptr<ObservedDevice> make(const std::string& text, const DeviceWishes& wishes = {}) {
        return makeDevice(DeviceChoice::parse(text), wishes, streams);
    }
    std::string fault(const std::string& text) {
        try {
            make(text);
        } catch (const UsageError&) {
            return "usage";
        } catch (const Failure& failure) {
            return failure.what();
        }
        return "none";
    }

    TemporaryFolder folder;
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Streams streams{.in = in, .out = out, .error = error};
};

TEST_F(MakeDeviceTest, ARecordingIsPlayed) {
    const std::string path = folder.file("session.json", mixedSession().text());
    DeviceReader reader(make("recording:" + path + "@max"));
    EXPECT_EQ(reader.play(), untimed(mixedSession().frames()));
    EXPECT_EQ(error.str(), "");
}

TEST_F(MakeDeviceTest, ARecordingComesFromStandardInputToo) {
    in.str(mixedSession().text());
    DeviceReader reader(make("recording:-@max"));
    EXPECT_EQ(reader.play(), untimed(mixedSession().frames()));
}

TEST_F(MakeDeviceTest, AScriptIsPlayedAtTheWishedRate) {
    const std::string script = "invalid 01\nidle 30ms\ninvalid\n";
    const std::string path = folder.file("a.gesture", script);
    DeviceReader reader(make("sim:" + path, {.seed = 9, .rate = 1e6}));
    EXPECT_EQ(reader.play(), untimed(synthesize(GestureScript::parse(script), 9)));
    EXPECT_EQ(error.str(), "");
}

TEST_F(MakeDeviceTest, AScriptComesFromStandardInputToo) {
    in.str("invalid 01 02\nidle 10ms\n");
    DeviceReader reader(make("sim:-"));
    EXPECT_EQ(reader.play(), untimed(synthesize(GestureScript::parse(in.str()))));
}

TEST_F(MakeDeviceTest, TheSeedOfRandomGesturesIsAnnounced) {
    make("sim", {.seed = 12});
    EXPECT_EQ(error.str(), "simulated surface: random gestures, seed 12\n");
    make("sim", {.announceSeed = false});
    EXPECT_EQ(error.str(), "simulated surface: random gestures, seed 12\n");
}

TEST_F(MakeDeviceTest, TheFramesAloneAreThoseOfAScriptOverAndOverOrOfARecordingOnce) {
    const std::string script = "tap play 30ms\nset HoldTimeoutMilliseconds 300\n";
    const std::string path = folder.file("a.gesture", script);
    std::list<RecordedFrame> expected;
    SurfaceSynthesizer synthesizer([&](auto frame) { expected.push_back(std::move(frame)); });
    for (int i = 0; i < 3; ++i) synthesizer.perform(GestureScript::parse(script));
    struct Enough {};
    std::list<RecordedFrame> frames;
    EXPECT_THROW(
        frameSource(DeviceChoice::parse("sim:" + path), streams)([&](const RecordedFrame& frame) {
            if (frames.size() == expected.size()) throw Enough();
            frames.push_back(frame);
        }),
        Enough);
    EXPECT_EQ(frames, expected);

    frames.clear();
    const std::string recording = folder.file("session.json", mixedSession().text());
    frameSource(DeviceChoice::parse("recording:" + recording),
                streams)([&](const RecordedFrame& frame) { frames.push_back(frame); });
    EXPECT_EQ(frames, mixedSession().frames());
}

TEST_F(MakeDeviceTest, FilesThatCannotBePlayedAreFailures) {
    EXPECT_EQ(fault("recording:" + folder.path("none.json")),
              folder.path("none.json") + ": cannot open: No such file or directory");
    const std::string text = folder.file("text.json", "hello");
    EXPECT_THAT(fault("recording:" + text), HasSubstr(text + ": no JSON at byte 0"));
    const std::string wrong = folder.file("wrong.gesture", "tap play\ntip vol+\n");
    EXPECT_THAT(fault("sim:" + wrong), HasSubstr(wrong + ": line 2"));
    const std::string empty = folder.file("empty.gesture", "# nothing\nstrength 300\n");
    EXPECT_EQ(fault("sim:" + empty),
              empty + ": the script makes no frames (add a gesture, or idle 100ms)");
    const std::string large =
        folder.file("large.gesture", std::string(kMaximumScriptBytes + 1, '#'));
    EXPECT_THAT(fault("sim:" + large), HasSubstr(large + ": "));
}

}  // namespace
}  // namespace VexaTouch::Tools
