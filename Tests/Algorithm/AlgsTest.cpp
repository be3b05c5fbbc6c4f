#include "Algorithm/Algs.h"

#include "Tests/Support/EventMatchers.h"
#include "Tests/Support/PrintCounters.h"
#include "Tests/Support/SessionGenerator.h"
#include "Tests/Support/StateSnapshot.h"
#include "Tests/Support/Surface.h"

#include <gmock/gmock.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <stdexcept>
#include <vector>

namespace VexaTouch {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using namespace Testing;

using Counters = EventStats::Counters;

// Touches by what they are, not by where.
const Touch kFinger = touch("A").at(350);                // region 1
const Touch kFingerDown = touch("LM").at(350);           // region 2
const Touch kFingerUp = touch("GH").at(400);             // region 3
const Touch kPalm = everything(300);                     // whose hold is suppressed
const Touch kBrush = everything(60).with("G", 220);      // whose tap is rejected, in region 3
const Touch kBrushDown = everything(60).with("N", 220);  // the same in region 2
const Touch kBrushPlay = everything(45).with("A", 115);  // the same in region 1

// Construction.

TEST(AlgsTest, IsBuiltWithFifteenPixelsAndTwentyThreeGroups) {
    const Algs algs;
    constexpr float kGains[] = {1.9219F, 1.8833F, 1.9281F, 1.8837F, 1.9163F, 1.8105F, 1.0081F, 1.0F,
                                1.4851F, 1.5033F, 2.4154F, 1.5378F, 1.5431F, 1.04F,   1.0493F};
    ASSERT_EQ(algs.touchPixels().size(), 15U);
    for (std::size_t i = 0; i < 15; ++i) {
        EXPECT_EQ(algs.touchPixels()[i]._index, static_cast<int>(i));
        EXPECT_EQ(algs.touchPixels()[i]._normalizationFactor, kGains[i]) << i;
    }
    const VirtualImage image;
    ASSERT_EQ(algs.virtualPixels().size(), 23U);
    for (std::size_t i = 0; i < 23; ++i) {
        const VirtualPixel& pixel = algs.virtualPixels()[i];
        EXPECT_EQ(pixel._name, image.neighborPixelGroups()[i]);
        EXPECT_EQ(pixel._index, image.neighborPixelGroups()[i].front());
        EXPECT_EQ(pixel._normalizationFactor, image._normalizationFactors[i]);
    }
    EXPECT_EQ(algs.virtualPixels()[0]._index, 65);
    EXPECT_EQ(algs.eventStats()._stats, Counters());
    EXPECT_EQ(algs.lastDispatchedPhase(), 0);
}

TEST(AlgsTest, TheFirstFrameReplacesTheLetterCodesByPixelIndices) {
    Surface surface;
    EXPECT_THAT(surface.feel(nothing()), IsEmpty());
    for (const VirtualPixel& pixel : surface.algs.virtualPixels()) {
        EXPECT_EQ(pixel._index, pixel._name.front() - 'A');
    }
}

// Whole gestures.

TEST(AlgsTest, AShortTouchIsATap) {
    Surface surface;
    EXPECT_THAT(surface.feel({kFinger.forMs(120), nothing()}),
                ElementsAre(AllOf(MayBegin(1), WithFrame(1)), AllOf(Tap(1), WithFrame(13))));
    EXPECT_EQ(surface.algs.lastDispatchedPhase(), 0);
    EXPECT_EQ(surface.counters(), (Counters{.numTaps = 1, .numPlayPause = 1}));
    expectNothingElseHappens(surface);
    EXPECT_EQ(surface.counters(), (Counters{.numTaps = 1, .numPlayPause = 1}));
}

TEST(AlgsTest, TapsMeanWhatTheirRegionMeans) {
    Surface surface;
    EXPECT_THAT(surface.feel({kFingerDown.forMs(120), nothing().forMs(2000)}),
                ElementsAre(MayBegin(2), Tap(2)));
    EXPECT_THAT(surface.feel({kFingerUp.forMs(120), nothing().forMs(2000)}),
                ElementsAre(MayBegin(3), Tap(3)));
    EXPECT_THAT(surface.feel({touch("K").at(300).forMs(120), nothing()}),
                ElementsAre(MayBegin(1), Tap(1)));
    EXPECT_EQ(surface.counters(),
              (Counters{.numTaps = 3, .numVolumeUp = 1, .numVolumeDown = 1, .numPlayPause = 1}));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, ALongTouchIsAHold) {
    Surface surface;
    EXPECT_THAT(surface.feel(kFinger.forMs(510)), ElementsAre(AllOf(MayBegin(1), WithFrame(1))));
    EXPECT_THAT(surface.feel(kFinger), ElementsAre(AllOf(HoldStart(1), WithFrame(52))));
    EXPECT_EQ(surface.algs.lastDispatchedPhase(), 1);
    EXPECT_THAT(surface.feel(kFinger.forMs(300)), IsEmpty());
    EXPECT_THAT(surface.feel(nothing()), ElementsAre(AllOf(HoldEnd(1), WithFrame(83))));
    EXPECT_EQ(surface.algs.lastDispatchedPhase(), 4);
    EXPECT_EQ(surface.counters(), (Counters{.numBeginHold = 1,
                                            .numIncrementHold = 30,
                                            .numEndHold = 1,
                                            .numQuarnCall = 1,
                                            .numQuarnCallIncrement = 30}));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, AHoldOfVolumeCountsEachOfItsFrames) {
    Surface surface;
    EXPECT_THAT(surface.feel({kFingerUp.forMs(560), nothing().forMs(2000)}),
                ElementsAre(MayBegin(3), HoldStart(3), HoldEnd(3)));
    EXPECT_THAT(surface.feel({kFingerDown.forMs(560), nothing()}),
                ElementsAre(MayBegin(2), HoldStart(2), HoldEnd(2)));
    EXPECT_EQ(surface.counters(), (Counters{.numBeginHold = 2,
                                            .numIncrementHold = 8,
                                            .numEndHold = 2,
                                            .numVolumeIncrement = 5,
                                            .numVolumeDecrement = 5}));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, AHoldThatSlidesChangesItsRegionOnce) {
    Surface surface;
    EXPECT_THAT(
        surface.feel({kFingerUp.forMs(560), kFingerDown.forMs(200), nothing()}),
        ElementsAre(MayBegin(3), HoldStart(3), AllOf(HoldChange(2), WithFrame(57)), HoldEnd(2)));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, AHoldThatSlidesBackChangesItsRegionTwice) {
    Surface surface;
    EXPECT_THAT(
        surface.feel({kFinger.forMs(560), kFingerUp.forMs(100), kFinger.forMs(100), nothing()}),
        ElementsAre(MayBegin(1), HoldStart(1), HoldChange(3), HoldChange(1), HoldEnd(1)));
    EXPECT_EQ(surface.counters().numQuarnCall, 1U);
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, NoCancelFollowsTheEndOfAHold) {
    Surface surface;
    surface.feel(kFinger.forMs(600));
    EXPECT_THAT(surface.feel(nothing().forMs(200)), ElementsAre(HoldEnd(1)));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, ARejectedTapIsCancelled) {
    Surface surface;
    EXPECT_THAT(surface.feel({kBrush.forMs(120), nothing()}),
                ElementsAre(MayBegin(3), AllOf(Cancel(), WithFrame(13))));
    EXPECT_EQ(surface.algs.lastDispatchedPhase(), 8);
    EXPECT_EQ(surface.counters(), (Counters{.numRejectedTap = 1, .numRejectedVolumeUp = 1}));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, ASuppressedHoldIsCancelledAtItsEnd) {
    Surface surface;
    EXPECT_THAT(surface.feel(kPalm.forMs(600)), ElementsAre(MayBegin(1)));
    EXPECT_THAT(surface.feel(nothing()), ElementsAre(AllOf(Cancel(), WithFrame(61))));
    EXPECT_EQ(surface.counters(), (Counters{.numRejectedBeginHold = 1,
                                            .numRejectedIncrementHold = 8,
                                            .numRejectedEndHold = 1,
                                            .numRejectedQuarnCall = 1,
                                            .numRejectedQuarnCallIncrement = 8}));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, ASuppressedHoldThatIsAllowedLaterIsAHold) {
    Surface surface;
    EXPECT_THAT(surface.feel({kPalm.forMs(600), touch("ABE").at(900).forMs(500), nothing()}),
                ElementsAre(MayBegin(1), HoldStart(1), HoldEnd(1)));
    EXPECT_EQ(surface.counters().numSuppressed2Holding, 1U);
    EXPECT_EQ(surface.counters().numHolding2Suppressed, 0U);
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, NoiseIsNoTouch) {
    Surface surface;
    EXPECT_THAT(surface.feel({everything(30).forMs(500), touch("H").at(199).forMs(900)}),
                IsEmpty());
    EXPECT_EQ(surface.counters(), Counters());
    expectNothingElseHappens(surface);
}

// The order of the decisions.

TEST(AlgsTest, WhenTouchAndHoldRiseTogetherOnlyMayBeginIsSent) {
    // The timeout counts from the touch-down stamp, which rises on the same frame; a hold can only
    // rise with it when it is set from outside.
    class Forced : public Algs {
    public:
        std::vector<Vexa::HidEvent> touchWhileHolding() {
            _handStats._isHolding = true;
            _handStats._hold_timeout_ms = 0;
            return handleImage(image(kFinger.samples(), 1, 1000));
        }
    };
    Forced algs;
    EXPECT_THAT(algs.touchWhileHolding(), ElementsAre(MayBegin(1)));
}

TEST(AlgsTest, MayBeginWinsOverTheEndOfAHold) {
    class Forced : public Algs {
    public:
        void hold() { _handStats._isHolding = true; }
    };
    BasicSurface<Forced> surface;
    surface.algs.hold();
    EXPECT_THAT(surface.feel(kFinger), ElementsAre(MayBegin(1)));
    EXPECT_TRUE(surface.hand()._wasHolding);
    EXPECT_FALSE(surface.hand()._isHolding);
    EXPECT_EQ(surface.counters(), Counters());
    EXPECT_THAT(surface.feel({kFinger.forMs(100), nothing()}), ElementsAre(Tap(1)));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, ATouchIsCancelledOnlyIfItsMayBeginWasTheLastEvent) {
    Surface surface;
    surface.feel({kFinger.forMs(120), nothing().forMs(2000)});  // a tap: its phase is none
    EXPECT_THAT(surface.feel({kBrush.forMs(120), nothing()}), ElementsAre(MayBegin(3), Cancel()));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, ATouchOfWhichSomethingElseWasSentLastEndsSilentlyAndForgetsItsStatistics) {
    // A hold that ends in mid-touch, because the timeout is raised, leaves "ended" as the last
    // phase; what is left of the touch ends without an event.
    Surface surface;
    EXPECT_THAT(surface.feel(kPalm.forMs(20)), ElementsAre(MayBegin(1)));
    surface.algs.setState("EnableHoldSuppression", false);
    EXPECT_THAT(surface.feel(kPalm.forMs(600)), ElementsAre(HoldStart(1)));
    surface.algs.setState("EnableHoldSuppression", true);
    surface.algs.setState("HoldTimeoutMilliseconds", 100'000);
    EXPECT_THAT(surface.feel(kPalm), ElementsAre(HoldEnd(1)));
    surface.algs.setState("HoldTimeoutMilliseconds", 500);
    surface.feel(kPalm.forMs(20));
    EXPECT_FALSE(surface.hand()._isHolding);
    EXPECT_TRUE(surface.hand()._isHoldSuppressed);
    EXPECT_NE(surface.hand()._touch_score, 0.0F);
    EXPECT_THAT(surface.feel(nothing()), IsEmpty());
    EXPECT_TRUE(surface.hand()._wasTouching);
    EXPECT_EQ(surface.hand()._touch_score, 0.0F);
    EXPECT_EQ(surface.hand()._peak_pixel_progress, 0.0F);
    EXPECT_FALSE(surface.algs.touchPixels()[0]._wasActive);
    EXPECT_EQ(surface.algs.lastDispatchedPhase(), 4);
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, EveryEndOfATouchForgetsItsStatistics) {
    for (const auto& [finger, milliseconds] :
         {std::pair(kFinger, 100U), {kFinger, 700U}, {kBrush, 100U}, {kPalm, 700U}}) {
        Surface surface;
        surface.feel(finger.forMs(milliseconds));
        EXPECT_GT(surface.hand()._peak_pixel_progress, 0.0F);
        ASSERT_EQ(surface.feel(nothing()).size(), 1U);
        EXPECT_EQ(surface.hand()._touch_score, 0.0F);
        EXPECT_EQ(surface.hand()._max_pixel_value, 0.0F);
        EXPECT_EQ(surface.hand()._peak_pixel_progress, 0.0F);
        EXPECT_EQ(surface.hand()._peak_pixel_index, 0);
        const auto forgotten = [](const Pixel& pixel) {
            return !pixel._wasAboveNoise && !pixel._wasActive && pixel._maxProgressAboveNoise == 0;
        };
        EXPECT_TRUE(std::ranges::all_of(surface.algs.touchPixels(), forgotten));
        EXPECT_TRUE(std::ranges::all_of(surface.algs.virtualPixels(), forgotten));
        expectNothingElseHappens(surface);
    }
}

TEST(AlgsTest, ResetLeavesFlagsTimesRegionsSettingsAndCountersAlone) {
    Surface surface;
    surface.feel({kFingerDown.forMs(100), nothing().forMs(50), kFinger.forMs(700)});
    const HandStats before = surface.hand();
    const Counters counters = surface.counters();
    const Pixel pixel = surface.algs.touchPixels()[0];
    surface.algs.Reset();
    HandStats expected = before;
    expected.Reset();
    std::vector<std::uint64_t> bits;
    std::vector<std::uint64_t> expectedBits;
    const auto collect = [](const HandStats& hand, std::vector<std::uint64_t>& all) {
        forEachHandStatsField(hand, [&all](std::string_view, const auto& field) {
            if constexpr (requires { field.size(); }) {
                for (const float element : field) {
                    all.push_back(fieldBits(element));
                }
            } else {
                all.push_back(fieldBits(field));
            }
        });
    };
    collect(surface.hand(), bits);
    collect(expected, expectedBits);
    EXPECT_EQ(bits, expectedBits);
    EXPECT_EQ(surface.counters(), counters);
    EXPECT_EQ(surface.algs.lastDispatchedPhase(), 1);
    EXPECT_EQ(surface.algs.touchPixels()[0]._peakProgress, pixel._peakProgress);
    EXPECT_TRUE(surface.algs.touchPixels()[0]._isActive);
    EXPECT_FALSE(surface.algs.touchPixels()[0]._wasActive);
    EXPECT_THAT(surface.feel(nothing()), ElementsAre(HoldEnd(1)));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, AResetInMidTouchForgetsTheRest) {
    Surface surface;
    surface.feel(kFinger.forMs(700));
    surface.algs.setState("HoldTimeoutMilliseconds", 4294967295);
    EXPECT_THAT(surface.feel(kFinger), ElementsAre(HoldEnd(1)));
    EXPECT_EQ(surface.hand()._peak_pixel_index, 0);
    surface.feel(kFinger);
    EXPECT_GT(surface.hand()._peak_pixel_progress, 0.0F);
    // Its lift-off comes after the hold's timeout would have passed only if that was just now.
    EXPECT_THAT(surface.feel(nothing()), ElementsAre(Tap(1)));
    expectNothingElseHappens(surface);
}

// Firmware resets.

TEST(AlgsTest, AFirmwareResetOfAnIdleSurfaceSendsNothing) {
    Surface surface;
    EXPECT_THAT(surface.algs.handleReset(), IsEmpty());
    surface.feel(nothing().forMs(100));
    EXPECT_THAT(surface.algs.handleReset(), IsEmpty());
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, AFirmwareResetEndsAHoldWithFrameZero) {
    Surface surface;
    surface.feel(kFinger.forMs(600));
    EXPECT_THAT(surface.algs.handleReset(), ElementsAre(AllOf(HoldEnd(1), WithFrame(0))));
    EXPECT_EQ(surface.hand()._lastEventTimestamp_ms, 0U);
    EXPECT_EQ(surface.hand()._liftoffTimestamp_ms, 0U);
    EXPECT_EQ(surface.hand()._belowNoiseTimestamp_ms, 0U);
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, AFirmwareResetEndsASuppressedHoldWithACancel) {
    Surface surface;
    surface.feel(kPalm.forMs(600));
    EXPECT_THAT(surface.algs.handleReset(), ElementsAre(AllOf(Cancel(), WithFrame(0))));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, AFirmwareResetInAShortTouchIsALiftOffAtTimeZero) {
    Surface surface;
    surface.clock.nowMs = 10;
    surface.feel(kFinger.forMs(100));
    EXPECT_THAT(surface.algs.handleReset(), ElementsAre(AllOf(Cancel(), WithFrame(0))));
    // The touch seems to have lasted 2^32 - 10 ms, so it is too weak to be a tap.
    EXPECT_LT(surface.hand()._touchingSignalDerivative_thresholded, 0.0F);
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, AFirmwareResetInATouchThatBeganAtZeroIsOfNoDuration) {
    Surface surface;
    surface.clock.nowMs = 0;
    surface.feel(kFinger);
    EXPECT_THAT(surface.algs.handleReset(), ElementsAre(Cancel()));
    expectNothingElseHappens(surface);
}

// Clocks and numbers.

TEST(AlgsTest, GesturesGoOnAcrossTheWrapOfTheDevicesClock) {
    Surface surface;
    surface.clock.nowMs = 0U - 100U;
    EXPECT_THAT(surface.feel({kFinger.forMs(600), nothing().forMs(2000)}),
                ElementsAre(MayBegin(1), HoldStart(1), HoldEnd(1)));
    surface.clock.nowMs = 0U - 60U;
    EXPECT_THAT(surface.feel({kFinger.forMs(120), nothing()}), ElementsAre(MayBegin(1), Tap(1)));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, EventsCarryTheFrameNumberOfTheirFrameWhateverItIs) {
    Surface surface;
    surface.clock.nextFrame = 0xFFFFFFFFU;
    EXPECT_THAT(
        surface.feel({kFinger, kFinger.forMs(100), nothing()}),
        ElementsAre(AllOf(MayBegin(1), WithFrame(4294967295)), AllOf(Tap(1), WithFrame(10))));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, ExtremeSamplesAreProcessedLikeAnyOther) {
    Surface surface;
    EXPECT_THAT(surface.feel(everything(-32768).forMs(100)), IsEmpty());
    EXPECT_THAT(surface.feel({touch("H").at(32767).forMs(100), nothing()}),
                ElementsAre(MayBegin(3), Tap(3)));
    EXPECT_THAT(surface.feel(everything(-32768).forMs(100)), IsEmpty());
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, AVirtualValueBeyondSixteenBitsWraps) {
    Surface surface;
    surface.feel(touch("GHI").at(20000));  // 20162 + 20000 + 29702
    const std::int32_t whole = surface.algs.virtualImage()._values[15];
    EXPECT_EQ(whole, 69864);
    EXPECT_EQ(surface.algs.virtualPixels()[15]._value,
              static_cast<std::int32_t>(static_cast<float>(69864 - 65536) * 0.5714F));
    surface.feel(touch("GH").at(20000));  // 40162 is negative in 16 bits
    EXPECT_EQ(surface.algs.virtualPixels()[15]._value,
              static_cast<std::int32_t>(static_cast<float>(40162 - 65536) * 0.5714F));
    EXPECT_FALSE(surface.algs.virtualPixels()[15]._isActive);
}

TEST(AlgsTest, UnsignedPixelsAndReservedBytesAreNotUsed) {
    Surface surface;
    Surface other;
    for (std::uint32_t frame = 0; frame < 30; ++frame) {
        InputReport::Image plain = image(kFinger.samples(), frame, frame * 10);
        InputReport::Image loud = plain;
        loud.unsignedPixels.fill(65535);
        loud.reserved0 = loud.reserved1 = loud.reserved2 = loud.reserved3 = 255;
        EXPECT_EQ(surface.algs.handleImage(plain).size(), other.algs.handleImage(loud).size());
        EXPECT_EQ(firstDifference(surface.algs, other.algs), std::nullopt);
    }
}

TEST(AlgsTest, EachCallReturnsItsOwnEventsAlone) {
    Surface surface;
    const std::vector<Vexa::HidEvent> first = surface.feel(kFinger);
    EXPECT_THAT(surface.feel(kFinger), IsEmpty());
    EXPECT_THAT(first, ElementsAre(MayBegin(1)));
    // processTouchFrame appends to what is there.
    std::vector<Vexa::HidEvent> events = first;
    surface.feel(kFinger.forMs(80));
    surface.algs.processTouchFrame(nothing().samples().data(), 77, surface.clock.nowMs, events);
    EXPECT_THAT(events, ElementsAre(MayBegin(1), AllOf(Tap(1), WithFrame(77))));
    expectNothingElseHappens(surface);
}

// Settings in mid-session.

TEST(AlgsTest, ASettingTakesEffectAtTheNextFrameAndEndsNoTouch) {
    Surface surface;
    surface.feel(kFinger.forMs(100));
    surface.algs.setState("HoldTimeoutMilliseconds", 50);
    EXPECT_TRUE(surface.hand()._isTouching);
    EXPECT_FALSE(surface.hand()._isHolding);
    EXPECT_THAT(surface.feel(kFinger), ElementsAre(HoldStart(1)));
    surface.algs.setState("ActivationThreshold", 10000.0);
    EXPECT_TRUE(surface.hand()._isTouching);
    EXPECT_THAT(surface.feel(kFinger), ElementsAre(HoldEnd(1)));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, WithoutTapSuppressionABrushIsATap) {
    Surface surface;
    surface.algs.setState("EnableTapSuppression", false);
    EXPECT_THAT(surface.feel({kBrush.forMs(120), nothing()}), ElementsAre(MayBegin(3), Tap(3)));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, WithoutHoldSuppressionAPalmHolds) {
    Surface surface;
    surface.algs.setState("EnableHoldSuppression", false);
    EXPECT_THAT(surface.feel({kPalm.forMs(600), nothing()}),
                ElementsAre(MayBegin(1), HoldStart(1), HoldEnd(1)));
    EXPECT_EQ(surface.counters().numRejectedBeginHold, 0U);
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, SwitchingSuppressionOffInASuppressedHoldFreezesItsFlags) {
    Surface surface;
    EXPECT_THAT(surface.feel(kPalm.forMs(600)), ElementsAre(MayBegin(1)));
    surface.algs.setState("EnableHoldSuppression", false);
    EXPECT_THAT(surface.feel(kPalm.forMs(100)), ElementsAre(HoldStart(1)));
    // Still counted as suppressed, and from its second frame as a hold that became so.
    EXPECT_EQ(surface.counters().numBeginHold, 0U);
    EXPECT_EQ(surface.counters().numHolding2Suppressed, 9U);
    EXPECT_THAT(surface.feel(nothing()), ElementsAre(HoldEnd(1)));
    EXPECT_EQ(surface.counters().numEndHold, 0U);
    // The frozen flags keep the next short touch from being a tap.
    EXPECT_THAT(surface.feel({kFinger.forMs(100), nothing()}), ElementsAre(MayBegin(1), Cancel()));
    surface.algs.setState("EnableHoldSuppression", true);
    EXPECT_THAT(surface.feel({nothing().forMs(50), kFinger.forMs(100), nothing()}),
                ElementsAre(MayBegin(1), Tap(1)));
    expectNothingElseHappens(surface);
}

TEST(AlgsTest, NormalizationFactorsAreReadBackButChangeNoFrame) {
    Surface surface;
    Surface other;
    surface.algs.setState("VirtualNormalizationFactors.0", 100.0);
    EXPECT_EQ(surface.algs.virtualImage()._normalizationFactors[0], 100.0F);
    const Touch finger = touch("ABE").at(120).forMs(700);
    EXPECT_EQ(surface.feel({finger, nothing()}).size(), other.feel({finger, nothing()}).size());
    EXPECT_EQ(surface.algs.virtualPixels()[0]._normalizationFactor, 0.6667F);
    surface.algs.setState("VirtualNormalizationFactors.0", 0.6667F);
    EXPECT_EQ(firstDifference(surface.algs, other.algs), std::nullopt);
}

TEST(AlgsTest, AnyActivationThresholdIsSurvived) {
    for (const float threshold :
         {0.0F, -0.0F, -200.0F, 1e-45F, std::numeric_limits<float>::max(),
          std::numeric_limits<float>::infinity(), -std::numeric_limits<float>::infinity(),
          std::numeric_limits<float>::quiet_NaN()}) {
        Surface surface;
        surface.algs.setState("ActivationThreshold", threshold);
        surface.feel({nothing(), kFinger.forMs(700), kPalm.forMs(100), everything(-300).forMs(700),
                      nothing().forMs(100)});
        surface.algs.setState("ActivationThreshold", 200.0);
        // A deep valley and the end of one touch bring the surface back, whatever was left behind.
        surface.feel({everything(-100).forMs(2000), kFinger.forMs(120), nothing().forMs(2000)});
        EXPECT_THAT(surface.feel({kFinger.forMs(120), nothing()}), ElementsAre(MayBegin(1), Tap(1)))
            << threshold;
        expectNothingElseHappens(surface);
    }
}

TEST(AlgsTest, AThresholdThatIsNoNumberIsFeltByTheFirstFrame) {
    Surface surface;
    surface.algs.setState("ActivationThreshold", std::nan(""));
    surface.feel(nothing());
    EXPECT_TRUE(std::isnan(surface.algs.touchPixels()[0]._progress));
    EXPECT_TRUE(std::isnan(surface.algs.virtualPixels()[0]._progress));
}

TEST(AlgsTest, NothingButTheThresholdChangesOnAQuietSurface) {
    Surface surface;
    surface.feel(nothing().forMs(100));
    EXPECT_EQ(std::signbit(surface.algs.virtualPixels()[0]._progress), false);
    surface.algs.setState("ActivationThreshold", -200.0);
    surface.feel(nothing());
    EXPECT_EQ(std::signbit(surface.algs.virtualPixels()[0]._progress), true);
    EXPECT_EQ(std::signbit(surface.algs.touchPixels()[0]._progress), true);
}

// Copies.

TEST(AlgsTest, ACopyGoesItsOwnWay) {
    Surface surface;
    surface.feel(kFinger.forMs(300));
    Surface copy = surface;
    EXPECT_EQ(firstDifference(surface.algs, copy.algs), std::nullopt);
    EXPECT_THAT(copy.feel(kFinger.forMs(300)), ElementsAre(HoldStart(1)));
    EXPECT_THAT(surface.feel(nothing()), ElementsAre(Tap(1)));
    expectNothingElseHappens(surface);
}

// Events.

TEST(AlgsTest, EventsAreDigitizerEventsThatDifferInMaskPlaceAndPhase) {
    using Vexa::HidEventPhase;
    const auto expectEvent = [](const Vexa::HidEvent& event, std::uint32_t mask, double y,
                                HidEventPhase phase) {
        Vexa::DigitizerEventRecord expected;
        expected.transducerType = 2;
        expected.eventMask = mask;
        expected.y = y;
        ASSERT_TRUE(event.digitizerRecord());
        EXPECT_EQ(*event.digitizerRecord(), expected) << event.description();
        EXPECT_EQ(event.phase(), phase);
        EXPECT_EQ(event.type(), Vexa::HidEventType::Digitizer);
        EXPECT_EQ(event.timestamp(), 0U);
        EXPECT_EQ(event.integerField(Vexa::HidEventField::DigitizerFrameNumber), 0);
    };
    for (const PixelRegion region : {0, 1, 2, 3}) {
        expectEvent(Algs::createMayBeginEvent(region), 0, region, HidEventPhase::MayBegin);
        expectEvent(Algs::createHoldStartEvent(region), 2, region, HidEventPhase::Began);
        expectEvent(Algs::createHoldChangeEvent(region), 2, region, HidEventPhase::Changed);
        expectEvent(Algs::createHoldEndEvent(region), 2, region, HidEventPhase::Ended);
        expectEvent(Algs::createTapEvent(region), 131072, region, HidEventPhase::None);
    }
    expectEvent(Algs::createCancelEvent(), 0, 0, HidEventPhase::Cancelled);
    // A region is an unsigned number.
    expectEvent(Algs::createTapEvent(-1), 131072, 4294967295.0, HidEventPhase::None);
}

// Broken vectors.

class Broken : public Algs {
public:
    VirtualImage& virtualImage() { return _virtual_image; }
    std::vector<VirtualPixel>& virtualPixels() { return _virtualPixels; }
};

class BrokenAlgsTest : public ::testing::Test {
protected:
    /// A frame fails, its pixels keep their update, hand and counters have not seen it.
    void expectFrameIsAbandoned() {
        const HandStats hand = algs.handStats();
        EXPECT_THROW(algs.handleImage(image(kFinger.samples(), 2, 1010)), std::out_of_range);
        EXPECT_EQ(algs.touchPixels()[0]._value, 672);
        EXPECT_TRUE(algs.touchPixels()[0]._isActive);
        EXPECT_FALSE(algs.handStats()._isTouching);
        EXPECT_EQ(algs.handStats()._aboveNoiseTimestamp_ms, hand._aboveNoiseTimestamp_ms);
        EXPECT_EQ(algs.eventStats()._stats, Counters());
        EXPECT_EQ(algs.lastDispatchedPhase(), 0);
        EXPECT_THROW(algs.handleReset(), std::out_of_range);
    }

    Broken algs;
};

TEST_F(BrokenAlgsTest, AMissingVirtualPixelAbandonsTheFrame) {
    algs.virtualPixels().pop_back();
    expectFrameIsAbandoned();
}

TEST_F(BrokenAlgsTest, AMissingSumAbandonsTheFrame) {
    algs.virtualImage()._values.pop_back();
    expectFrameIsAbandoned();
}

TEST_F(BrokenAlgsTest, AMissingStrongestMemberAbandonsTheFrame) {
    algs.virtualImage()._maxPixelIndex.pop_back();
    expectFrameIsAbandoned();
}

TEST_F(BrokenAlgsTest, GroupsBeforeTheMissingOneAreUpdated) {
    algs.virtualPixels().pop_back();
    EXPECT_THROW(algs.handleImage(image(kFinger.samples(), 2, 1010)), std::out_of_range);
    EXPECT_EQ(algs.virtualPixels()[0]._value, 448);
    EXPECT_EQ(algs.virtualPixels()[0]._index, 0);
    EXPECT_EQ(algs.virtualPixels()[21]._index, 11);
}

TEST_F(BrokenAlgsTest, AMissingVirtualPixelIsSeenOnAQuietFrameToo) {
    EXPECT_THAT(algs.handleImage(image(nothing().samples(), 1, 1000)), IsEmpty());
    EXPECT_THAT(algs.handleImage(image(nothing().samples(), 2, 1010)), IsEmpty());
    algs.virtualPixels().pop_back();
    EXPECT_THROW(algs.handleImage(image(nothing().samples(), 3, 1020)), std::out_of_range);
}

TEST_F(BrokenAlgsTest, AFrameAfterTheRepairIsWholeAtTheSameThresholdToo) {
    const VirtualPixel last = algs.virtualPixels().back();
    algs.setState("ActivationThreshold", std::nan(""));
    algs.virtualPixels().pop_back();
    EXPECT_THROW(algs.handleImage(image(nothing().samples(), 1, 1000)), std::out_of_range);
    algs.virtualPixels().push_back(last);
    EXPECT_THAT(algs.handleImage(image(nothing().samples(), 2, 1010)), IsEmpty());
    EXPECT_TRUE(std::isnan(algs.virtualPixels()[0]._progress));
    EXPECT_TRUE(std::isnan(algs.virtualPixels()[22]._progress));
}

TEST_F(BrokenAlgsTest, AFrameAfterTheRepairIsWhole) {
    const VirtualPixel last = algs.virtualPixels().back();
    algs.setState("ActivationThreshold", std::nan(""));
    algs.virtualPixels().pop_back();
    EXPECT_THROW(algs.handleImage(image(nothing().samples(), 1, 1000)), std::out_of_range);
    algs.virtualPixels().push_back(last);
    algs.setState("ActivationThreshold", 200.0);
    EXPECT_THAT(algs.handleImage(image(nothing().samples(), 2, 1010)), IsEmpty());
    EXPECT_EQ(algs.virtualPixels()[0]._progress, 0.0F);
    EXPECT_EQ(algs.virtualPixels()[22]._progress, 0.0F);
    EXPECT_EQ(algs.virtualPixels()[22]._index, 12);
}

}  // namespace
}  // namespace VexaTouch
