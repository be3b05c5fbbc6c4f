#include "Algorithm/VirtualImage.h"

#include "Tests/Support/Touch.h"

#include <gmock/gmock.h>

#include <numeric>
#include <stdexcept>
#include <string>
#include <vector>

namespace VexaTouch {
namespace {

using ::testing::Each;
using ::testing::ElementsAre;

/// Fifteen pixels with these values, the named ones first.
std::vector<Pixel> pixelsWith(const Testing::Touch& values) {
    std::vector<Pixel> pixels;
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        pixels.emplace_back(static_cast<int>(i), 1.0F).updatePixelState(values.samples()[i], 200);
    }
    return pixels;
}

constexpr std::size_t kABE = 0;

TEST(VirtualImageTest, HoldsTheTwentyThreeGroups) {
    const VirtualImage image;
    EXPECT_THAT(image.neighborPixelGroups(),
                ElementsAre("ABE", "ABF", "ADEF", "AEGJ", "BCEF", "BFHJ", "CDE", "CDF", "CELN",
                            "DFLO", "EFK", "EJK", "EKL", "FJK", "FKL", "GHI", "GIJ", "HIJ", "IJK",
                            "KLM", "LMN", "LMO", "MNO"));
    EXPECT_THAT(image._normalizationFactors,
                ElementsAre(0.6667F, 0.4444F, 0.6667F, 0.5714F, 0.6667F, 0.5714F, 0.6667F, 0.4651F,
                            0.6667F, 0.6667F, 0.4F, 0.4F, 0.4F, 0.4F, 0.4F, 0.5714F, 0.4F, 0.4F,
                            0.4F, 0.4F, 0.4444F, 0.5714F, 0.6667F));
    EXPECT_EQ(image._values, std::vector<std::int32_t>(23, 0));
    ASSERT_EQ(image._maxPixelIndex.size(), 23U);
    for (std::size_t i = 0; i < 23; ++i) {
        EXPECT_EQ(image._maxPixelIndex[i], image.neighborPixelGroups()[i].front() - 'A') << i;
    }
}

TEST(VirtualImageTest, NoiseAddsNothingAndTakesNothingOver) {
    VirtualImage image;
    const std::vector<std::int32_t> before = image._maxPixelIndex;
    image.updateValues(pixelsWith(Testing::everything(75)));
    EXPECT_THAT(image._values, Each(0));
    EXPECT_EQ(image._maxPixelIndex, before);
    image.updateValues(pixelsWith(Testing::everything(-32768)));
    EXPECT_THAT(image._values, Each(0));
    EXPECT_EQ(image._maxPixelIndex, before);
}

TEST(VirtualImageTest, SumsTheMembersAboveNoiseOfEveryGroup) {
    VirtualImage image;
    Testing::Samples samples;
    std::iota(samples.begin(), samples.end(), std::int16_t{70});  // A = 70 ... F = 75, G = 76 ...
    image.updateValues(pixelsWith(Testing::Touch(samples)));
    std::vector<std::int32_t> sums;
    for (const std::string& group : image.neighborPixelGroups()) {
        std::int32_t sum = 0;
        for (const char letter : group) {
            sum += letter >= 'G' ? 70 + letter - 'A' : 0;
        }
        sums.push_back(sum);
    }
    EXPECT_EQ(image._values, sums);
}

TEST(VirtualImageTest, TheRememberedMemberStaysUntilAnotherIsStronger) {
    VirtualImage image;
    image.updateValues(pixelsWith(Testing::touch("A").at(100).with("B", 90).with("E", 80)));
    EXPECT_EQ(image._values[kABE], 270);
    EXPECT_EQ(image._maxPixelIndex[kABE], 0);
    image.updateValues(pixelsWith(Testing::touch("A").at(80).with("B", 90).with("E", 80)));
    EXPECT_EQ(image._values[kABE], 250);
    EXPECT_EQ(image._maxPixelIndex[kABE], 1);
}

TEST(VirtualImageTest, TheRememberedMemberWinsATie) {
    VirtualImage image;
    image.updateValues(pixelsWith(Testing::touch("ABE").at(100)));
    EXPECT_EQ(image._maxPixelIndex[kABE], 0);
    image.updateValues(pixelsWith(Testing::touch("E").at(200)));
    EXPECT_EQ(image._maxPixelIndex[kABE], 4);
    image.updateValues(pixelsWith(Testing::touch("ABE").at(100)));
    EXPECT_EQ(image._maxPixelIndex[kABE], 4);
}

TEST(VirtualImageTest, TheFirstOfTwoEquallyStrongerMembersTakesOver) {
    VirtualImage image;
    image.updateValues(pixelsWith(Testing::touch("BE").at(100)));
    EXPECT_EQ(image._maxPixelIndex[kABE], 1);
}

TEST(VirtualImageTest, MembersAreComparedWithWhoeverWonSoFarInThisFrame) {
    VirtualImage image;
    image.updateValues(pixelsWith(Testing::touch("A").at(100).with("B", 120).with("E", 110)));
    EXPECT_EQ(image._maxPixelIndex[kABE], 1);
    image.updateValues(pixelsWith(Testing::touch("A").at(100).with("B", 80).with("E", 110)));
    EXPECT_EQ(image._maxPixelIndex[kABE], 4);  // not A, although it was stronger than B
}

TEST(VirtualImageTest, AMemberAboveNoiseTakesOverFromOneBelow) {
    VirtualImage image;
    image.updateValues(pixelsWith(Testing::touch("A").at(300)));
    image.updateValues(pixelsWith(Testing::touch("A").at(20).with("E", 76)));
    EXPECT_EQ(image._maxPixelIndex[kABE], 4);
    EXPECT_EQ(image._values[kABE], 76);
}

TEST(VirtualImageTest, AMemberBelowNoiseNeverTakesOver) {
    VirtualImage image;
    image.updateValues(pixelsWith(Testing::touch("A").at(-50).with("BE", 75)));
    EXPECT_EQ(image._maxPixelIndex[kABE], 0);
}

TEST(VirtualImageTest, TheStrongestMemberIsRememberedAcrossQuietFrames) {
    VirtualImage image;
    image.updateValues(pixelsWith(Testing::touch("E").at(100)));
    image.updateValues(pixelsWith(Testing::nothing()));
    EXPECT_EQ(image._maxPixelIndex[kABE], 4);
    EXPECT_EQ(image._values[kABE], 0);
}

TEST(VirtualImageTest, ASumBeyondSixteenBitsIsKeptWhole) {
    VirtualImage image;
    image.updateValues(pixelsWith(Testing::touch("ABE").at(30000)));
    EXPECT_EQ(image._values[kABE], 90000);
}

TEST(VirtualImageTest, AMissingPixelIsOutOfRange) {
    VirtualImage image;
    std::vector<Pixel> pixels = pixelsWith(Testing::touch("ABE").at(100));
    pixels.pop_back();  // "O", of the group "DFLO" first
    EXPECT_THROW(image.updateValues(pixels), std::out_of_range);
    EXPECT_EQ(image._values[kABE], 300);  // half done
    EXPECT_THROW(image.updateValues({}), std::out_of_range);
}

TEST(VirtualImageTest, MissingSumsAreOutOfRange) {
    VirtualImage image;
    image._values.pop_back();
    EXPECT_THROW(image.updateValues(pixelsWith(Testing::touch("MNO").at(100))), std::out_of_range);
    EXPECT_EQ(image._values[21], 200);  // "LMO", before the one that is missing
}

TEST(VirtualImageTest, AMissingOrImpossibleRememberedMemberIsOutOfRange) {
    VirtualImage image;
    image._maxPixelIndex.pop_back();
    EXPECT_THROW(image.updateValues(pixelsWith(Testing::touch("MNO").at(100))), std::out_of_range);

    VirtualImage other;
    other._maxPixelIndex[kABE] = 15;
    EXPECT_THROW(other.updateValues(pixelsWith(Testing::touch("A").at(100))), std::out_of_range);
    other._maxPixelIndex[kABE] = -1;
    EXPECT_THROW(other.updateValues(pixelsWith(Testing::touch("A").at(100))), std::out_of_range);
}

}  // namespace
}  // namespace VexaTouch
