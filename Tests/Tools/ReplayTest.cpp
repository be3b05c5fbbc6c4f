#include "Tools/Replay.h"

#include "Tests/Support/FakeHostClock.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/StateSnapshot.h"

#include <gmock/gmock.h>

#include <optional>
#include <set>
#include <stdexcept>
#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::ElementsAre;
using Testing::firmwareReport;
using ::testing::IsEmpty;
using Testing::mixedSession;
using Testing::nothing;
using Testing::RecordedSession;
using Testing::touch;

TEST(ReplayTest, EveryFrameIsPlayedAsWhatItIs) {
    RecordedSession recorded;
    recorded.set("Algs.ActivationThreshold", 100)
        .feel(touch("H").at(150))
        .report({})
        .report(firmwareReport(7, {1, 2}))
        .report(firmwareReport(0));
    Replay replay(recorded.frames());
    std::vector<std::string> types;
    std::vector<std::uint64_t> indexes;
    while (replay.canContinue()) {
        const PlayedFrame& played = replay.next();
        types.emplace_back(playedTypeName(played.type));
        indexes.push_back(played.index);
        if (played.type == PlayedType::Image) {
            EXPECT_EQ(played.image.frameNumber, 1U);
            EXPECT_EQ(played.image.signedPixels[7], 150);
            EXPECT_EQ(played.frame->report.size(), 73U);
        }
        if (played.index == 3) {
            EXPECT_EQ(played.firmware.code, 7);
            EXPECT_EQ(played.firmware.data[1], 2);
            EXPECT_THAT(played.events, IsEmpty());
        }
    }
    EXPECT_THAT(types, ElementsAre("state", "image", "invalid", "firmware", "firmware"));
    EXPECT_THAT(indexes, ElementsAre(0, 1, 2, 3, 4));
    const ReplayCounts& counts = replay.counts();
    EXPECT_EQ(counts.frames, 5U);
    EXPECT_EQ(counts.states, 1U);
    EXPECT_EQ(counts.images, 1U);
    EXPECT_EQ(counts.invalidReports, 1U);
    EXPECT_EQ(counts.firmwareEvents, 2U);
    EXPECT_EQ(counts.events, 3U);  // may-begin, cancel, firmware-reset
}

TEST(ReplayTest, EventsBelongToTheFrameThatMadeThem) {
    Replay replay(mixedSession().frames());
    std::vector<EventRecord> events;
    while (replay.canContinue()) {
        const PlayedFrame& played = replay.next();
        for (const EventRecord& event : played.events) {
            EXPECT_EQ(event.index, played.index);
            EXPECT_EQ(event.timeNs, played.frame->timestamp);
            EXPECT_EQ(event.deviceMs,
                      played.type == PlayedType::Image ? played.image.timestampMs : 0);
            events.push_back(event);
        }
    }
    EXPECT_EQ(events.size(), 8U);
}

TEST(ReplayTest, TheEndIsAFinishedPlayback) {
    RecordedSession recorded;
    recorded.feel(nothing());
    Replay replay(recorded.frames());
    replay.next();
    EXPECT_FALSE(replay.canContinue());
    EXPECT_THROW(replay.next(), std::runtime_error);
    EXPECT_EQ(replay.counts().frames, 1U);
    Replay empty({});
    EXPECT_FALSE(empty.canContinue());
}

TEST(ReplayTest, SettingsAreGivenBeforeTheFirstFrameAndAreNotRecorded) {
    const std::vector<Setting> settings = {{"Algs.ActivationThreshold", 50.0},
                                           {"Algs.ActivationThreshold", 75.0}};
    Replay replay(mixedSession().frames(), {.list = settings});
    EXPECT_EQ(replay.algs().handStats()._activationThreshold, 75.0F);
    EXPECT_TRUE(replay.canContinue());
    EXPECT_EQ(replay.frames(), mixedSession().frames());
    replay.next();
    EXPECT_EQ(replay.counts().states, 0U);
}

