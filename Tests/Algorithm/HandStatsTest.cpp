#include "Algorithm/HandStats.h"

#include "Algorithm/StateFields.h"
#include "Tests/Support/Channels.h"
#include "Tests/Support/StateSnapshot.h"

#include <gmock/gmock.h>

#include <bit>
#include <cmath>
#include <limits>
#include <map>
#include <stdexcept>
#include <string>
#include <vector>

namespace VexaTouch {
namespace {

using Testing::Channels;
using ::testing::ElementsAre;
using Testing::everything;
using ::testing::IsEmpty;
using ::testing::Key;
using Testing::nothing;
using Testing::touch;
using Testing::Touch;
using ::testing::UnorderedElementsAre;

using Fields = std::map<std::string, std::uint64_t>;

Fields fieldsOf(const HandStats& hand) {
    Fields fields;
    forEachHandStatsField(hand, [&fields](std::string_view name, const auto& field) {
        if constexpr (requires { field.size(); }) {
            for (std::size_t i = 0; i < field.size(); ++i) {
                fields[std::string(name) + std::to_string(i)] = Testing::fieldBits(field[i]);
            }
        } else {
            fields[std::string(name)] = Testing::fieldBits(field);
        }
    });
    return fields;
}

/// The fields that differ, by name.
Fields changes(const HandStats& before, const HandStats& after) {
    const Fields old = fieldsOf(before);
    Fields changed;
    for (const auto& [name, content] : fieldsOf(after)) {
        if (old.at(name) != content) {
            changed[name] = content;
        }
    }
    return changed;
}

/// A hand on a surface, one frame at a time.
class HandStatsTest : public ::testing::Test {
protected:
    void feel(const Touch& touch, std::uint32_t timeMs) {
        channels.feel(touch, hand._activationThreshold);
        hand.updateHandState(channels.pixels, channels.virtualPixels, timeMs);
    }
    void feelEvery10Ms(const Touch& touch, std::uint32_t fromMs, std::uint32_t untilMs) {
        for (std::uint32_t timeMs = fromMs; timeMs < untilMs; timeMs += 10) {
            feel(touch, timeMs);
        }
    }
    PixelRegion updateActiveRegion(std::uint32_t timeMs) {
        return hand.updateActiveRegion(channels.pixels, channels.virtualPixels, timeMs);
    }

