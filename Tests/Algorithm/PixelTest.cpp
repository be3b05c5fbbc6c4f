#include "Algorithm/Pixel.h"

#include "Algorithm/VirtualPixel.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

namespace VexaTouch {
namespace {

constexpr float kThreshold = 200.0F;

/// A pixel of gain 1 after these samples at the default threshold.
Pixel pixelAfter(std::initializer_list<int> samples) {
    Pixel pixel(7, 1.0F);
    for (const int sample : samples) {
        pixel.updatePixelState(sample, kThreshold);
    }
    return pixel;
}

TEST(PixelTest, ANewPixelHasSeenNothing) {
    const Pixel pixel(3, 1.5F);
    EXPECT_EQ(pixel._value, 0);
    EXPECT_EQ(pixel._normalizationFactor, 1.5F);
    EXPECT_EQ(pixel._progress, 0.0F);
    EXPECT_EQ(pixel._peakProgress, 0.0F);
    EXPECT_EQ(pixel._valleyProgress, 0.0F);
    EXPECT_FALSE(pixel._isActive);
    EXPECT_FALSE(pixel._isAboveNoise);
    EXPECT_FALSE(pixel._wasAboveNoise);
    EXPECT_FALSE(pixel._wasActive);
    EXPECT_EQ(pixel._maxProgressAboveNoise, 0.0F);
    EXPECT_EQ(pixel._index, 3);
}

TEST(PixelTest, ASampleIsScaledAndTruncatedTowardZero) {
    Pixel pixel(0, 1.9219F);
    pixel.updatePixelState(3, kThreshold);  // 5.7657
    EXPECT_EQ(pixel._value, 5);
    pixel.updatePixelState(-3, kThreshold);
    EXPECT_EQ(pixel._value, -5);
    EXPECT_EQ(pixel._progress, -5.0F / 200.0F);
}

TEST(PixelTest, ExtremeSamplesAreProcessedLikeAnyOther) {
    Pixel pixel(10, 2.4154F);
    pixel.updatePixelState(32767, kThreshold);
    EXPECT_EQ(pixel._value, static_cast<int>(32767.0F * 2.4154F));
    EXPECT_TRUE(pixel._isActive);
    pixel.updatePixelState(-32768, kThreshold);
    EXPECT_EQ(pixel._value, static_cast<int>(-32768.0F * 2.4154F));
    EXPECT_FALSE(pixel._isActive);
}

TEST(PixelTest, ZeroKeepsAnInactivePixelInactive) {
    const Pixel pixel = pixelAfter({50, 0});
    EXPECT_EQ(pixel._value, 0);
    EXPECT_EQ(pixel._progress, 0.0F);
    EXPECT_FALSE(pixel._isActive);
    EXPECT_EQ(pixel._valleyProgress, 0.0F);
}

TEST(PixelTest, TurnsOnStrictlyAboveTheActivationThreshold) {
    EXPECT_FALSE(pixelAfter({200})._isActive);
    const Pixel on = pixelAfter({201});
    EXPECT_TRUE(on._isActive);
    EXPECT_EQ(on._progress, 201.0F / 200.0F);
    EXPECT_TRUE(on._wasActive);
}

TEST(PixelTest, StaysOnStrictlyAboveSixtyPercentOfItsPeak) {
    EXPECT_TRUE(pixelAfter({400, 242})._isActive);
    EXPECT_FALSE(pixelAfter({400, 240})._isActive);
    // The peak is the highest since it turned on, not the last.
    EXPECT_FALSE(pixelAfter({400, 300, 240})._isActive);
    EXPECT_EQ(pixelAfter({400, 300})._peakProgress, 2.0F);
    EXPECT_EQ(pixelAfter({400, 300})._valleyProgress, 1.5F);
}

TEST(PixelTest, TurnsOnAgainOnlyWellAboveWhereItTurnedOff) {
    // Off at 1.2: on again above 2.0.
    EXPECT_FALSE(pixelAfter({400, 240, 400})._isActive);
    EXPECT_TRUE(pixelAfter({400, 240, 401})._isActive);
    EXPECT_EQ(pixelAfter({400, 240})._peakProgress, 1.2F);
}

TEST(PixelTest, ALowerValleyLetsItTurnOnEarlier) {
    EXPECT_FALSE(pixelAfter({400, 240, 180, 299})._isActive);  // 0.9 / 0.6 = 1.5
    EXPECT_TRUE(pixelAfter({400, 240, 180, 301})._isActive);
    // Never below the activation threshold itself.
    EXPECT_FALSE(pixelAfter({400, 240, 20, 200})._isActive);
    EXPECT_TRUE(pixelAfter({400, 240, 20, 201})._isActive);
    // A higher progress in between does not lift the valley.
    EXPECT_TRUE(pixelAfter({400, 240, 180, 190, 301})._isActive);
}

TEST(PixelTest, ANegativeSampleLowersTheValleyAndKeepsItOff) {
    const Pixel pixel = pixelAfter({-100});
    EXPECT_EQ(pixel._progress, -0.5F);
    EXPECT_EQ(pixel._valleyProgress, -0.5F);
    EXPECT_EQ(pixel._peakProgress, -0.5F);
    EXPECT_FALSE(pixel._isActive);
    EXPECT_FALSE(pixelAfter({-100, 200})._isActive);
    EXPECT_TRUE(pixelAfter({-100, 201})._isActive);
}

TEST(PixelTest, NoiseEndsAtSeventyFive) {
    const Pixel noise = pixelAfter({75});
    EXPECT_FALSE(noise._isAboveNoise);
    EXPECT_FALSE(noise._wasAboveNoise);
    EXPECT_EQ(noise._maxProgressAboveNoise, 0.0F);

    const Pixel above = pixelAfter({76});
    EXPECT_TRUE(above._isAboveNoise);
    EXPECT_TRUE(above._wasAboveNoise);
    EXPECT_EQ(above._maxProgressAboveNoise, 76.0F / 200.0F);
}

TEST(PixelTest, StickyStatisticsStayUntilTheyAreReset) {
    Pixel pixel = pixelAfter({400, 300, 0, -50, 70, 0});
    EXPECT_FALSE(pixel._isActive);
    EXPECT_FALSE(pixel._isAboveNoise);
    EXPECT_TRUE(pixel._wasAboveNoise);
    EXPECT_TRUE(pixel._wasActive);
    EXPECT_EQ(pixel._maxProgressAboveNoise, 2.0F);

    pixel.resetGlobalStats();
    EXPECT_FALSE(pixel._wasAboveNoise);
    EXPECT_FALSE(pixel._wasActive);
    EXPECT_EQ(pixel._maxProgressAboveNoise, 0.0F);
}

TEST(PixelTest, AResetOfTheStatisticsLeavesTheHysteresisAlone) {
    Pixel pixel = pixelAfter({400, 300});
    pixel.resetGlobalStats();
    EXPECT_EQ(pixel._value, 300);
    EXPECT_EQ(pixel._progress, 1.5F);
    EXPECT_EQ(pixel._peakProgress, 2.0F);
    EXPECT_EQ(pixel._valleyProgress, 1.5F);
    EXPECT_TRUE(pixel._isActive);
    EXPECT_TRUE(pixel._isAboveNoise);
}

TEST(PixelTest, AThresholdOfZeroGivesInfiniteProgress) {
    Pixel pixel(0, 1.0F);
    pixel.updatePixelState(1, 0.0F);
    EXPECT_EQ(pixel._progress, std::numeric_limits<float>::infinity());
    EXPECT_TRUE(pixel._isActive);
    // 0 / 0 is no number: it is above nothing, becomes the peak and never the valley.
    pixel.updatePixelState(0, 0.0F);
    EXPECT_TRUE(std::isnan(pixel._progress));
    EXPECT_FALSE(pixel._isActive);
    EXPECT_TRUE(std::isnan(pixel._peakProgress));
    EXPECT_EQ(pixel._valleyProgress, std::numeric_limits<float>::infinity());
    // An infinite valley keeps it off until something lower was seen.
    pixel.updatePixelState(32767, kThreshold);
    EXPECT_FALSE(pixel._isActive);
}

TEST(PixelTest, APeakThatIsNoNumberStaysWhenThePixelTurnsOn) {
    Pixel pixel(0, 1.0F);
    pixel.updatePixelState(0, 0.0F);
    pixel.updatePixelState(300, kThreshold);
    EXPECT_TRUE(pixel._isActive);
    EXPECT_TRUE(std::isnan(pixel._peakProgress));
    // Nothing is above sixty percent of it.
    pixel.updatePixelState(3000, kThreshold);
    EXPECT_FALSE(pixel._isActive);
}

TEST(PixelTest, ANegativeThresholdTurnsTheSignalRound) {
    Pixel pixel(0, 1.0F);
    pixel.updatePixelState(-300, -200.0F);
    EXPECT_EQ(pixel._progress, 1.5F);
    EXPECT_TRUE(pixel._isActive);
    EXPECT_FALSE(pixel._isAboveNoise);
    EXPECT_EQ(pixel._maxProgressAboveNoise, 0.0F);
}

TEST(PixelTest, EveryPixelHasItsRegion) {
    constexpr PixelRegion kRegions[] = {1, 1, 1, 1, 1, 1, 3, 3, 3, 3, 1, 2, 2, 2, 2};
    for (int i = 0; i < 15; ++i) {
        EXPECT_EQ(Pixel(i, 1.0F).getPixelRegion(), kRegions[i]) << i;
    }
}

TEST(PixelTest, OtherIndicesAreInNoRegionButWrapAtThirtyTwo) {
    for (int i = 15; i < 32; ++i) {
        EXPECT_EQ(Pixel(i, 1.0F).getPixelRegion(), 0) << i;
    }
    EXPECT_EQ(Pixel(32 + 10, 1.0F).getPixelRegion(), 1);
    EXPECT_EQ(Pixel(32 + 15, 1.0F).getPixelRegion(), 0);
    EXPECT_EQ(Pixel(-32 + 6, 1.0F).getPixelRegion(), 3);
    EXPECT_EQ(Pixel(-1, 1.0F).getPixelRegion(), 0);
    EXPECT_EQ(Pixel('A', 1.0F).getPixelRegion(), 1);  // 65 is 1 modulo 32
}

TEST(VirtualPixelTest, IsAPixelWithANameAndAnIndexThatMoves) {
    VirtualPixel pixel("ABE", 'A', 0.5F);
    EXPECT_EQ(pixel._name, "ABE");
    EXPECT_EQ(pixel._index, 65);
    pixel.updatePixelState(500, kThreshold, 4);
    EXPECT_EQ(pixel._value, 250);
    EXPECT_TRUE(pixel._isActive);
    EXPECT_EQ(pixel._index, 4);
    EXPECT_EQ(pixel._name, "ABE");
}

}  // namespace
}  // namespace VexaTouch