// Two state frames of the recording: one of a setting that was given, one of another.
RecordedSession sessionWithSettings() {
    RecordedSession recorded;
    recorded.feel(nothing())
        .set("Algs.ActivationThreshold", 100)
        .set("Algs.HoldTimeoutMilliseconds", 700)
        .feel(nothing());
    return recorded;
}

TEST(ReplayTest, ASettingThatTheRecordingChangesIsLostAndToldOf) {
    Replay replay(sessionWithSettings().frames(), {.list = {{"Algs.ActivationThreshold", 50.0}}});
    replay.next();
    EXPECT_EQ(replay.lostSetting(), std::nullopt);
    replay.next();
    EXPECT_EQ(replay.algs().handStats()._activationThreshold, 100.0F);
    EXPECT_EQ(replay.lostSetting(), (LostSetting{.key = "Algs.ActivationThreshold", .index = 1}));
}

TEST(ReplayTest, ASettingThatTheRecordingSetsToTheSameIsNotLost) {
    Replay replay(sessionWithSettings().frames(), {.list = {{"Algs.ActivationThreshold", 100}}});
    while (replay.canContinue()) {
        replay.next();
    }
    EXPECT_EQ(replay.lostSetting(), std::nullopt);
}

TEST(ReplayTest, ASettingIsLostWhateverTheSpellingOfItsIndex) {
    RecordedSession recorded;
    recorded.set("Algs.VirtualNormalizationFactors.1", 3).feel(nothing());
    Replay replay(recorded.frames(), {.list = {{"Algs.VirtualNormalizationFactors.01", 2.0}}});
    replay.next();
    EXPECT_EQ(replay.lostSetting(),
              (LostSetting{.key = "Algs.VirtualNormalizationFactors.01", .index = 0}));
}

TEST(ReplayTest, APinnedSettingHoldsWhateverTheRecordingSets) {
    Replay replay(sessionWithSettings().frames(),
                  {.list = {{"Algs.ActivationThreshold", 50.0}}, .pinned = true});
    while (replay.canContinue()) {
        replay.next();
        EXPECT_EQ(replay.algs().handStats()._activationThreshold, 50.0F);
    }
    EXPECT_EQ(replay.algs().handStats()._hold_timeout_ms, 700U);
    EXPECT_EQ(replay.lostSetting(), std::nullopt);
    EXPECT_EQ(replay.frames(), sessionWithSettings().frames());
}

TEST(ReplayTest, APinnedActionIsDoneOnceOnly) {
    RecordedSession recorded = mixedSession();
    recorded.set("Algs.ActivationThreshold", 100);
    Replay replay(recorded.frames(), {.list = {{"Algs.ResetEventStats", 0}}, .pinned = true});
    while (replay.canContinue()) {
        replay.next();
    }
    EXPECT_GT(replay.algs().eventStats()._stats.numTaps, 0U);
}

TEST(ReplayTest, AHugeGapIsNotWaitedForAtFullSpeed) {
    auto frames = mixedSession().frames();
    frames.back().timestamp = ~std::uint64_t{0};
    Testing::FakeHostClock clock;
    Replay replay(frames, {}, clock);
    while (replay.canContinue()) {
        replay.next(Replay::kNoWaiting);
    }
    EXPECT_THAT(clock.sleeps, IsEmpty());
}

TEST(StateSnapshotTest, EveryFieldHasANameOfItsOwn) {
    std::set<std::string> names;
    for (std::size_t field = 0; field < StateSnapshot::fieldCount(); ++field) {
        EXPECT_TRUE(names.insert(StateSnapshot::fieldName(field)).second)
            << StateSnapshot::fieldName(field);
    }
    // What the frame was, 38 channels of 11 fields, the hand with four region maxima, the last
    // phase and 24 counters.
    EXPECT_EQ(names.size(), 4U + 38U * 11U + 43U + 1U + 24U);
    for (const std::string name :
         {"type", "time_ns", "frame", "device_ms", "pixels[A]._value", "pixels[O]._index",
          "virtual[ABE]._value", "virtual[MNO]._maxProgressAboveNoise", "hand._svm._score",
          "hand._regionMax[0]", "hand._regionMax[3]", "hand._regionChangeThresh",
          "lastDispatchedPhase", "stats.numTaps", "stats.numHolding2Suppressed"}) {
        EXPECT_TRUE(names.contains(name)) << name;
    }
}

