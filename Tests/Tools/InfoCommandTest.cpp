#include "Tests/Support/Touch.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/RecordedSession.h"

#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

struct Image {
    std::uint32_t number;
    std::uint32_t deviceMs;
};

/// A recording of images that feel nothing, 10 ms of host time apart.
std::string imagesText(const std::vector<Image>& images) {
    FrameList frames;
    std::uint64_t timeNs = 1'000'000'000;
    for (const Image& image : images) {
        frames.push_back({.timestamp = timeNs,
                          .key = {},
                          .value = {},
                          .report = imageReport(nothing(), image.number, image.deviceMs)});
        timeNs += 10'000'000;
    }
    return containerText(frames);
}

/// The --json of a recording without a setting, a touch or anything but images.
std::string jsonOfImages(std::size_t count, std::uint64_t durationNs, const std::string& median,
                         const std::string& p99, const std::string& max, int disjoint, int jumps) {
    return R"({
  "version": 1,
  "frames": {
    "input_reports": )" +
           std::to_string(count) + R"(,
    "states": 0,
    "images": )" +
           std::to_string(count) + R"(,
    "firmware_events": 0,
    "invalid": 0
  },
  "duration_ns": )" +
           std::to_string(durationNs) + R"(,
  "image_interval_ms": {
    "median": )" +
           median + R"(,
    "p99": )" +
           p99 +
           R"(,
    "max": )" +
           max +
           R"(
  },
  "disjoint_images": )" +
           std::to_string(disjoint) + R"(,
  "clock_jumps": )" +
           std::to_string(jumps) + R"(,
  "lost_reports": 0,
  "lost_settings": 0,
  "settings": {},
  "stats": {
    "Dispatched": {
      "numBeginHold": 0,
      "numEndHold": 0,
      "numHolding2Suppressed": 0,
      "numIncrementHold": 0,
      "numPlayPause": 0,
      "numQuarnCall": 0,
      "numQuarnCallIncrement": 0,
      "numTaps": 0,
      "numVolumeDecrement": 0,
      "numVolumeDown": 0,
      "numVolumeIncrement": 0,
      "numVolumeUp": 0
    },
    "Rejected": {
      "numRejectedBeginHold": 0,
      "numRejectedEndHold": 0,
      "numRejectedIncrementHold": 0,
      "numRejectedPlayPause": 0,
      "numRejectedQuarnCall": 0,
      "numRejectedQuarnCallIncrement": 0,
      "numRejectedTap": 0,
      "numRejectedVolumeDecrement": 0,
      "numRejectedVolumeDown": 0,
      "numRejectedVolumeIncrement": 0,
      "numRejectedVolumeUp": 0,
      "numSuppressed2Holding": 0
    }
  }
}
)";
}

CommandResult infoOf(const std::string& container) {
    return runCommand({"info", "--json", "-"}, container);
}

CommandResult success(std::string out) {
    return {.exitCode = 0, .out = std::move(out), .error = {}};
}

TEST(InfoCommand, SaysWhatAMixedSessionHolds) {
    const TemporaryFolder folder;
    const std::string file = folder.file("session.json", mixedSession().text());
    EXPECT_EQ(
        runCommand({"info", file}),
        success(file + "\n"
                       "  container    version 1, 38330 bytes\n"
                       "  frames       125: 124 input reports (122 images, 1 firmware event, 1 "
                       "invalid), 1 setting\n"
                       "  duration     1.210 s\n"
                       "  interval     median 10 ms, p99 10 ms, largest gap 10 ms before frame 1\n"
                       "  disjoint     0 images\n"
                       "  clock jumps  0\n"
                       "  mid-touch    no\n"
                       "  settings     Algs.HoldTimeoutMilliseconds = 300\n"
                       "  dispatched   numTaps 1, numBeginHold 1, numIncrementHold 8, numEndHold "
                       "1, numVolumeUp 1, numQuarnCall 1, numQuarnCallIncrement 8\n"
                       "  rejected     numRejectedTap 1, numRejectedVolumeDown 1\n"));
}

