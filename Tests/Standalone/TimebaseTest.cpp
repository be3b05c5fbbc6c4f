// A process of its own, since it brings the host's timebase itself: a tick is 125/3 nanoseconds.

#include "Platform/HostClock.h"
#include "Shared/Util.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <thread>
#include <vector>

namespace {

std::atomic<int> timebaseReads{0};

}  // namespace

Vexa::Timebase Vexa::hostTimebase() noexcept {
    ++timebaseReads;
    return {.numerator = 125, .denominator = 3};
}

namespace VexaTouch::Util {
namespace {

// Each test runs alone in its process, so this one makes the first calls.
TEST(TimebaseTest, ThreadsThatRaceToTheFirstConversionShareOneTimebase) {
    constexpr int kThreads = 8;
    std::atomic<int> ready{0};
    std::vector<std::uint64_t> results(kThreads);
    std::vector<std::thread> threads;
    for (std::size_t i = 0; i < kThreads; ++i) {
        threads.emplace_back([&, i] {
            ++ready;
            while (ready < kThreads) {
                std::this_thread::yield();
            }
            results[i] = i % 2 == 0 ? nanosecondsFromMachTime(3) : machTimeFromNanoseconds(1000);
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(results, (std::vector<std::uint64_t>{125, 24, 125, 24, 125, 24, 125, 24}));
    EXPECT_EQ(timebaseReads, 1);
}

TEST(TimebaseTest, TicksAndNanosecondsTruncate) {
    EXPECT_EQ(nanosecondsFromMachTime(0), 0U);
    EXPECT_EQ(nanosecondsFromMachTime(1), 41U);
    EXPECT_EQ(nanosecondsFromMachTime(2), 83U);
    EXPECT_EQ(nanosecondsFromMachTime(3), 125U);
    EXPECT_EQ(nanosecondsFromMachTime(24'000'000), 1'000'000'000U);
    EXPECT_EQ(machTimeFromNanoseconds(0), 0U);
    EXPECT_EQ(machTimeFromNanoseconds(1), 0U);
    EXPECT_EQ(machTimeFromNanoseconds(41), 0U);
    EXPECT_EQ(machTimeFromNanoseconds(42), 1U);
    EXPECT_EQ(machTimeFromNanoseconds(1000), 24U);
    EXPECT_EQ(machTimeFromNanoseconds(1'000'000'000), 24'000'000U);
}

TEST(TimebaseTest, TheProductWrapsBeforeTheDivision) {
    constexpr std::uint64_t kTwoTo63 = std::uint64_t{1} << 63U;
    EXPECT_EQ(machTimeFromNanoseconds(~std::uint64_t{0}), (0U - std::uint64_t{3}) / 125);
    // 3 * 2^63 leaves 2^63.
    EXPECT_EQ(machTimeFromNanoseconds(kTwoTo63), kTwoTo63 / 125);
    EXPECT_EQ(machTimeFromNanoseconds(6'148'914'691'236'517'206U), 0U);  // 3n is 2^64 + 2
    EXPECT_EQ(nanosecondsFromMachTime(~std::uint64_t{0}), (0U - std::uint64_t{125}) / 3);
    EXPECT_EQ(nanosecondsFromMachTime(147'573'952'589'676'413U), 3U);  // 125t is 2^64 + 9
}

TEST(TimebaseTest, TheTimebaseIsReadOnce) {
    nanosecondsFromMachTime(1);
    machTimeFromNanoseconds(1);
    nanosecondsFromMachTime(1);
    EXPECT_EQ(timebaseReads, 1);
}

}  // namespace
}  // namespace VexaTouch::Util
