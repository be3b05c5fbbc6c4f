#include "Tools/SurfaceSynthesizer.h"

#include "Pipeline/Pipeline.h"
#include "Shared/Util.h"
#include "Tools/EventRecord.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <numeric>
#include <sstream>
#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Frame = PipelineRecording::Frame;
using testing::AllOf;
using testing::ElementsAre;
using testing::Ge;
using testing::IsEmpty;
using testing::Le;

FrameList framesOf(std::string_view script, std::optional<std::uint64_t> seed = {}) {
    return synthesize(GestureScript::parse(script), seed);
}

std::vector<InputReport::Image> imagesOf(std::string_view script) {
    std::vector<InputReport::Image> images;
    for (const Frame& frame : framesOf(script)) {
        if (const auto image =
                InputReport::Image::parse(frame.report.data(), frame.report.size())) {
            images.push_back(*image);
        }
    }
    return images;
}

/// Kinds and regions of the events that a pipeline makes of a script: "tap 3".
std::vector<std::string> eventsOf(std::string_view script) {
    std::vector<std::string> events;
    Pipeline pipeline;
    pipeline.hidEventsProbe = [&events](const std::vector<Vexa::HidEvent>& batch) {
        for (const Vexa::HidEvent& event : batch) {
            const EventRecord record = eventRecordFromHidEvent(event);
            events.push_back(std::string(eventKindName(record.kind)) + " " +
                             std::to_string(record.region));
        }
    };
    for (const Frame& frame : framesOf(script)) {
        pipeline.setTime(frame.timestamp);
        if (frame.type == Frame::Type::State) {
            pipeline.setState(frame.key, frame.value);
        } else {
            pipeline.handleInputReport(frame.report.data(), frame.report.size());
        }
    }
    return events;
}

/// FNV-1a over everything in the frames.
std::uint64_t hashOf(const FrameList& frames) {
    std::uint64_t hash = 0xCBF29CE484222325U;
    const auto add = [&hash](std::uint64_t byte) { hash = (hash ^ byte) * 0x100000001B3U; };
    for (const Frame& frame : frames) {
        for (unsigned shift = 0; shift < 64; shift += 8) {
            add(frame.timestamp >> shift & 0xFFU);
        }
        for (const char c : frame.key + frame.value.description()) {
            add(static_cast<unsigned char>(c));
        }
        for (const std::uint8_t byte : frame.report) {
            add(byte);
        }
    }
    return hash;
}

std::int32_t valueAt(const std::array<std::int32_t, kPixelCount>& values, char letter) {
    return values[static_cast<std::size_t>(letter - 'A')];
}

TEST(FootprintTest, IsStrongestRightUnderTheFinger) {
    for (const SurfacePad& pad : kSurfacePads) {
        const auto values = footprint({pad.place(), 350, 5});
        for (std::size_t i = 0; i < kPixelCount; ++i) {
            if (i == pad.pixel()) {
                EXPECT_EQ(values[i], 350) << pad.letter;
            } else {
                EXPECT_LT(values[i], 350) << pad.letter;
            }
        }
    }
}

TEST(FootprintTest, FallsWithTheDistanceAndEndsAtItsRadius) {
    std::int32_t last = 400;
    for (std::int32_t x = 0; x < 12; ++x) {
        const std::int32_t value = valueAt(footprint({{x * 256, 0}, 350, 12}), 'K');
        EXPECT_LT(value, last) << x;
        last = value;
    }
    EXPECT_EQ(valueAt(footprint({{12 * 256, 0}, 350, 12}), 'K'), 0);
    EXPECT_EQ(valueAt(footprint({{-12 * 256, 0}, 350, 12}), 'K'), 0);
}

TEST(FootprintTest, IsTheSameInEveryDirection) {
    const auto right = footprint({{5 * 256, 0}, 350, 12});
    const auto left = footprint({{-5 * 256, 0}, 350, 12});
    EXPECT_EQ(valueAt(right, 'K'), valueAt(left, 'K'));
    EXPECT_EQ(valueAt(right, 'I'), valueAt(left, 'I'));
    EXPECT_EQ(valueAt(right, 'J'), valueAt(left, 'J')) << "one pad on each side";
    EXPECT_EQ(valueAt(right, 'G'), valueAt(left, 'H'));
    EXPECT_EQ(valueAt(right, 'E'), valueAt(left, 'F'));
}