TEST(InfoCommand, JsonHasTheLastSettingsAndTheCounters) {
    RecordedSession session;
    session.set("Algs.HoldTimeoutMilliseconds", 300)
        .set("other", "text")
        .feel(touch("H").at(350).with("I", 150).forMs(50))
        .feel(nothing())
        .report({0x07})
        .report(firmwareReport(9))
        .set("Algs.HoldTimeoutMilliseconds", 250.5);
    EXPECT_EQ(infoOf(session.text()), success(R"({
  "version": 1,
  "frames": {
    "input_reports": 8,
    "states": 3,
    "images": 6,
    "firmware_events": 1,
    "invalid": 1
  },
  "duration_ns": 60000000,
  "image_interval_ms": {
    "median": 10,
    "p99": 10,
    "max": 10
  },
  "disjoint_images": 0,
  "clock_jumps": 0,
  "lost_reports": 0,
  "lost_settings": 0,
  "settings": {
    "Algs.HoldTimeoutMilliseconds": 250.5,
    "other": "text"
  },
  "stats": {
    "Dispatched": {
      "numBeginHold": 0,
      "numEndHold": 0,
      "numHolding2Suppressed": 0,
      "numIncrementHold": 0,
      "numPlayPause": 0,
      "numQuarnCall": 0,
      "numQuarnCallIncrement": 0,
      "numTaps": 1,
      "numVolumeDecrement": 0,
      "numVolumeDown": 0,
      "numVolumeIncrement": 0,
      "numVolumeUp": 1
    },
    "Rejected": {
      "numRejectedBeginHold": 0,
      "numRejectedEndHold": 0,
      "numRejectedIncrementHold": 0,
      "numRejectedPlayPause": 0,
      "numRejectedQuarnCall": 0,
      "numRejectedQuarnCallIncrement": 0,
      "numRejectedTap": 0,
      "numRejectedVolumeDecrement": 0,
      "numRejectedVolumeDown": 0,
      "numRejectedVolumeIncrement": 0,
      "numRejectedVolumeUp": 0,
      "numSuppressed2Holding": 0
    }
  }
}
)"));
}

TEST(InfoCommand, AnEmptyRecordingHasNoIntervals) {
    EXPECT_EQ(infoOf(containerText({})), success(jsonOfImages(0, 0, "null", "null", "null", 0, 0)));
    EXPECT_EQ(runCommand({"info", "-"}, containerText({})),
              success("standard input\n"
                      "  container    version 1, 35 bytes\n"
                      "  frames       0: 0 input reports (0 images, 0 firmware events, 0 invalid), "
                      "0 settings\n"
                      "  duration     0.000 s\n"
                      "  interval     unknown (fewer than two images)\n"
                      "  disjoint     0 images\n"
                      "  clock jumps  0\n"
                      "  mid-touch    no\n"
                      "  settings     none written\n"
                      "  dispatched   nothing\n"
                      "  rejected     nothing\n"));
}

TEST(InfoCommand, VersionZeroIsNamed) {
    const std::string text = R"({"Version":0,"Reports":[]})";
    std::string expected = jsonOfImages(0, 0, "null", "null", "null", 0, 0);
    expected.replace(expected.find("1,"), 1, "0");
    EXPECT_EQ(infoOf(text), success(expected));
}

// As the service counts: 5, 6, 8, 9 is one disjoint image, 0xFFFFFFFF before 0 is none.
TEST(InfoCommand, DisjointImagesAreCounted) {
    EXPECT_EQ(infoOf(imagesText({{5, 0}, {6, 10}, {8, 20}, {9, 30}})),
              success(jsonOfImages(4, 30'000'000, "10", "10", "10", 1, 0)));
    EXPECT_EQ(infoOf(imagesText({{0xFFFFFFFF, 0}, {0, 10}, {0, 20}})),
              success(jsonOfImages(3, 20'000'000, "10", "10", "10", 1, 0)));
}

