#include "Tools/LatencySummary.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <numeric>
#include <ostream>
#include <random>
#include <vector>

namespace VexaTouch::Tools {

void PrintTo(const LatencySummary& summary, std::ostream* stream) {
    *stream << summary.samples << " samples: " << summary.p50 << ' ' << summary.p90 << ' '
            << summary.p99 << ' ' << summary.p999 << ' ' << summary.most;
}

namespace {

std::vector<std::uint64_t> oneTo(std::uint64_t last) {
    std::vector<std::uint64_t> numbers(last);
    std::iota(numbers.begin(), numbers.end(), std::uint64_t{1});
    std::ranges::shuffle(numbers, std::mt19937(1));
    return numbers;
}

TEST(LatencySummaryTest, NoSamplesComeToNothing) {
    EXPECT_EQ(LatencySummary::of({}), LatencySummary{});
}

TEST(LatencySummaryTest, OneSampleIsAllPercentiles) {
    EXPECT_EQ(LatencySummary::of({7}), (LatencySummary{1, 7, 7, 7, 7, 7}));
}

TEST(LatencySummaryTest, PercentilesAreSamplesWhateverTheirOrder) {
    EXPECT_EQ(LatencySummary::of(oneTo(10'000)),
              (LatencySummary{10'000, 5000, 9000, 9900, 9990, 10'000}));
    EXPECT_EQ(LatencySummary::of(oneTo(1000)), (LatencySummary{1000, 500, 900, 990, 999, 1000}));
}

TEST(LatencySummaryTest, APercentileBetweenTwoSamplesIsTheUpperOne) {
    EXPECT_EQ(LatencySummary::of(oneTo(15)), (LatencySummary{15, 8, 14, 15, 15, 15}));
    EXPECT_EQ(LatencySummary::of(oneTo(2)), (LatencySummary{2, 1, 2, 2, 2, 2}));
    EXPECT_EQ(LatencySummary::of(oneTo(1001)), (LatencySummary{1001, 501, 901, 991, 1000, 1001}));
}

}  // namespace
}  // namespace VexaTouch::Tools
