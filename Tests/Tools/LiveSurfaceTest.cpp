#include "Tools/LiveSurface.h"
#include "Tools/RecordingFile.h"
#include "Tools/Replay.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <iostream>
#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::ElementsAreArray;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;
using Frame = PipelineRecording::Frame;

constexpr std::size_t kColumns = 80;

RecordingFile example(const std::string& name) {
    Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    return readRecording(VEXA_SOURCE_DIR "/Examples/" + name + ".json", streams);
}

void send(LiveSurface& surface, const Frame& frame) {
    if (frame.type == Frame::Type::State) {
        surface.state(frame.key, frame.value);
    } else {
        surface.report(frame.report);
    }
}

std::vector<std::string> withoutHeading(std::vector<std::string> lines) {
    if (!lines.empty()) {
        lines.erase(lines.begin());
    }
    return lines;
}

/// The picture of the last report of a recording, as replay shows it.
std::vector<std::string> replayedPicture(const std::string& name,
                                         std::span<const Setting> settings = {}) {
    Replay replay(example(name).frames, {.list = {settings.begin(), settings.end()}});
    FrameView view(ColorDepth::None, kColumns, 0, replay.frames().size());
    std::vector<std::string> lines;
    while (replay.canContinue()) {
        const PlayedFrame& played = replay.next();
        view.see(played);
        if (played.type != PlayedType::State) {
            lines = view.lines(played, replay.algs());
        }
    }
    return withoutHeading(lines);
}

TEST(LiveSurfaceTest, NothingIsDrawnBeforeTheFirstReport) {
    LiveSurface surface(ColorDepth::None, kColumns, 0, {});
    surface.state("Algs.ActivationThreshold", 1);
    EXPECT_FALSE(surface.update(0));
    EXPECT_THAT(surface.lines(), IsEmpty());
}

TEST(LiveSurfaceTest, PictureIsThatOfTheReplayWithSettingsAtTheirPlaces) {
    for (const std::string name : {"settings", "mixed", "reset-in-touch"}) {
        LiveSurface surface(ColorDepth::None, kColumns, 0, {});
        std::uint64_t sent = 0;
        for (const Frame& frame : example(name).frames) {
            send(surface, frame);
            if (++sent % 100 == 0) {
                EXPECT_TRUE(surface.update(sent));
            }
        }
        surface.update(sent);
        EXPECT_THAT(withoutHeading(surface.lines()), ElementsAreArray(replayedPicture(name)))
            << name;
    }
}

TEST(LiveSurfaceTest, SettingsHoldFromTheFirstReport) {
    const std::vector<Setting> settings = {parseSetting("ActivationThreshold=900")};
    LiveSurface surface(ColorDepth::None, kColumns, 0, settings);
    for (const Frame& frame : example("mid-touch").frames) {
        send(surface, frame);
    }
    surface.update(0);
    EXPECT_THAT(withoutHeading(surface.lines()),
                ElementsAreArray(replayedPicture("mid-touch", settings)));
}

TEST(LiveSurfaceTest, WhoDoesNotKeepUpLosesReportsButNoSetting) {
    LiveSurface surface(ColorDepth::None, kColumns, 0, {});
    const std::vector<std::uint8_t> report = {1};
    for (std::size_t i = 0; i < 2 * ReportTap::kCapacity; ++i) {
        surface.report(report);
    }
    surface.state("Algs.ActivationThreshold", 1);
    EXPECT_TRUE(surface.update(0));
    for (const Frame& frame : example("mid-touch").frames) {
        send(surface, frame);
    }
    EXPECT_TRUE(surface.update(0));
    const std::vector<Setting> settings = {parseSetting("ActivationThreshold=1")};
    EXPECT_THAT(surface.lines(), SizeIs(FrameView::kLines));
    EXPECT_THAT(withoutHeading(surface.lines()),
                ElementsAreArray(replayedPicture("mid-touch", settings)));
    EXPECT_THAT(replayedPicture("mid-touch"),
                Not(ElementsAreArray(replayedPicture("mid-touch", settings))));
}

TEST(LiveSurfaceTest, HeadingCountsReportsAndTime) {
    LiveSurface surface(ColorDepth::None, kColumns, 1'000'000'000, {});
    surface.report(std::vector<std::uint8_t>{7, 7});
    surface.report(std::vector<std::uint8_t>{7, 7, 7});
    surface.update(1'250'000'000);
    EXPECT_EQ(surface.lines().front(), "frame 1   0.250 s   invalid report of 3 bytes");
}

}  // namespace
}  // namespace VexaTouch::Tools
