#include "Tools/FrameGaps.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <initializer_list>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

/// An image with a frame number.
std::vector<std::uint8_t> image(std::uint32_t number) {
    std::vector<std::uint8_t> report(73);
    report[0] = 1;
    for (std::size_t i = 0; i < 4; ++i) {
        report[1 + i] = static_cast<std::uint8_t>(number >> (8 * i));
    }
    return report;
}

std::pair<std::uint64_t, std::uint64_t> gapsAndLost(std::initializer_list<std::uint32_t> numbers) {
    FrameGaps gaps;
    for (const std::uint32_t number : numbers) {
        gaps.see(image(number));
    }
    return {gaps.gaps(), gaps.framesLost()};
}

using Counts = std::pair<std::uint64_t, std::uint64_t>;

TEST(FrameGapsTest, NumbersInARowHaveNone) {
    EXPECT_EQ(gapsAndLost({}), Counts(0, 0));
    EXPECT_EQ(gapsAndLost({7}), Counts(0, 0));
    EXPECT_EQ(gapsAndLost({7, 8, 9}), Counts(0, 0));
    EXPECT_EQ(gapsAndLost({0xFFFFFFFE, 0xFFFFFFFF, 0, 1}), Counts(0, 0));
}

TEST(FrameGapsTest, WhatIsMissingIsCounted) {
    EXPECT_EQ(gapsAndLost({1, 3, 4, 14}), Counts(2, 10));
    EXPECT_EQ(gapsAndLost({0xFFFFFFFF, 2}), Counts(1, 2));
}

TEST(FrameGapsTest, ANumberThatGoesBackIsAGapWithoutALoss) {
    EXPECT_EQ(gapsAndLost({500, 0, 1}), Counts(1, 0));
    EXPECT_EQ(gapsAndLost({500, 500}), Counts(1, 0));
}

TEST(FrameGapsTest, ANumberThatJumpsFarAheadIsAGapWithoutALoss) {
    EXPECT_EQ(gapsAndLost({1, 1'000'002}), Counts(1, 1'000'000));
    EXPECT_EQ(gapsAndLost({1, 1'000'003, 1'000'004}), Counts(1, 0));
    EXPECT_EQ(gapsAndLost({0, 0x7FFFFFFF}), Counts(1, 0));
}

TEST(FrameGapsTest, WhatIsNoImageIsPassedOver) {
    FrameGaps gaps;
    EXPECT_FALSE(gaps.see(image(1)));
    EXPECT_FALSE(gaps.see({}));
    EXPECT_FALSE(gaps.see(std::vector<std::uint8_t>{2, 0, 0, 0, 0, 0, 0, 0, 0, 0}));
    EXPECT_FALSE(gaps.see(std::vector<std::uint8_t>(72, 1)));
    EXPECT_FALSE(gaps.see(image(2)));
    EXPECT_TRUE(gaps.see(image(4)));
    EXPECT_EQ(gaps.gaps(), 1U);
    EXPECT_EQ(gaps.framesLost(), 1U);
}

}  // namespace
}  // namespace VexaTouch::Tools
