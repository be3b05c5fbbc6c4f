#include "Algorithm/Algs.h"
#include "Tests/Support/Surface.h"

#include "Platform/Log.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

namespace VexaTouch {
namespace {

using ::testing::ElementsAre;
using Testing::everything;
using ::testing::IsEmpty;
using Testing::nothing;
using ::testing::StartsWith;
using Testing::Surface;
using Testing::touch;
using Testing::Touch;

const Touch kFinger = touch("A").at(350);
const Touch kPalm = everything(300);
const Touch kBrush = everything(60).with("G", 220);
const Touch kAboveNoise = touch("H").at(100);

class StateDescriptionTest : public ::testing::Test {
protected:
    /// The text behind the list of channels, for a time in the same frame or later.
    std::string phase(std::uint32_t laterMs = 0) {
        const std::uint32_t timeMs = surface.clock.nowMs - surface.clock.intervalMs + laterMs;
        const std::string text =
            surface.algs.touchStateDescription(nothing().samples().data(), timeMs);
        const std::string virtualText = surface.algs.virtualStateDescription(nullptr, timeMs);
        const std::string suffix = text.substr(text.find("] ") + 2);
        EXPECT_EQ(virtualText.substr(virtualText.find("] ") + 2), suffix);
        return suffix;
    }

    Surface surface;
};

TEST_F(StateDescriptionTest, ASurfaceThatWasNeverTouched) {
    EXPECT_EQ(surface.algs.touchStateDescription(nothing().samples().data(), 0),
              "ts=0.000000, sd=0.000000, tsd=0.000000, NonActivePixels=0, "
              "TimeDurationRatio=0.000000, TapSVMScore=0.000000, "
              "[A=   0    0, B=   0    0, C=   0    0, D=   0    0, E=   0    0, F=   0    0, "
              "G=   0    0, H=   0    0, I=   0    0, J=   0    0, K=   0    0, L=   0    0, "
              "M=   0    0, N=   0    0, O=   0    0] ");
    EXPECT_EQ(surface.algs.virtualStateDescription(nullptr, 0),
              "ts=0.000000, sd=0.000000, tsd=0.000000, NonActivePixels=0, "
              "TimeDurationRatio=0.000000, TapSVMScore=0.000000, "
              "[ABE=   0, ABF=   0, ADEF=   0, AEGJ=   0, BCEF=   0, BFHJ=   0, CDE=   0, "
              "CDF=   0, CELN=   0, DFLO=   0, EFK=   0, EJK=   0, EKL=   0, FJK=   0, FKL=   0, "
              "GHI=   0, GIJ=   0, HIJ=   0, IJK=   0, KLM=   0, LMN=   0, LMO=   0, MNO=   0] ");
}

TEST_F(StateDescriptionTest, PixelsShowSampleValueAndWhetherTheyAreOn) {
    const Touch finger = touch("C").at(150).with("H", -32768).with("O", 32767);
    surface.feel(finger);
    const std::string text = surface.algs.touchStateDescription(finger.samples().data(), 10000);
    EXPECT_EQ(text.substr(text.find('[')),
              "[A=   0    0, B=   0    0, C= 150  289<==ON, D=   0    0, E=   0    0, F=   0    0, "
              "G=   0    0, H=-32768 -32768, I=   0    0, J=   0    0, K=   0    0, L=   0    0, "
              "M=   0    0, N=   0    0, O=32767 34382<==ON] STARTTOUCH 0ms ActiveRegion=2");
}

TEST_F(StateDescriptionTest, GroupsShowValueAndWhetherTheyAreOn) {
    surface.feel(touch("C").at(200));
    const std::string text = surface.algs.virtualStateDescription(nullptr, 10000);
    EXPECT_EQ(text.substr(text.find('[')),
              "[ABE=   0, ABF=   0, ADEF=   0, AEGJ=   0, BCEF= 256<==ON, BFHJ=   0, "
              "CDE= 256<==ON, CDF= 179, CELN= 256<==ON, DFLO=   0, EFK=   0, EJK=   0, EKL=   0, "
              "FJK=   0, FKL=   0, GHI=   0, GIJ=   0, HIJ=   0, IJK=   0, KLM=   0, LMN=   0, "
              "LMO=   0, MNO=   0] STARTTOUCH 0ms ActiveRegion=1");
}

TEST_F(StateDescriptionTest, BothBeginWithTheHand) {
    surface.feel({touch("C").at(150).forMs(100), nothing()});
    // The score was reset by the tap before the text was made.
    const std::string prefix =
        "ts=0.000000, sd=2.380000, tsd=2.240000, NonActivePixels=17, TimeDurationRatio=0.750000, "
        "TapSVMScore=3.494711, [";
    EXPECT_THAT(surface.algs.touchStateDescription(nothing().samples().data(), 0),
                StartsWith(prefix));
    EXPECT_THAT(surface.algs.virtualStateDescription(nullptr, 0), StartsWith(prefix));
    EXPECT_EQ(phase(), "TAP 100ms ActiveRegion=1 BELOWNOISE");
}

TEST_F(StateDescriptionTest, ATouchBeginsAndGoesOn) {
    surface.feel(kFinger);
    EXPECT_EQ(phase(), "STARTTOUCH 0ms ActiveRegion=1");
    EXPECT_EQ(phase(5), "STARTTOUCH 5ms ActiveRegion=1");
    surface.feel(kFinger.forMs(200));
    EXPECT_EQ(phase(), "TOUCHING 200ms ActiveRegion=1");
}

TEST_F(StateDescriptionTest, AHoldBeginsGoesOnAndEnds) {
    surface.feel(kFinger.forMs(520));
    EXPECT_EQ(phase(), "STARTHOLD 510ms ActiveRegion=1");
    surface.feel(kFinger);
    EXPECT_EQ(phase(), "HOLDING 520ms ActiveRegion=1");
    surface.feel(nothing());
    EXPECT_EQ(phase(), "ENDHOLD 530ms ActiveRegion=1 BELOWNOISE");
    surface.feel(nothing());
    EXPECT_EQ(phase(), "");
}

TEST_F(StateDescriptionTest, AHoldMayEndAboveNoise) {
    surface.feel({kFinger.forMs(520), kAboveNoise});
    EXPECT_EQ(phase(7), "ENDHOLD 520ms ActiveRegion=1 ABOVENOISE");  // of the touch, not of now
}

TEST_F(StateDescriptionTest, ASuppressedHoldGoesOnAndEnds) {
    surface.feel(kPalm.forMs(520));
    EXPECT_EQ(phase(), "SUPPRESSHOLD 510ms ActiveRegion=1");
    surface.feel(nothing());
    EXPECT_EQ(phase(9), "ENDTOUCH 520ms ActiveRegion=1 BELOWNOISE");
    surface.feel({kPalm.forMs(520), kAboveNoise});
    EXPECT_EQ(phase(), "ENDTOUCH 520ms ActiveRegion=1 ABOVENOISE");
}

TEST_F(StateDescriptionTest, ATapIsSeenOrSuppressed) {
    surface.feel({kFinger.forMs(120), kAboveNoise});
    EXPECT_EQ(phase(9), "TAP 120ms ActiveRegion=1 ABOVENOISE");
    surface.feel({nothing().forMs(2000), kBrush.forMs(120), nothing()});
    EXPECT_EQ(phase(), "SUPPRESSTAP 120ms ActiveRegion=3 BELOWNOISE");
    EXPECT_EQ(phase(9), "SUPPRESSTAP 129ms ActiveRegion=3 BELOWNOISE");  // of now
    surface.feel({kBrush.forMs(120), kAboveNoise});
    EXPECT_EQ(phase(), "SUPPRESSTAP 120ms ActiveRegion=3 ABOVENOISE");
}

TEST_F(StateDescriptionTest, ADurationIsPrintedAsASignedNumber) {
    surface.feel(kFinger);
    EXPECT_EQ(phase(0U - 25U), "STARTTOUCH -25ms ActiveRegion=1");
}

TEST_F(StateDescriptionTest, FrozenSuppressionIsSeenBeforeTheTouch) {
    surface.feel(kPalm.forMs(520));
    surface.algs.setState("EnableHoldSuppression", false);
    surface.feel(nothing().forMs(200));
    EXPECT_EQ(phase(), "SUPPRESSHOLD 710ms ActiveRegion=1");
}

// The log.

class FrameLogTest : public ::testing::Test {
protected:
    FrameLogTest() {
        Vexa::Log::setSink(
            [this](Vexa::LogCategory category, Vexa::LogLevel level, std::string_view message) {
                EXPECT_EQ(category, Vexa::LogCategory::Algs);
                EXPECT_EQ(level, Vexa::LogLevel::Debug);
                messages.emplace_back(message);
                if (closeAfterOne) {
                    Vexa::Log::setLevel(Vexa::LogCategory::Algs, Vexa::LogLevel::Error);
                }
            });
    }
    ~FrameLogTest() override {
        Vexa::Log::setLevel(Vexa::LogCategory::Algs, Vexa::LogLevel::Error);
        Vexa::Log::setSink({});
    }

