#include "Tools/ArrivalTimes.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <optional>
#include <thread>

namespace VexaTouch::Tools {
namespace {

TEST(ArrivalTimesTest, FindsTheLastThatCameUntilThen) {
    ArrivalTimes times;
    EXPECT_EQ(times.latestUntil(UINT64_MAX), std::nullopt);
    times.put(10);
    times.put(20);
    times.put(20);
    times.put(30);
    EXPECT_EQ(times.latestUntil(9), std::nullopt);
    EXPECT_EQ(times.latestUntil(10), 10U);
    EXPECT_EQ(times.latestUntil(19), 10U);
    EXPECT_EQ(times.latestUntil(29), 20U);
    EXPECT_EQ(times.latestUntil(UINT64_MAX), 30U);
}

TEST(ArrivalTimesTest, ForgetsTheOldest) {
    ArrivalTimes times;
    for (std::uint64_t i = 0; i <= ArrivalTimes::kCapacity; ++i) {
        times.put(i);
    }
    EXPECT_EQ(times.latestUntil(0), std::nullopt);
    EXPECT_EQ(times.latestUntil(1), 1U);
}

TEST(ArrivalTimesTest, AnswersRightlyWhileReportsCome) {
    ArrivalTimes times;
    std::atomic<std::uint64_t> put{0};
    // Even numbers only: an odd one is answered with its predecessor, or not at all.
    std::jthread input([&](const std::stop_token& stop) {
        for (std::uint64_t i = 2; !stop.stop_requested(); i += 2) {
            times.put(i);
            put = i;
        }
    });
    int answered = 0;
    while (answered < 100'000) {
        const std::uint64_t latest = put;
        if (latest == 0) {
            continue;
        }
        if (const auto found = times.latestUntil(latest + 1)) {
            ASSERT_EQ(*found, latest);
            ++answered;
        }
    }
}

}  // namespace
}  // namespace VexaTouch::Tools