std::vector<std::string> differences(const StateSnapshot& a, const StateSnapshot& b) {
    std::vector<std::string> all;
    a.forEachDifference(b, [&](std::size_t field) {
        all.push_back(StateSnapshot::fieldName(field) + " " + a.fieldText(field) + " " +
                      b.fieldText(field));
    });
    return all;
}

/// The snapshot of a played frame with one field changed.
template <typename Change>
StateSnapshot changed(Change change) {
    struct Open : Algs {
        using Algs::_EventStats;
        using Algs::_handStats;
        using Algs::_lastDispatchedPhase;
        using Algs::_touchPixels;
        using Algs::_virtualPixels;
    } algs;
    static const PipelineRecording::Frame frame;
    PlayedFrame played;
    played.frame = &frame;
    change(played, algs);
    StateSnapshot snapshot;
    snapshot.take(played, algs);
    return snapshot;
}

TEST(StateSnapshotTest, AnyFieldThatChangesIsFound) {
    const auto changesOf = [](auto change) {
        return differences(changed([](auto&, auto&) {}), changed(change));
    };
    EXPECT_THAT(changesOf([](auto&, auto&) {}), IsEmpty());
    EXPECT_THAT(changesOf([](auto& played, auto&) { played.type = PlayedType::Invalid; }),
                ElementsAre("type \"state\" \"invalid\""));
    EXPECT_THAT(changesOf([](auto& played, auto&) {
                    played.type = PlayedType::Image;
                    played.image.frameNumber = 0xFFFFFFFF;
                    played.image.timestampMs = 5;
                }),
                ElementsAre("type \"state\" \"image\"", "frame 0 4294967295", "device_ms 0 5"));
    EXPECT_THAT(changesOf([](auto&, auto& algs) { algs._touchPixels[2]._value = -1; }),
                ElementsAre("pixels[C]._value 0 -1"));
    EXPECT_THAT(changesOf([](auto&, auto& algs) { algs._touchPixels[0]._progress = -0.0F; }),
                ElementsAre("pixels[A]._progress 0.0 -0.0"));
    EXPECT_THAT(changesOf([](auto&, auto& algs) { algs._virtualPixels[22]._wasActive = true; }),
                ElementsAre("virtual[MNO]._wasActive false true"));
    EXPECT_THAT(changesOf([](auto&, auto& algs) {
                    algs._handStats._regionMax[2] = std::numeric_limits<float>::infinity();
                }),
                ElementsAre("hand._regionMax[2] 0.0 \"inf\""));
    EXPECT_THAT(changesOf([](auto&, auto& algs) { algs._handStats._svm._score = 0.1F; }),
                ElementsAre("hand._svm._score 0.0 0.1"));
    EXPECT_THAT(changesOf([](auto&, auto& algs) { algs._lastDispatchedPhase = 8; }),
                ElementsAre("lastDispatchedPhase 0 8"));
    EXPECT_THAT(
        changesOf([](auto&, auto& algs) { algs._EventStats._stats.numTaps = ~std::uint64_t{0}; }),
        ElementsAre("stats.numTaps 0 18446744073709551615"));
}

TEST(StateSnapshotTest, EveryNotANumberEqualsEveryOther) {
    const auto with = [](float value) {
        return changed([value](auto&, auto& algs) { algs._handStats._touch_score = value; });
    };
    const float nan = std::numeric_limits<float>::quiet_NaN();
    EXPECT_THAT(differences(with(nan), with(-nan)), IsEmpty());
    EXPECT_THAT(differences(with(nan), with(1.0F)), ElementsAre("hand._touch_score \"nan\" 1.0"));
}

}  // namespace
}  // namespace VexaTouch::Tools