    Surface surface;
    std::vector<std::string> messages;
    bool closeAfterOne = false;
};

TEST_F(FrameLogTest, AFrameIsNotLoggedUnlessDebuggingIsOn) {
    Vexa::Log::setLevel(Vexa::LogCategory::Algs, Vexa::LogLevel::Info);
    surface.feel(kFinger);
    EXPECT_THAT(messages, IsEmpty());
}

TEST_F(FrameLogTest, EachFrameLogsCountersAndBothDescriptionsAsTheyStandAfterIt) {
    surface.feel(kFinger.forMs(120));
    Vexa::Log::setLevel(Vexa::LogCategory::Algs, Vexa::LogLevel::Debug);
    surface.feel(nothing());
    const Algs& algs = surface.algs;
    EXPECT_THAT(messages,
                ElementsAre("Frame 13 @10120ms, *** Event Stats ***\n" +
                                algs.eventStats().statsDictionary().description(),
                            "Frame 13 @10120ms, *** Touch State Description ***\n" +
                                algs.touchStateDescription(nothing().samples().data(), 10120),
                            "Frame 13 @10120ms, *** Virtual State Description ***\n" +
                                algs.virtualStateDescription(nothing().samples().data(), 10120)));
    EXPECT_EQ(surface.counters().numTaps, 1U);
    messages.clear();
    surface.algs.handleReset();
    ASSERT_EQ(messages.size(), 3U);
    EXPECT_THAT(messages[0], StartsWith("Frame 0 @0ms, *** Event Stats ***\n"));
}

TEST_F(FrameLogTest, ReadinessIsTestedBeforeEachMessage) {
    Vexa::Log::setLevel(Vexa::LogCategory::Algs, Vexa::LogLevel::Debug);
    closeAfterOne = true;
    surface.feel(kFinger);
    EXPECT_EQ(messages.size(), 1U);
}

}  // namespace
}  // namespace VexaTouch
