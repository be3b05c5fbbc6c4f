#include "Tools/LatencySummary.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
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

LatencySummary summaryOf(const std::vector<std::uint64_t>& latencies) {
    return LatencySummary::of(latencies);
}

TEST(LatencySummaryTest, NoSamplesComeToNothing) {
    EXPECT_EQ(summaryOf({}), LatencySummary{});
}

TEST(LatencySummaryTest, OneSampleIsAllPercentiles) {
    for (const std::uint64_t sample : std::to_array<std::uint64_t>(
             {0, 7, 2047, 2048, 123'456'789, std::uint64_t{1} << 63U, UINT64_MAX})) {
        EXPECT_EQ(summaryOf({sample}), (LatencySummary{1, sample, sample, sample, sample, sample}));
    }
}

TEST(LatencySummaryTest, PercentilesOfShortTimesAreSamplesWhateverTheirOrder) {
    EXPECT_EQ(summaryOf(oneTo(2000)), (LatencySummary{2000, 1000, 1800, 1980, 1998, 2000}));
    EXPECT_EQ(summaryOf(oneTo(1000)), (LatencySummary{1000, 500, 900, 990, 999, 1000}));
}

TEST(LatencySummaryTest, APercentileBetweenTwoSamplesIsTheUpperOne) {
    EXPECT_EQ(summaryOf(oneTo(15)), (LatencySummary{15, 8, 14, 15, 15, 15}));
    EXPECT_EQ(summaryOf(oneTo(2)), (LatencySummary{2, 1, 2, 2, 2, 2}));
    EXPECT_EQ(summaryOf(oneTo(1001)), (LatencySummary{1001, 501, 901, 991, 1000, 1001}));
}

// The bin in which the percentile lies ends there: from 8,192 on a bin is 8 wide.
TEST(LatencySummaryTest, PercentilesOfLongTimesAreTheEndsOfTheirBins) {
    EXPECT_EQ(summaryOf(oneTo(16'000)),
              (LatencySummary{16'000, 8003, 14'407, 15'847, 15'991, 16'000}));
}

TEST(LatencySummaryTest, APercentileIsAtMostAThousandthTooLarge) {
    const unsigned seed = std::random_device()();
    SCOPED_TRACE(seed);
    std::mt19937_64 random(seed);
    for (int round = 0; round < 100; ++round) {
        std::vector<std::uint64_t> samples(1000);
        for (std::uint64_t& sample : samples) {
            sample = random() >> (random() % 64);
        }
        const LatencySummary summary = summaryOf(samples);
        std::ranges::sort(samples);
        const auto expectNear = [](std::uint64_t found, std::uint64_t exact) {
            EXPECT_GE(found, exact);
            EXPECT_LE(found - exact, exact / 1000);
        };
        expectNear(summary.p50, samples[499]);
        expectNear(summary.p90, samples[899]);
        expectNear(summary.p99, samples[989]);
        expectNear(summary.p999, samples[998]);
        EXPECT_EQ(summary.most, samples[999]);
    }
}

}  // namespace
}  // namespace VexaTouch::Tools