    Channels channels;
    HandStats hand;
};

TEST_F(HandStatsTest, BeginsWithItsDefaults) {
    Fields expected = {{"_hold_timeout_ms", 500},
                       {"_enableHoldSuppression", 1},
                       {"_enableTapSuppression", 1},
                       {"_y_cutoff", 0x40EC7326},
                       {"_activationThreshold", std::bit_cast<std::uint32_t>(200.0F)},
                       {"_touch_score_barrier", std::bit_cast<std::uint32_t>(100.0F)},
                       {"_regionChangeThresh", std::bit_cast<std::uint32_t>(1.3F)}};
    Fields actual = fieldsOf(hand);
    EXPECT_EQ(actual.size(), 43U);
    std::erase_if(actual, [](const auto& field) { return field.second == 0; });
    EXPECT_EQ(actual, expected);
}

TEST_F(HandStatsTest, ResetClearsPeakAndScoreAlone) {
    feelEvery10Ms(touch("A").at(350), 1000, 2000);
    const HandStats before = hand;
    hand.Reset();
    EXPECT_THAT(changes(before, hand),
                UnorderedElementsAre(Key("_touch_score"), Key("_max_pixel_value"),
                                     Key("_peak_pixel_progress")));
    EXPECT_EQ(hand._touch_score, 0.0F);
    EXPECT_EQ(hand._max_pixel_value, 0.0F);
    EXPECT_EQ(hand._peak_pixel_progress, 0.0F);

    hand._peak_pixel_index = 7;
    hand.Reset();
    EXPECT_EQ(hand._peak_pixel_index, 0);
}

TEST_F(HandStatsTest, DecayParametersGoBackToTheirDefault) {
    hand._y_cutoff = 3.0F;
    hand.SetDecayParameters();
    EXPECT_THAT(changes(HandStats(), hand), IsEmpty());
}

// Lines.

TEST_F(HandStatsTest, ALineGoesThroughBothOfItsPoints) {
    EXPECT_EQ(HandStats::fuzzify(2.0F, 2.0F, 4.0F, 10.0F, 20.0F), 10.0F);
    EXPECT_EQ(HandStats::fuzzify(4.0F, 2.0F, 4.0F, 10.0F, 20.0F), 20.0F);
    EXPECT_EQ(HandStats::fuzzify(3.0F, 2.0F, 4.0F, 10.0F, 20.0F), 15.0F);
    EXPECT_EQ(HandStats::fuzzify(6.0F, 2.0F, 4.0F, 10.0F, 20.0F), 30.0F);
}

TEST_F(HandStatsTest, AClippedLineIsHeldAtItsEnds) {
    EXPECT_EQ(HandStats::fuzzifyAndClip(0.1F, 0.2F, 0.5F, 1.3F, 5.0F), 1.3F);
    EXPECT_EQ(HandStats::fuzzifyAndClip(0.2F, 0.2F, 0.5F, 1.3F, 5.0F), 1.3F);
    EXPECT_EQ(HandStats::fuzzifyAndClip(0.5F, 0.2F, 0.5F, 1.3F, 5.0F), 5.0F);
    EXPECT_EQ(HandStats::fuzzifyAndClip(9.0F, 0.2F, 0.5F, 1.3F, 5.0F), 5.0F);
    EXPECT_EQ(HandStats::fuzzifyAndClip(0.35F, 0.2F, 0.5F, 1.3F, 5.0F),
              HandStats::fuzzify(0.35F, 0.2F, 0.5F, 1.3F, 5.0F));
    EXPECT_NEAR(HandStats::fuzzifyAndClip(0.35F, 0.2F, 0.5F, 1.3F, 5.0F), 3.15F, 1e-5);
}

TEST_F(HandStatsTest, TheTimeBiasRisesFromThreeTenthsToOneSecondAfterAnEvent) {
    hand._lastEventTimestamp_ms = 5000;
    EXPECT_EQ(hand.updateTimeBiasFactor(5000), 0.65F);
    EXPECT_EQ(hand.updateTimeBiasFactor(5300), 0.65F);
    EXPECT_GT(hand.updateTimeBiasFactor(5301), 0.65F);
    EXPECT_NEAR(hand.updateTimeBiasFactor(5650), 0.825F, 1e-6);
    EXPECT_LT(hand.updateTimeBiasFactor(5999), 1.0F);
    EXPECT_EQ(hand.updateTimeBiasFactor(6000), 1.0F);
    // A clock that stepped back is a long time ahead.
    EXPECT_EQ(hand.updateTimeBiasFactor(4999), 1.0F);
    hand._lastEventTimestamp_ms = 0xFFFFFFF0U;
    EXPECT_EQ(hand.updateTimeBiasFactor(100), 0.65F);
}

// Touch score.

TEST_F(HandStatsTest, TheTouchScoreDecaysWithinTwoMilliseconds) {
    const auto decayed = [this](float score, std::uint32_t belowNoise, std::uint32_t timeMs) {
        hand._touch_score = score;
        hand._belowNoiseTimestamp_ms = belowNoise;
        hand.decayTouchScore(timeMs);
        return hand._touch_score;
    };
    EXPECT_NEAR(decayed(-50.0F, 1000, 1001), -42.17F, 0.005);
    EXPECT_NEAR(decayed(100.0F, 1000, 1001), 84.35F, 0.005);
    EXPECT_NEAR(decayed(100.0F, 1000, 1002), 57.45F, 0.005);
    EXPECT_EQ(decayed(100.0F, 1000, 1003), 0.0F);
    EXPECT_EQ(decayed(-100.0F, 1000, 1003), 0.0F);
}

TEST_F(HandStatsTest, AHugeTimeDifferenceDecaysToZeroAndNeverToNoNumber) {
    for (const float score : {100.0F, -100.0F, 1e-45F, 0.0F}) {
        for (const std::uint32_t timeMs : {1000U, 5000U, 0U, 0x80000000U}) {
            hand._touch_score = score;
            hand._belowNoiseTimestamp_ms = 1000;  // 1000 itself is 2^32 - 1 ms behind
            hand.decayTouchScore(timeMs);
            EXPECT_EQ(hand._touch_score, 0.0F) << score << " at " << timeMs;
        }
    }
}

TEST_F(HandStatsTest, TheDecayComesBeforeTheNewScore) {
    feel(nothing(), 999);
    hand._touch_score = 100.0F;
    hand._belowNoiseTimestamp_ms = 1000;
    feel(touch("A").at(350), 1001);  // rises above noise 1 ms after it fell below
    HandStats decayed;
    decayed._touch_score = 100.0F;
    decayed._belowNoiseTimestamp_ms = 1000;
    decayed.decayTouchScore(1001);
    EXPECT_GT(hand._svm._score, 0.0F);
    EXPECT_EQ(hand._touch_score, decayed._touch_score + hand._svm._score);
}

TEST_F(HandStatsTest, TheTouchScoreDecaysOnlyWhenNoiseIsLeftBehind) {
    feel(touch("A").at(350), 1000);
    const float once = hand._touch_score;
    EXPECT_EQ(once, hand._svm._score);
    feel(touch("A").at(350), 1500);
    EXPECT_EQ(hand._touch_score, once + once);
}

TEST_F(HandStatsTest, TheTouchScoreStaysWithinItsBarrier) {
    feelEvery10Ms(touch("A").at(350), 1000, 2000);
    EXPECT_EQ(hand._touch_score, 100.0F);
    feelEvery10Ms(everything(300), 2000, 3000);
    EXPECT_EQ(hand._touch_score, -100.0F);
    feel(everything(32767), 3000);
    EXPECT_EQ(hand._touch_score, 100.0F);
}

// Edges of touch and noise.

TEST_F(HandStatsTest, EdgesOfNoiseAndTouchAreStamped) {
    feel(nothing(), 100);
    feel(touch("H").at(100), 110);  // above noise, not touching
    EXPECT_TRUE(hand._isAboveNoiseLevel);
    EXPECT_FALSE(hand._isTouching);
    EXPECT_EQ(hand._aboveNoiseTimestamp_ms, 110U);
    feel(touch("H").at(300), 120);
    EXPECT_TRUE(hand._isTouching);
    EXPECT_FALSE(hand._wasTouching);
    EXPECT_EQ(hand._touchdownTimestamp_ms, 120U);
    feel(touch("H").at(300), 130);
    EXPECT_TRUE(hand._wasTouching);
    feel(touch("H").at(100), 140);
    EXPECT_FALSE(hand._isTouching);
    EXPECT_EQ(hand._liftoffTimestamp_ms, 140U);
    feel(nothing(), 150);
    EXPECT_FALSE(hand._isAboveNoiseLevel);
    EXPECT_TRUE(hand._wasAboveNoiseLevel);
    EXPECT_EQ(hand._belowNoiseTimestamp_ms, 150U);
    feel(nothing(), 160);
    EXPECT_EQ(hand._aboveNoiseTimestamp_ms, 110U);
    EXPECT_EQ(hand._touchdownTimestamp_ms, 120U);
    EXPECT_EQ(hand._liftoffTimestamp_ms, 140U);
    EXPECT_EQ(hand._belowNoiseTimestamp_ms, 150U);
}

TEST_F(HandStatsTest, ThePeakIsTheStrongestActiveChannelOfTheWholeTouch) {
    feel(touch("H").at(300), 100);
    EXPECT_EQ(hand._peak_pixel_progress, 1.5F);
    EXPECT_EQ(hand._peak_pixel_index, 7);
    feel(touch("H").at(250).with("A", 300), 110);
    EXPECT_EQ(hand._peak_pixel_index, 0);
    EXPECT_EQ(hand._peak_pixel_progress, channels.pixel('A')._progress);
    feel(touch("H").at(400), 120);
    EXPECT_EQ(hand._peak_pixel_index, 0);  // 2.0 is less than A's 2.88
}

TEST_F(HandStatsTest, OnATieThePixelWinsOverTheGroup) {
    channels.feel(nothing());
    channels.pixel('B')._isActive = true;
    channels.pixel('B')._progress = 2.0F;
    channels.virtualPixels[3]._isActive = true;
    channels.virtualPixels[3]._progress = 2.0F;
    channels.virtualPixels[3]._index = 9;
    hand.updateHandState(channels.pixels, channels.virtualPixels, 100);
    EXPECT_EQ(hand._peak_pixel_index, 1);
}

TEST_F(HandStatsTest, ThePeakLooksAtActiveChannelsOnlyTheStrongestAtAll) {
    // A hold in region 1 whose pixel fades; H is stronger but not active.
    feel(touch("A").at(150), 100);
    hand._isHolding = true;
    const std::int32_t peak = hand._peak_pixel_index;
    const float progress = hand._peak_pixel_progress;
    channels.feel(touch("A").at(150).with("H", 400));
    channels.pixel('H')._isActive = false;
    hand.updateHandState(channels.pixels, channels.virtualPixels, 110);
    EXPECT_EQ(hand._peak_pixel_index, peak);
    EXPECT_EQ(hand._peak_pixel_progress, progress);
    EXPECT_EQ(hand._previousActiveRegion, 1);
    EXPECT_EQ(hand._activeRegion, 3);
}

TEST_F(HandStatsTest, TheRegionStaysWhenTheTouchEnds) {
    feel(touch("L").at(300), 100);
    EXPECT_EQ(hand._activeRegion, 2);
    feel(nothing(), 110);
    feel(nothing(), 120);
    EXPECT_EQ(hand._activeRegion, 2);
}

// Holds.

TEST_F(HandStatsTest, ATouchBecomesAHoldStrictlyAfterTheTimeout) {
    feel(touch("A").at(350), 1000);
    feel(touch("A").at(350), 1500);
    EXPECT_FALSE(hand._isHolding);
    EXPECT_FALSE(hand._wouldBeIsHolding);
    feel(touch("A").at(350), 1501);
    EXPECT_TRUE(hand._isHolding);
    EXPECT_FALSE(hand._wasHolding);
    EXPECT_TRUE(hand._wouldBeIsHolding);
    EXPECT_FALSE(hand._isHoldSuppressed);
    feel(touch("A").at(350), 1502);
    EXPECT_TRUE(hand._wasHolding);
    EXPECT_TRUE(hand._wouldBeWasHolding);
}

TEST_F(HandStatsTest, TheTimeoutIsMeasuredAcrossTheWrapOfTheClock) {
    feel(touch("A").at(350), 0xFFFFFF00U);
    feel(touch("A").at(350), 0xFFFFFF00U + 500U);
    EXPECT_FALSE(hand._isHolding);
    feel(touch("A").at(350), 0xFFFFFF00U + 501U);
    EXPECT_TRUE(hand._isHolding);
}

TEST_F(HandStatsTest, ALowScoreSuppressesAHoldThatHasNotBegun) {
    feel(everything(300), 1000);
    feel(everything(300), 1501);
    EXPECT_LT(hand._touch_score, 0.0F);
    EXPECT_FALSE(hand._isHolding);
    EXPECT_TRUE(hand._isHoldSuppressed);
    EXPECT_FALSE(hand._wasHoldSuppressed);
    EXPECT_TRUE(hand._wouldBeIsHolding);
    feel(everything(300), 1511);
    EXPECT_TRUE(hand._isHoldSuppressed);
    EXPECT_TRUE(hand._wasHoldSuppressed);
    feel(nothing(), 1521);
    EXPECT_FALSE(hand._isHoldSuppressed);
    EXPECT_FALSE(hand._wouldBeIsHolding);
    EXPECT_TRUE(hand._wouldBeWasHolding);
}

TEST_F(HandStatsTest, ASuppressedHoldBeginsOnceTheScoreAllowsIt) {
    feel(everything(300), 1000);
    feel(everything(300), 1501);
    ASSERT_TRUE(hand._isHoldSuppressed);
    feelEvery10Ms(touch("A").at(600), 1511, 2011);
    EXPECT_TRUE(hand._isHolding);
    EXPECT_FALSE(hand._isHoldSuppressed);
}

TEST_F(HandStatsTest, ALowScoreDoesNotEndAHold) {
    feel(touch("A").at(350), 1000);
    feel(touch("A").at(350), 1501);
    ASSERT_TRUE(hand._isHolding);
    feelEvery10Ms(everything(300), 1511, 2011);
    EXPECT_LT(hand._touch_score, 0.0F);
    EXPECT_TRUE(hand._isHolding);
    EXPECT_FALSE(hand._isHoldSuppressed);
}

TEST_F(HandStatsTest, AScoreAtTheThresholdIsEnough) {
    feel(touch("H").at(300), 1000);
    feel(touch("H").at(300), 1010);
    hand._touch_score_threshold = hand._touch_score + hand._svm._score;
    feel(touch("H").at(300), 1501);
    EXPECT_EQ(hand._touch_score, hand._touch_score_threshold);
    EXPECT_TRUE(hand._isHolding);
}

TEST_F(HandStatsTest, AScoreThatDoesNotCompareAllowsTheHold) {
    hand._touch_score_threshold = std::numeric_limits<float>::quiet_NaN();
    feel(everything(300), 1000);
    feel(everything(300), 1501);
    EXPECT_TRUE(hand._isHolding);
    EXPECT_FALSE(hand._isHoldSuppressed);
}

TEST_F(HandStatsTest, WithoutHoldSuppressionTheHoldFollowsTheTimeout) {
    hand._enableHoldSuppression = false;
    feel(everything(300), 1000);
    feel(everything(300), 1500);
    EXPECT_FALSE(hand._isHolding);
    feel(everything(300), 1501);
    EXPECT_TRUE(hand._isHolding);
    EXPECT_FALSE(hand._isHoldSuppressed);
    EXPECT_FALSE(hand._wouldBeIsHolding);
    feel(nothing(), 1511);
    EXPECT_FALSE(hand._isHolding);
    EXPECT_TRUE(hand._wasHolding);
}

TEST_F(HandStatsTest, FlagsOfASuppressionSwitchedOffInMidTouchStayFrozen) {
    feel(everything(300), 1000);
    feel(everything(300), 1501);
    ASSERT_TRUE(hand._isHoldSuppressed);
    hand._enableHoldSuppression = false;
    feel(everything(300), 1511);
    EXPECT_TRUE(hand._isHolding);
    EXPECT_TRUE(hand._isHoldSuppressed);
    EXPECT_TRUE(hand._wouldBeIsHolding);
    feel(nothing(), 1521);
    feel(nothing(), 1531);
    EXPECT_FALSE(hand._isHolding);
    EXPECT_TRUE(hand._isHoldSuppressed);
    EXPECT_TRUE(hand._wasHoldSuppressed);
    EXPECT_TRUE(hand._wouldBeIsHolding);
    EXPECT_TRUE(hand._wouldBeWasHolding);
    // A touch now ends without a tap, since a hold seems to have been due.
    feel(touch("A").at(350), 2000);
    feel(nothing(), 2100);
    EXPECT_FALSE(hand._maybeTap);
    EXPECT_FALSE(hand._isTap);
    hand._enableHoldSuppression = true;
    feel(nothing(), 2110);
    EXPECT_FALSE(hand._isHoldSuppressed);
    EXPECT_FALSE(hand._wouldBeIsHolding);
}

TEST_F(HandStatsTest, ATimeoutRaisedInMidHoldEndsIt) {
    feel(touch("A").at(350), 1000);
    feel(touch("A").at(350), 1501);
    ASSERT_TRUE(hand._isHolding);
    hand._hold_timeout_ms = 4294967295U;
    feel(touch("A").at(350), 1511);
    EXPECT_FALSE(hand._isHolding);
    EXPECT_TRUE(hand._isTouching);
    EXPECT_EQ(hand._lastEventTimestamp_ms, 1511U);
}

TEST_F(HandStatsTest, WithATimeoutOfZeroTheSecondMillisecondHolds) {
    hand._hold_timeout_ms = 0;
    feel(touch("A").at(350), 1000);
    EXPECT_FALSE(hand._isHolding);
    feel(touch("A").at(350), 1001);
    EXPECT_TRUE(hand._isHolding);
}

TEST_F(HandStatsTest, AClockThatStepsBackIsALongHold) {
    feel(touch("A").at(350), 1000);
    feel(touch("A").at(350), 999);
    EXPECT_TRUE(hand._isHolding);
}

TEST_F(HandStatsTest, TheEndOfAHoldIsAnEvent) {
    feel(touch("L").at(350), 1000);
    feel(touch("L").at(350), 1501);
    EXPECT_EQ(hand._lastEventTimestamp_ms, 0U);
    feel(nothing(), 1600);
    EXPECT_EQ(hand._lastEventTimestamp_ms, 1600U);
    EXPECT_EQ(hand._last_event_activeRegion, 2);
}

// Taps.

TEST_F(HandStatsTest, ATouchReleasedBeforeTheTimeoutIsATap) {
    feelEvery10Ms(touch("A").at(350), 1000, 1300);
    EXPECT_FALSE(hand._maybeTap);
    feel(nothing(), 1300);
    EXPECT_TRUE(hand._maybeTap);
    EXPECT_TRUE(hand._isTap);
    EXPECT_FALSE(hand._isTapSuppressed);
    EXPECT_GT(hand._tap_svm_score, 0.0F);
    EXPECT_EQ(hand._lastEventTimestamp_ms, 1300U);
    EXPECT_EQ(hand._last_event_activeRegion, 1);
    feel(nothing(), 1310);
    EXPECT_FALSE(hand._maybeTap);
    EXPECT_FALSE(hand._isTap);
    EXPECT_EQ(hand._lastEventTimestamp_ms, 1300U);
}

TEST_F(HandStatsTest, AfterTheTimeoutALiftOffIsNeverATap) {
    feel(everything(300), 1000);
    feel(everything(300), 1501);  // a hold that is suppressed
    feel(nothing(), 1511);
    EXPECT_FALSE(hand._maybeTap);
    EXPECT_FALSE(hand._isTap);
    EXPECT_FALSE(hand._isTapSuppressed);  // cleared, whatever the classifier said
    EXPECT_EQ(hand._lastEventTimestamp_ms, 0U);
}

TEST_F(HandStatsTest, ALiftOffOnTheVeryFrameOfTheTimeoutMayBeATap) {
    feel(touch("A").at(350), 1000);
    feel(touch("A").at(350), 1500);
    feel(nothing(), 1501);
    EXPECT_TRUE(hand._maybeTap);
    EXPECT_TRUE(hand._isTap);
}

TEST_F(HandStatsTest, ARejectedTapIsKeptAsSuchOnItsFrameAlone) {
    const Touch palm = everything(60).with("G", 220);
    feelEvery10Ms(palm, 1000, 1120);
    EXPECT_FALSE(hand._isTapSuppressed);  // decided at the lift-off
    feel(nothing(), 1120);
    EXPECT_TRUE(hand._maybeTap);
    EXPECT_FALSE(hand._isTap);
    EXPECT_TRUE(hand._isTapSuppressed);
    EXPECT_LT(hand._nonActivePixels_thresholded, 0);
    EXPECT_EQ(hand._lastEventTimestamp_ms, 0U);
    feel(nothing(), 1130);
    EXPECT_FALSE(hand._isTapSuppressed);
}

TEST_F(HandStatsTest, WithoutTapSuppressionEveryShortTouchIsATap) {
    hand._enableTapSuppression = false;
    feelEvery10Ms(everything(60).with("G", 220), 1000, 1120);
    feel(nothing(), 1120);
    EXPECT_TRUE(hand._maybeTap);
    EXPECT_TRUE(hand._isTap);
    EXPECT_TRUE(hand._isTapSuppressed);  // computed, not looked at
    feel(nothing(), 1130);
    EXPECT_FALSE(hand._maybeTap);
    EXPECT_FALSE(hand._isTap);
}

TEST_F(HandStatsTest, ATouchWithoutDurationIsNoTap) {
    feel(touch("A").at(350), 1000);
    feel(nothing(), 1000);
    EXPECT_EQ(hand._touchingSignalDerivative_thresholded, 0.0F);
    EXPECT_TRUE(hand._maybeTap);
    EXPECT_TRUE(hand._isTapSuppressed);
    EXPECT_FALSE(hand._isTap);
}

TEST_F(HandStatsTest, TheTapFeaturesAreThoseOfTheTouch) {
    feel(touch("H").at(100), 1000);
    feel(touch("H").at(400), 1100);
    feel(nothing(), 1300);
    // 300 ms above noise, 200 of them touching.
    EXPECT_EQ(hand._max_pixel_value, 400.0F);
    EXPECT_EQ(hand._signalDerivative_thresholded, 400.0F / 300.0F - 0.51F);
    EXPECT_EQ(hand._timeDurationRatio_thresholded, 200.0F / 300.0F - 0.25F);
    EXPECT_EQ(hand._touchingSignalDerivative_thresholded, 400.0F / 200.0F - 0.65F);
    EXPECT_EQ(hand._nonActivePixels_thresholded, 20);  // "BFHJ" is active, "GHI" is; "HIJ" is not
    EXPECT_EQ(hand._tap_svm_score, hand._signalDerivative_thresholded * 0.2772F +
                                       hand._timeDurationRatio_thresholded * 2.7205F +
                                       20.0F * 0.1886F - 2.4116F);
}

TEST_F(HandStatsTest, AnEventSoonBeforeShortensTheFeaturesTime) {
    hand._liftoffTimestamp_ms = 2000;
    hand._touchdownTimestamp_ms = 1900;
    hand._aboveNoiseTimestamp_ms = 1500;
    hand._lastEventTimestamp_ms = 1800;
    hand._peak_pixel_progress = 1.0F;
    hand.updateTapRejection(channels.pixels, channels.virtualPixels);
    EXPECT_EQ(hand._signalDerivative_thresholded, 200.0F / 200.0F - 0.51F);
    EXPECT_EQ(hand._timeDurationRatio_thresholded, 100.0F / 200.0F - 0.25F);
}

TEST_F(HandStatsTest, TimesOfTheFeaturesAreRoundedBeforeTheyDivide) {
    hand._liftoffTimestamp_ms = 16777217;  // not a single-precision number
    hand._peak_pixel_progress = 16777216.0F;
    hand._activationThreshold = 1.0F;
    hand.updateTapRejection(channels.pixels, channels.virtualPixels);
    EXPECT_EQ(hand._timeDurationRatio_thresholded, 1.0F - 0.25F);
    EXPECT_EQ(hand._signalDerivative_thresholded, 1.0F - 0.51F);
}

TEST_F(HandStatsTest, OtherFramesUseTheOldLiftOff) {
    feel(touch("H").at(400), 1000);
    // Of a touch that lasts only lift-off 0 is known: 2^32 - 1000 ms.
    EXPECT_EQ(hand._touchingSignalDerivative_thresholded,
              400.0F / static_cast<float>(0U - 1000U) - 0.65F);
    feel(nothing(), 1100);
    const float ratio = hand._timeDurationRatio_thresholded;
    feel(nothing(), 9999);
    // The lift-off and the tap that it was are the same moment, so there is no time to divide by.
    EXPECT_EQ(hand._timeDurationRatio_thresholded, 0.0F);
    EXPECT_EQ(ratio, 0.75F);
}

TEST_F(HandStatsTest, ANoTimeAboveNoiseIsNotRejected) {
    hand._liftoffTimestamp_ms = 2000;
    hand._touchdownTimestamp_ms = 1900;
    hand._aboveNoiseTimestamp_ms = 2000;
    hand._peak_pixel_progress = 2.0F;
    hand.updateTapRejection(channels.pixels, channels.virtualPixels);
    EXPECT_EQ(hand._signalDerivative_thresholded, 0.0F);
    EXPECT_EQ(hand._timeDurationRatio_thresholded, 0.0F);
    EXPECT_FALSE(hand._isTapSuppressed);
}

TEST_F(HandStatsTest, EachFeatureAloneRejectsTheTap) {
    // The verdict on a touch of this peak value, time above noise and time touching, and the tests
    // that reject it.
    const auto reasons = [this](float peak, std::uint32_t aboveNoiseMs, std::uint32_t touchingMs) {
        hand = HandStats();
        hand._liftoffTimestamp_ms = 20000;
        hand._touchdownTimestamp_ms = 20000 - touchingMs;
        hand._aboveNoiseTimestamp_ms = 20000 - aboveNoiseMs;
        hand._peak_pixel_progress = peak / 200.0F;
        hand.updateTapRejection(channels.pixels, channels.virtualPixels);
        std::string text;
        text += hand._touchingSignalDerivative_thresholded <= 0.0F ? "touching " : "";
        text += hand._signalDerivative_thresholded < 0.0F ? "signal " : "";
        text += hand._nonActivePixels_thresholded < 0 ? "pixels " : "";
        text += hand._timeDurationRatio_thresholded < 0.0F ? "ratio " : "";
        text += hand._tap_svm_score < 0.0F ? "score " : "";
        EXPECT_EQ(hand._isTapSuppressed, !text.empty());
        return text;
    };
    EXPECT_EQ(reasons(600.0F, 100, 100), "");
    EXPECT_EQ(reasons(600.0F, 100, 0), "touching ratio ");
    EXPECT_EQ(reasons(60.0F, 100, 100), "touching ");
    EXPECT_EQ(reasons(100.0F, 200, 100), "signal ");
    EXPECT_EQ(reasons(600.0F, 500, 100), "ratio ");
    for (std::size_t i = 0; i < 21; ++i) {
        channels.virtualPixels[i]._wasAboveNoise = true;
    }
    EXPECT_EQ(reasons(200.0F, 200, 150), "score ");
    EXPECT_EQ(reasons(2000.0F, 100, 100), "");
    channels.virtualPixels[21]._wasAboveNoise = true;
    EXPECT_EQ(reasons(2000.0F, 100, 100), "pixels ");
}

TEST_F(HandStatsTest, TwentyTwoChannelsThatWereNeverActiveAreOneTooMany) {
    hand._liftoffTimestamp_ms = 2000;
    hand._touchdownTimestamp_ms = 1900;
    hand._aboveNoiseTimestamp_ms = 1900;
    hand._peak_pixel_progress = 30.0F;
    for (std::size_t i = 0; i < 15; ++i) {
        channels.pixels[i]._wasAboveNoise = true;
    }
    for (std::size_t i = 0; i < 6; ++i) {
        channels.virtualPixels[i]._wasAboveNoise = true;
    }
    channels.virtualPixels[8]._wasAboveNoise = true;
    channels.virtualPixels[8]._wasActive = true;  // does not count
    hand.updateTapRejection(channels.pixels, channels.virtualPixels);
    EXPECT_EQ(hand._nonActivePixels_thresholded, 0);
    EXPECT_FALSE(hand._isTapSuppressed);
    channels.virtualPixels[22]._wasAboveNoise = true;
    hand.updateTapRejection(channels.pixels, channels.virtualPixels);
    EXPECT_EQ(hand._nonActivePixels_thresholded, -1);
    EXPECT_TRUE(hand._isTapSuppressed);
}

// Regions while touching.

TEST_F(HandStatsTest, TheRegionIsThatOfThePeak) {
    feel(touch("G").at(300), 1000);
    EXPECT_EQ(hand._activeRegion, 3);
    EXPECT_EQ(hand._previousActiveRegion, 0);
    feel(touch("G").at(300).with("A", 300), 1010);
    EXPECT_EQ(hand._activeRegion, 1);
    EXPECT_EQ(hand._previousActiveRegion, 0);  // of changeActiveRegion alone
}

TEST_F(HandStatsTest, TheRegionOfARecentEventKeepsATouchThatNearlyLiesOnIt) {
    hand._last_event_activeRegion = 2;
    hand._lastEventTimestamp_ms = 1000;
    const Touch between = touch("G").at(250).with("O", 200);  // 252 and 209
    feel(between, 1300);
    EXPECT_EQ(hand._activeRegion, 2);
    feel(between, 1650);  // bias 0.825: 209 > 207.9
    EXPECT_EQ(hand._activeRegion, 2);
    feel(between, 1700);  // bias 0.85
    EXPECT_EQ(hand._activeRegion, 3);
}

TEST_F(HandStatsTest, AThirdRegionIsNotKept) {
    hand._last_event_activeRegion = 1;
    hand._lastEventTimestamp_ms = 1000;
    feel(touch("G").at(250).with("O", 200), 1100);
    EXPECT_EQ(hand._activeRegion, 3);
}

TEST_F(HandStatsTest, ASecondPixelInTheNoiseKeepsNothing) {
    hand._last_event_activeRegion = 2;
    hand._lastEventTimestamp_ms = 1000;
    channels.feel(nothing());
    channels.pixel('G')._maxProgressAboveNoise = 0.4F;
    channels.pixel('O')._maxProgressAboveNoise = 75.0F / 200.0F;
    hand._peak_pixel_index = 6;
    EXPECT_EQ(updateActiveRegion(1100), 3);
    channels.pixel('O')._maxProgressAboveNoise = std::nextafter(75.0F / 200.0F, 1.0F);
    EXPECT_EQ(updateActiveRegion(1100), 2);
}

TEST_F(HandStatsTest, TheStrongestPixelMustLieInTheRegionOfThePeak) {
    hand._last_event_activeRegion = 2;
    hand._lastEventTimestamp_ms = 1000;
    channels.pixel('A')._maxProgressAboveNoise = 2.0F;
    channels.pixel('O')._maxProgressAboveNoise = 1.9F;
    hand._peak_pixel_index = 6;
    EXPECT_EQ(updateActiveRegion(1100), 3);
    hand._peak_pixel_index = 4;
    EXPECT_EQ(updateActiveRegion(1100), 2);
}

TEST_F(HandStatsTest, AmongEquallyStrongPixelsTheFirstChannelsCount) {
    hand._last_event_activeRegion = 2;
    hand._lastEventTimestamp_ms = 1000;
    for (const char letter : {'G', 'L', 'O'}) {
        channels.pixel(letter)._maxProgressAboveNoise = 2.0F;
    }
    hand._peak_pixel_index = 6;
    EXPECT_EQ(updateActiveRegion(1100), 2);  // G, then L
    channels.pixel('H')._maxProgressAboveNoise = 2.0F;
    EXPECT_EQ(updateActiveRegion(1100), 3);  // G, then H
}

// K = 483, M = 200 and L = 130 make "KLM" 325: between 0.65 and 0.7 of K. Likewise for I and J.
const Touch kKWithM = touch("K").at(200).with("M", 130).with("L", 85);
const Touch kKWithI = touch("K").at(200).with("I", 135).with("J", 87);

TEST_F(HandStatsTest, KIsPlayPauseUnlessANeighbourSharesTheTouch) {
    feel(touch("K").at(200), 5000);
    EXPECT_EQ(hand._activeRegion, 1);
    EXPECT_EQ(hand._peak_pixel_index, 10);
}

TEST_F(HandStatsTest, KGoesToTheNeighbourWhoseGroupHasSevenTenthsOfIt) {
    feel(kKWithM, 5000);
    ASSERT_EQ(channels.virtualPixels[19]._value, 325);
    EXPECT_EQ(hand._activeRegion, 1);
    feel(kKWithM.with("L", 110), 5010);  // "KLM" 340
    ASSERT_EQ(hand._peak_pixel_index, 10);
    EXPECT_EQ(hand._activeRegion, 2);
}

TEST_F(HandStatsTest, KGoesUpWithIAsItGoesDownWithM) {
    feel(kKWithI, 5000);
    ASSERT_EQ(channels.virtualPixels[18]._value, 325);
    EXPECT_EQ(hand._activeRegion, 1);
    feel(kKWithI.with("J", 113), 5010);
    ASSERT_EQ(hand._peak_pixel_index, 10);
    EXPECT_EQ(hand._activeRegion, 3);
}

TEST_F(HandStatsTest, ARecentEventMakesKGoToItsRegionEarlier) {
    hand._last_event_activeRegion = 2;
    hand._lastEventTimestamp_ms = 5000;
    feel(kKWithM, 5100);
    EXPECT_EQ(hand._activeRegion, 2);  // 0.65 of K is enough
    feel(kKWithM, 6100);
    EXPECT_EQ(hand._activeRegion, 1);  // never more than 0.7

    hand._last_event_activeRegion = 3;
    hand._lastEventTimestamp_ms = 7000;
    feel(kKWithM, 7100);
    EXPECT_EQ(hand._activeRegion, 1);  // of the other region
}

TEST_F(HandStatsTest, ARecentEventUpMakesKGoUpEarlier) {
    hand._last_event_activeRegion = 3;
    hand._lastEventTimestamp_ms = 5000;
    feel(kKWithI, 5100);
    EXPECT_EQ(hand._activeRegion, 3);
    feel(kKWithI, 6100);
    EXPECT_EQ(hand._activeRegion, 1);
}

TEST_F(HandStatsTest, KWithAnotherNeighbourStaysPlayPause) {
    feel(touch("K").at(200).with("L", 250).with("M", 150), 5000);  // L is second
    ASSERT_EQ(hand._peak_pixel_index, 10);
    ASSERT_GT(channels.virtualPixels[19]._progress, 0.7F * channels.pixel('K')._progress);
    EXPECT_EQ(hand._activeRegion, 1);
}

TEST_F(HandStatsTest, KMustBeBothThePeakAndTheStrongestPixel) {
    feel(kKWithM.with("L", 110), 5000);
    ASSERT_EQ(hand._activeRegion, 2);
    hand._peak_pixel_index = 0;
    EXPECT_EQ(updateActiveRegion(5010), 1);
    hand._peak_pixel_index = 10;
    EXPECT_EQ(updateActiveRegion(5010), 2);
    channels.pixel('A')._maxProgressAboveNoise = 9.0F;
    EXPECT_EQ(updateActiveRegion(5010), 1);
}

TEST_F(HandStatsTest, AGroupThatKNeedsMustBeThere) {
    feel(kKWithM, 5000);
    channels.virtualPixels.resize(19, VirtualPixel("", 0, 1.0F));
    EXPECT_THROW((void)updateActiveRegion(5010), std::out_of_range);
}

TEST_F(HandStatsTest, RegionMaximaCountTheRealPixelsAboveNoise) {
    channels.feel(touch("H").at(300).with("G", 100).with("N", 60).with("A", -500));
    hand._regionMax.fill(9.0F);
    hand.updateRegionMax(channels.pixels);
    EXPECT_THAT(hand._regionMax, ElementsAre(0.0F, 0.0F, 0.0F, 225.0F));
}

TEST_F(HandStatsTest, RegionMaximaAreMeasuredWheneverARegionIsUpdated) {
    feel(touch("H").at(300), 1000);
    EXPECT_THAT(hand._regionMax, ElementsAre(0.0F, 0.0F, 0.0F, 225.0F));
    feel(nothing(), 1010);  // not touching: as the last touching frame left them
    EXPECT_THAT(hand._regionMax, ElementsAre(0.0F, 0.0F, 0.0F, 225.0F));
}

// Regions while holding.

class RegionChangeTest : public HandStatsTest {
protected:
    /// A hold in region 1 with these maxima of regions 1 and 3 in the frame before.
    void hold(float oldMax, float otherMax) {
        hand = HandStats();
        hand._activeRegion = 1;
        hand._regionMax = {0.0F, oldMax, 0.0F, otherMax};
        hand._regionChangeThresh = 9.0F;
    }
    /// The region when "H" has become the strongest channel and regions 1 and 3 measure this much.
    PixelRegion change(int oldMax, int otherMax) {
        channels.feel(nothing());
        channels.pixel('A')._value = oldMax + 75;
        channels.pixel('H')._value = otherMax + 75;
        return hand.changeActiveRegion(channels.pixels, 7);
    }
};

TEST_F(RegionChangeTest, TheSameRegionIsKeptAtOnceButRemembered) {
    hold(100.0F, 50.0F);
    hand._previousActiveRegion = 3;
    const HandStats before = hand;
    EXPECT_EQ(hand.changeActiveRegion(channels.pixels, 10), 1);  // K is of region 1
    EXPECT_EQ(hand._previousActiveRegion, 1);
    EXPECT_THAT(changes(before, hand), UnorderedElementsAre(Key("_previousActiveRegion")));
}

TEST_F(RegionChangeTest, NoRegionIsTakenAtOnce) {
    hold(100.0F, 50.0F);
    channels.pixels[7]._index = 15;
    EXPECT_EQ(hand.changeActiveRegion(channels.pixels, 7), 0);
    EXPECT_EQ(hand._previousActiveRegion, 1);
    EXPECT_THAT(hand._regionMax, ElementsAre(0.0F, 100.0F, 0.0F, 50.0F));
}

TEST_F(RegionChangeTest, FromNoRegionAnyOtherIsTakenAtOnce) {
    hold(100.0F, 50.0F);
    hand._activeRegion = 0;
    EXPECT_EQ(change(0, 0), 3);
    EXPECT_EQ(hand._previousActiveRegion, 0);
    EXPECT_THAT(hand._regionMax, ElementsAre(0.0F, 100.0F, 0.0F, 50.0F));
    EXPECT_EQ(hand._regionChangeThresh, 9.0F);
}

TEST_F(RegionChangeTest, TheLeadMustGrowByThreeTenths) {
    hold(100.0F, 100.0F);
    EXPECT_EQ(change(100, 129), 1);
    EXPECT_EQ(hand._regionChangeThresh, 1.3F);
    EXPECT_THAT(hand._regionMax, ElementsAre(0.0F, 100.0F, 0.0F, 129.0F));
    hold(100.0F, 100.0F);
    EXPECT_EQ(change(100, 130), 3);  // equal is enough
    hold(100.0F, 100.0F);
    EXPECT_EQ(change(200, 259), 1);  // a rise of the old region is no drop
    EXPECT_EQ(hand._regionChangeThresh, 1.3F);
    hold(100.0F, 100.0F);
    EXPECT_EQ(change(200, 260), 3);
}

TEST_F(RegionChangeTest, AFadingRegionIsHarderToLeave) {
    hold(200.0F, 100.0F);
    EXPECT_EQ(change(100, 249), 1);
    EXPECT_EQ(hand._regionChangeThresh, 5.0F);
    hold(200.0F, 100.0F);
    EXPECT_EQ(change(100, 250), 3);

    hold(200.0F, 100.0F);
    EXPECT_EQ(change(160, 103), 1);  // a drop of a fifth is not yet fading
    EXPECT_EQ(hand._regionChangeThresh, 1.3F);
    hold(200.0F, 100.0F);
    EXPECT_EQ(change(130, 0), 1);
    EXPECT_NEAR(hand._regionChangeThresh, 3.15F, 1e-5);
}

TEST_F(RegionChangeTest, ARegionThatFellIntoNoiseIsLeft) {
    hold(200.0F, 1000.0F);
    EXPECT_EQ(change(0, 1), 3);
    EXPECT_EQ(hand._regionChangeThresh, 9.0F);  // not compared
    EXPECT_THAT(hand._regionMax, ElementsAre(0.0F, 0.0F, 0.0F, 1.0F));
}

TEST_F(RegionChangeTest, WithNoOldLevelAnyLeadIsEnough) {
    hold(0.0F, 1000.0F);
    EXPECT_EQ(change(100, 1), 3);
    EXPECT_EQ(hand._regionChangeThresh, 1.3F);
    hold(0.0F, 1000.0F);
    EXPECT_EQ(change(0, 1), 3);
    EXPECT_EQ(hand._regionChangeThresh, 9.0F);
    EXPECT_THAT(hand._regionMax, ElementsAre(0.0F, 0.0F, 0.0F, 1.0F));
}

TEST_F(RegionChangeTest, TheFrameOnWhichAHoldBeginsStillUpdatesAsATouch) {
    hand._last_event_activeRegion = 2;  // stickiness is of updateActiveRegion alone
    hand._lastEventTimestamp_ms = 1300;
    const Touch between = touch("G").at(450).with("O", 360);
    feel(between, 1000);
    hand._lastEventTimestamp_ms = 1400;
    feel(between, 1501);
    EXPECT_TRUE(hand._isHolding);
    EXPECT_EQ(hand._activeRegion, 2);
    EXPECT_EQ(hand._previousActiveRegion, 0);
    feel(between, 1511);
    EXPECT_EQ(hand._previousActiveRegion, 2);
}

TEST_F(RegionChangeTest, AHoldThatMovesOutOfTheEarlyReturnUsesTheLastMeasuredFrame) {
    feel(touch("A").at(350), 1000);
    feel(touch("A").at(350), 1501);  // the last measured frame: 672 - 75
    ASSERT_TRUE(hand._isHolding);
    const float measured = hand._regionMax[1];
    feel(touch("A").at(100).with("B", 100), 1511);  // same region: not measured
    EXPECT_EQ(hand._regionMax[1], measured);
}

// Broken vectors.

TEST_F(HandStatsTest, AMissingGroupIsOutOfRangeAndTheUpdateStops) {
    channels.feel(touch("A").at(350));
    channels.virtualPixels.pop_back();
    EXPECT_THROW(hand.updateHandState(channels.pixels, channels.virtualPixels, 1000),
                 std::out_of_range);
    EXPECT_FALSE(hand._isTouching);
    EXPECT_EQ(hand._touchdownTimestamp_ms, 0U);
    EXPECT_THROW(hand.updateTapRejection(channels.pixels, channels.virtualPixels),
                 std::out_of_range);
}

}  // namespace
}  // namespace VexaTouch