TEST(FootprintTest, APixelSensesTheSumOfItsPads) {
    const SurfaceContact middle{{0, -6 * 256}, 350, 12};
    const SurfaceContact left{{-14 * 256, -6 * 256}, 350, 12};  // as far from the left pad of J
    EXPECT_EQ(valueAt(footprint(middle), 'J'), 2 * valueAt(footprint(left), 'J'));
}

TEST(FootprintTest, GrowsWithStrengthAndNearness) {
    const SurfaceContact finger{{0, 0}, 400, 12};
    EXPECT_EQ(valueAt(footprint(finger), 'K'), 400);
    EXPECT_EQ(valueAt(footprint(finger, kFullContact / 2), 'K'), 200);
    for (const std::int32_t value : footprint(finger, 0)) {
        EXPECT_EQ(value, 0);
    }
}

TEST(FootprintTest, HugeStrengthAndPalmDoNotOverflow) {
    const auto values = footprint({{0, 0}, kMaximumStrength, 60});
    EXPECT_EQ(valueAt(values, 'K'), 20'000);
    for (const std::int32_t value : values) {
        EXPECT_THAT(value, AllOf(Ge(0), Le(40'000)));
    }
}

TEST(SurfaceLayoutTest, PadsStandWhereThePictureOfAnImageShowsThem) {
    InputReport::Image image{};
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        image.signedPixels[i] = static_cast<std::int16_t>(1000 + i);
    }
    std::istringstream picture(Util::stringFromImage(image, false));
    std::string line;
    std::getline(picture, line);
    std::getline(picture, line);
    std::vector<SurfacePad> shown;
    for (std::int32_t row = 0; std::getline(picture, line); ++row) {
        for (std::size_t at = line.find('1'); at != std::string::npos;
             at = line.find('1', at + 4)) {
            const int pixel = std::stoi(line.substr(at, 4)) - 1000;
            // A number of four digits takes its run's place exactly.
            shown.push_back({static_cast<char>('A' + pixel), static_cast<std::int32_t>(at) - 16,
                             2 * (row - 6)});
        }
    }
    ASSERT_EQ(shown.size(), kSurfacePads.size());
    for (std::size_t i = 0; i < shown.size(); ++i) {
        EXPECT_EQ(shown[i].letter, kSurfacePads[i].letter) << i;
        EXPECT_EQ(shown[i].y, kSurfacePads[i].y) << kSurfacePads[i].letter;
        // Each number swallows the space after it, so the second of a row stands one to the left.
        EXPECT_THAT(kSurfacePads[i].x - shown[i].x, AllOf(Ge(0), Le(1))) << kSurfacePads[i].letter;
    }
}

TEST(SurfaceSynthesizerTest, TheSameScriptGivesTheSameBytesOnEveryMachine) {
    const char* script =
        "rate 60\nseed 7\nnoise 9\ndrift 20\ntap B3\nhold vol- 700ms 512\nslide vol+ play 500ms\n"
        "palm\nhover K\npress O\nmove A1 333ms\nrelease\nset ActivationThreshold 150.5\n"
        "invalid 0102\nfirmware 9 ff\nreset\nclock 4294967290\nframe 4294967295\nskip 2\ntap J\n";
    EXPECT_EQ(hashOf(framesOf(script)), 16356738959817875874U);
    EXPECT_EQ(hashOf(framesOf(randomScript(1, 60'000))), 144518553232513085U);
}

TEST(SurfaceSynthesizerTest, AnotherSeedGivesOtherNoiseButTheSameTouch) {
    const char* script = "seed 3\ntap play\nhold vol+\n";
    EXPECT_EQ(framesOf(script), framesOf(script));
    EXPECT_NE(framesOf(script), framesOf(script, 4));
    EXPECT_EQ(framesOf(script, 4), framesOf("seed 4\ntap play\nhold vol+\n"));
}

TEST(SurfaceSynthesizerTest, ImagesComeAtTheRateWithALittleJitter) {
    std::vector<std::uint64_t> times;
    for (const Frame& frame : framesOf("rate 50\nidle 2s")) {
        times.push_back(frame.timestamp);
    }
    ASSERT_EQ(times.size(), 100U);
    bool jitters = false;
    for (std::size_t i = 1; i < times.size(); ++i) {
        const auto interval = static_cast<std::int64_t>(times[i] - times[i - 1]);
        EXPECT_THAT(interval, AllOf(Ge(19'750'000), Le(20'250'000)));
        jitters = jitters || interval != 20'000'000;
    }
    EXPECT_TRUE(jitters);
}

TEST(SurfaceSynthesizerTest, AScriptMakesAsManyFramesAsItWasCheckedFor) {
    for (const char* text :
         {"", "tap K", "rate 3\nidle 1s\ntap K 1ms",
          "rate 7\ngap 99ms\nslide K L 333ms\npalm\nhover K",
          "approach 0ms\nliftoff 1ms\npress K\nmove L 5ms\nreset\nrelease", "rate 1\ntap K 1ms",
          "set K 1\ninvalid\nfirmware 2\nskip 4\nclock 5\nframe 6\nseed 7"}) {
        const GestureScript script = GestureScript::parse(text);
        EXPECT_EQ(synthesize(script).size(), script.frames) << text;
    }
    const GestureScript script = GestureScript::parse(randomScript(3, 100'000));
    EXPECT_EQ(synthesize(script).size(), script.frames);
}

TEST(SurfaceSynthesizerTest, TimestampsNeverGoBackWhateverComesBetween) {
    std::string script = "rate 1000\n";
    for (int i = 0; i < 300; ++i) {
        script += "set K 1\ninvalid\nfirmware 1\n";
        script += i % 3 == 0 ? "tap K 1ms\n" : "reset\n";
    }
    std::uint64_t last = 0;
    for (const Frame& frame : framesOf(script)) {
        EXPECT_GT(frame.timestamp, last);
        last = frame.timestamp;
    }
}

TEST(SurfaceSynthesizerTest, DeviceClockAndFrameNumbersGoOnFromWhereTheyAreSetAndWrap) {
    const auto images = imagesOf(
        "rate 100\nclock 4294967290\nframe 4294967295\nidle 30ms\nskip 3\nidle 10ms\nreset\n"
        "idle 20ms");
    std::vector<std::pair<std::uint32_t, std::uint32_t>> numbers;
    for (const auto& image : images) {
        numbers.emplace_back(image.frameNumber, image.timestampMs);
    }
    EXPECT_THAT(numbers, ElementsAre(std::pair(4294967295U, 4294967290U), std::pair(0U, 4U),
                                     std::pair(1U, 14U), std::pair(5U, 24U), std::pair(0U, 0U),
                                     std::pair(1U, 10U)));
}

TEST(SurfaceSynthesizerTest, NoiseAndDriftStayWithinTheirAmplitudes) {
    std::int32_t largest = 0;
    for (const auto& image : imagesOf("noise 8\ndrift 5\nidle 60s")) {
        for (const std::int16_t value : image.signedPixels) {
            largest = std::max(largest, std::abs(static_cast<std::int32_t>(value)));
        }
    }
    EXPECT_THAT(largest, AllOf(Ge(9), Le(13)));
    for (const auto& image : imagesOf("noise 0\ndrift 0\nidle 1s")) {
        EXPECT_EQ(image.signedPixels, (std::array<std::int16_t, kPixelCount>{}));
    }
}

TEST(SurfaceSynthesizerTest, UnsignedValuesAreTheSignedOnesOverABaseline) {
    for (const auto& image : imagesOf("hold K")) {
        for (std::size_t i = 0; i < kPixelCount; ++i) {
            EXPECT_EQ(image.unsignedPixels[i] - image.signedPixels[i],
                      4000 + 100 * static_cast<int>(i));
        }
    }
}

TEST(SurfaceSynthesizerTest, ScaledByItsGainTheStrongestPixelHasTheStrengthAskedFor) {
    for (const SurfacePad& pad : kSurfacePads) {
        const std::string place = std::to_string(pad.x) + "," + std::to_string(pad.y);
        const auto images = imagesOf("noise 0\ndrift 0\nfinger 5\nhold " + place + " 500ms 600");
        const float raw = images[25].signedPixels[pad.pixel()];
        EXPECT_NEAR(raw * kPixelGains[pad.pixel()], 600, 3) << pad.letter;
    }
}

TEST(SurfaceSynthesizerTest, AFingerComesAndGoesGradually) {
    std::vector<int> strengths;
    for (const auto& image : imagesOf("noise 0\ndrift 0\napproach 50ms\nliftoff 30ms\ngap 20ms\n"
                                      "tap H 120ms 1000")) {
        strengths.push_back(image.signedPixels[7]);
    }
    EXPECT_THAT(strengths,
                ElementsAre(27, 215, 500, 783, 971, 1000, 1000, 1000, 1000, 925, 500, 74, 0, 0));
}

TEST(SurfaceSynthesizerTest, AFrameNumbersGapAndAnInvalidReportLeaveAHoldAlone) {
    EXPECT_THAT(eventsOf("press vol+\nidle 600ms\nskip 5\ninvalid 01\nfirmware 4\nidle 100ms\n"
                         "release"),
                ElementsAre("may-begin 3", "hold-start 3", "hold-end 3"));
}

TEST(SurfaceSynthesizerTest, ANormalTouchIsWhatItsNameSaysOnEveryButton) {
    const std::pair<const char*, const char*> places[] = {
        {"play", "1"}, {"vol-", "2"}, {"vol+", "3"}};
    for (const auto& [place, region] : places) {
        const std::string at = std::string(" ") + place + "\n";
        const std::string in = std::string(" ") + region;
        for (const std::uint64_t seed : {1U, 2U, 3U, 4U, 5U}) {
            const std::string begin = "seed " + std::to_string(seed) + "\n";
            EXPECT_THAT(eventsOf(begin + "tap" + at), ElementsAre("may-begin" + in, "tap" + in));
            EXPECT_THAT(eventsOf(begin + "hold" + at),
                        ElementsAre("may-begin" + in, "hold-start" + in, "hold-end" + in));
        }
    }
}

TEST(SurfaceSynthesizerTest, APalmNeitherTapsNorHolds) {
    EXPECT_THAT(eventsOf("palm"), ElementsAre("may-begin 1", "cancel 0"));
}

TEST(SurfaceSynthesizerTest, AHoverIsAboveNoiseButNeverATouchAnywhere) {
    for (std::int32_t x = -16; x <= 16; ++x) {
        for (std::int32_t y = -13; y <= 13; ++y) {
            const std::string place = std::to_string(x) + "," + std::to_string(y);
            EXPECT_THAT(eventsOf("rate 20\nhover " + place), IsEmpty()) << place;
        }
    }
    const auto images = imagesOf("noise 0\ndrift 0\nhover H");
    EXPECT_GT(images[15].signedPixels[7], kNoiseLevel);
}

TEST(SurfaceSynthesizerTest, AReleaseOrMoveWithoutAPressDoesNothing) {
    std::size_t frames = 0;
    SurfaceSynthesizer synthesizer([&frames](const Frame&) { ++frames; });
    GestureCommand command;
    command.kind = GestureKind::Release;
    synthesizer.perform(command);
    command.kind = GestureKind::Move;
    command.durationMs = 100;
    synthesizer.perform(command);
    EXPECT_EQ(frames, 0U);
}

TEST(RandomScriptTest, IsAScriptOfAboutTheLengthAskedFor) {
    for (std::uint64_t seed = 0; seed < 20; ++seed) {
        const std::string script = randomScript(seed, 60'000);
        const auto frames = framesOf(script).size();
        EXPECT_THAT(frames, AllOf(Ge(5'900U), Le(6'800U))) << "seed " << seed;
    }
    EXPECT_EQ(randomScript(5, 10'000), randomScript(5, 10'000));
    EXPECT_NE(randomScript(5, 10'000), randomScript(6, 10'000));
}

TEST(RandomScriptTest, HoldsEveryKindOfGestureAndDecision) {
    Pipeline pipeline;
    for (const Frame& frame : framesOf(randomScript(1, 1'200'000))) {
        if (frame.type == Frame::Type::State && frame.key == "Algs.ResetEventStats") {
            continue;
        }
        if (frame.type == Frame::Type::State) {
            pipeline.setState(frame.key, frame.value);
        } else {
            pipeline.handleInputReport(frame.report.data(), frame.report.size());
        }
    }
    const EventStats::Counters& stats = pipeline.algs().eventStats()._stats;
    EXPECT_GT(stats.numPlayPause, 50U);
    EXPECT_GT(stats.numVolumeUp, 50U);
    EXPECT_GT(stats.numVolumeDown, 50U);
    EXPECT_GT(stats.numBeginHold, 100U);
    EXPECT_GT(stats.numQuarnCall, 30U);
    EXPECT_GT(stats.numRejectedTap, 2U);
    EXPECT_GT(stats.numRejectedBeginHold, 10U);
}

}  // namespace
}  // namespace VexaTouch::Tools
