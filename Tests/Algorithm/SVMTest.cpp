#include "Algorithm/SVM.h"

#include "Tests/Support/SeededRandom.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <stdexcept>
#include <vector>

namespace VexaTouch {
namespace {

constexpr std::size_t kChannels = 38;

/// The score of channels with these values, the first fifteen being pixels; the rest is 0.
float scoreOf(std::vector<std::int32_t> values, float activationThreshold = 200.0F) {
    values.resize(kChannels);
    std::vector<Pixel> pixels;
    std::vector<VirtualPixel> virtualPixels;
    for (std::size_t i = 0; i < kChannels; ++i) {
        Pixel pixel(static_cast<int>(i), 1.0F);
        pixel.updatePixelState(values[i], 200.0F);
        if (i < 15) {
            pixels.push_back(pixel);
        } else {
            virtualPixels.emplace_back("X", 0, 1.0F).updatePixelState(values[i], 200.0F, 0);
        }
    }
    SVM svm;
    svm.updateSVMScore(pixels, virtualPixels, activationThreshold, 12345);
    EXPECT_EQ(svm.getSVMScore(), svm._score);
    return svm._score;
}

/// The sum over the ranks, each operation in single precision.
float linearScore(std::vector<std::int32_t> values) {
    values.resize(kChannels);
    std::sort(values.rbegin(), values.rend());
    float sum = 0.0F;
    for (std::size_t k = 0; k < kChannels; ++k) {
        const float distance = static_cast<float>(values[k]) - SVM::_mu[k];
        const float standardised = distance / SVM::_std_[k];
        const float term = standardised * SVM::_w[k];
        sum = sum + term;
    }
    return SVM::_b + sum;
}

TEST(SVMTest, BeginsWithScoreZero) {
    EXPECT_EQ(SVM().getSVMScore(), 0.0F);
}

TEST(SVMTest, HoldsThirtyEightParametersOfEachKind) {
    EXPECT_EQ(SVM::_mu.size(), kChannels);
    EXPECT_EQ(SVM::_std_.size(), kChannels);
    EXPECT_EQ(SVM::_w.size(), kChannels);
    EXPECT_EQ(SVM::_b, 2.0083F);
    EXPECT_EQ(SVM::_mu.front(), 559.2485F);
    EXPECT_EQ(SVM::_mu.back(), 2.1581F);
    EXPECT_EQ(SVM::_std_.front(), 319.631F);
    EXPECT_EQ(SVM::_std_.back(), 10.0508F);
    EXPECT_EQ(SVM::_w.front(), 2.0791F);
    EXPECT_EQ(SVM::_w[2], -0.0003F);
    EXPECT_EQ(SVM::_w.back(), -0.2101F);
    // Means fall with the rank.
    EXPECT_TRUE(std::is_sorted(SVM::_mu.rbegin(), SVM::_mu.rend()));
}

TEST(SVMTest, AQuietFrameScoresZeroAndNotTheBias) {
    EXPECT_EQ(scoreOf({}), 0.0F);
}

TEST(SVMTest, TheGateOpensStrictlyAboveTheThresholdOrWithASecondChannelAboveNoise) {
    EXPECT_EQ(scoreOf({200, 75}), 0.0F);
    EXPECT_EQ(scoreOf({201, 75}), linearScore({201, 75}));
    EXPECT_EQ(scoreOf({200, 76}), linearScore({200, 76}));
    EXPECT_EQ(scoreOf({76}), 0.0F);
    EXPECT_EQ(scoreOf({76, 76}), linearScore({76, 76}));
    EXPECT_NE(linearScore({201, 75}), 0.0F);
}

TEST(SVMTest, AThresholdThatIsNoNumberLeavesTheSecondChannelToDecide) {
    constexpr float kNan = std::numeric_limits<float>::quiet_NaN();
    EXPECT_EQ(scoreOf({30000, 75}, kNan), 0.0F);
    EXPECT_EQ(scoreOf({30000, 76}, kNan), linearScore({30000, 76}));
}

TEST(SVMTest, ANegativeThresholdAlwaysOpensTheGate) {
    EXPECT_EQ(scoreOf({}, -1.0F), linearScore({}));
    EXPECT_EQ(scoreOf({}, 0.0F), 0.0F);  // 0 is not above 0
}

TEST(SVMTest, TheScoreDependsOnTheShapeAndNotOnThePlace) {
    std::vector<std::int32_t> values = {310, 310, 250, 180, 90, 90, -40};
    values.resize(kChannels);
    const float score = scoreOf(values);
    EXPECT_EQ(score, linearScore(values));
    Testing::SeededRandom random(38);
    for (int i = 0; i < 100; ++i) {
        for (std::size_t k = kChannels - 1; k > 0; --k) {
            std::swap(values[k], values[random.next() % (k + 1)]);
        }
        ASSERT_EQ(scoreOf(values), score);
    }
}

TEST(SVMTest, ValuesNearTheirMeansScoreNearTheBias) {
    std::vector<std::int32_t> values;
    for (const float mean : SVM::_mu) {
        values.push_back(static_cast<std::int32_t>(std::lround(mean)));
    }
    EXPECT_NEAR(scoreOf(values), 2.0083F, 0.1F);
}

TEST(SVMTest, OneObjectScoresFrameAfterFrameAsIfEachWereItsFirst) {
    Testing::SeededRandom random(39);
    SVM svm;
    std::vector<Pixel> pixels;
    std::vector<VirtualPixel> virtualPixels;
    for (int i = 0; i < 15; ++i) {
        pixels.emplace_back(i, 1.0F);
    }
    for (int i = 0; i < 23; ++i) {
        virtualPixels.emplace_back("X", i, 1.0F);
    }
    for (int frame = 0; frame < 2000; ++frame) {
        std::vector<std::int32_t> values;
        for (Pixel& pixel : pixels) {
            pixel.updatePixelState(random.between(-100, random.oneIn(2) ? 100 : 800), 200.0F);
            values.push_back(pixel._value);
        }
        for (VirtualPixel& pixel : virtualPixels) {
            pixel.updatePixelState(random.between(0, random.oneIn(2) ? 2 : 800), 200.0F, 0);
            values.push_back(pixel._value);
        }
        svm.updateSVMScore(pixels, virtualPixels, 200.0F, 0);
        ASSERT_EQ(svm._score, scoreOf(values)) << "frame " << frame;
    }
}

TEST(SVMTest, AnotherNumberOfChannelsIsRejected) {
    SVM svm;
    std::vector<Pixel> pixels(15, Pixel(0, 1.0F));
    std::vector<VirtualPixel> virtualPixels(22, VirtualPixel("X", 0, 1.0F));
    EXPECT_THROW(svm.updateSVMScore(pixels, virtualPixels, 200.0F, 0), std::out_of_range);
    EXPECT_THROW(svm.updateSVMScore({}, {}, 200.0F, 0), std::out_of_range);
}

}  // namespace
}  // namespace VexaTouch