TEST(InfoCommand, ClockJumpsAreStepsBackwardOrAboveASecond) {
    EXPECT_EQ(infoOf(imagesText({{1, 5000}, {2, 6000}, {3, 7001}, {4, 7000}, {5, 7000}})),
              success(jsonOfImages(5, 40'000'000, "1000", "1001", "1001", 0, 2)));
}

TEST(InfoCommand, AClockThatWrapsDoesNotJump) {
    EXPECT_EQ(infoOf(imagesText({{1, 0xFFFFFFFA}, {2, 4}, {3, 24}})),
              success(jsonOfImages(3, 20'000'000, "10", "20", "20", 0, 0)));
}

TEST(InfoCommand, IntervalsAreByNearestRank) {
    // 1 ms, 2 ms, ... 200 ms: rank 100 is the median, rank 198 the 99th percentile.
    std::vector<Image> images = {{0, 0}};
    for (std::uint32_t i = 1; i <= 200; ++i) {
        images.push_back({i, images.back().deviceMs + i});
    }
    EXPECT_EQ(infoOf(imagesText(images)),
              success(jsonOfImages(201, 2'000'000'000, "100", "198", "200", 0, 0)));
}

TEST(InfoCommand, SaysWhetherItBeginsInMidTouch) {
    RecordedSession session;
    session.feel(touch("N").at(350)).feel(nothing());
    const CommandResult result = runCommand({"info", "-"}, session.text());
    EXPECT_EQ(linesOf(result.out).at(7), "  mid-touch    begins with a finger on the surface");
}

TEST(InfoCommand, WhatWasLostWhileItWasRecordedIsToldAndWarnedOf) {
    RecordedSession session;
    session.feel(nothing())
        .set("Recording.LostReports", 12)
        .set("Recording.LostSettings", 1)
        .feel(nothing())
        .set("Recording.LostReports", 3)
        .feel(nothing())
        .set("Recording.LostSettings", 2)
        .set("Algs.HoldTimeoutMilliseconds", 300);
    const CommandResult text = runCommand({"info", "-"}, session.text());
    EXPECT_EQ(text.exitCode, 0);
    EXPECT_EQ(linesOf(text.out).at(7), "  lost         15 reports and 3 settings, at 3 places");
    EXPECT_EQ(text.out.find("Recording."), std::string::npos);
    EXPECT_EQ(
        text.error,
        "vexatouch info: warning: standard input: 15 reports and 3 settings, at 3 places, were "
        "lost while it was recorded; what follows a loss may give other events than the "
        "service gave\n");
    const CommandResult json = runCommand({"info", "--json", "-"}, session.text());
    EXPECT_NE(json.out.find("\"lost_reports\": 15,\n  \"lost_settings\": 3,\n  \"settings\": {\n"
                            "    \"Algs.HoldTimeoutMilliseconds\": 300\n"),
              std::string::npos);
    EXPECT_EQ(json.error, text.error);
}

TEST(InfoCommand, BadInputIsNamed) {
    const TemporaryFolder folder;
    const std::string missing = folder.path("missing.json");
    const auto failure = [](const std::string& text) {
        return CommandResult{.exitCode = 1, .out = {}, .error = "vexatouch info: " + text + "\n"};
    };
    EXPECT_EQ(runCommand({"info", missing}),
              failure(missing + ": cannot open: No such file or directory"));
    const std::string odd = folder.file("odd.json", "{\"Version\": 2}");
    EXPECT_EQ(runCommand({"info", odd}),
              failure(odd + ": migrateSerializedContainer failed: invalid container version: 2"));
    EXPECT_EQ(runCommand({"info"}).exitCode, 2);
    EXPECT_EQ(runCommand({"info", odd, odd}).exitCode, 2);
    EXPECT_EQ(runCommand({"info", "--jason", odd}).exitCode, 2);
}

}  // namespace
}  // namespace VexaTouch::Testing
