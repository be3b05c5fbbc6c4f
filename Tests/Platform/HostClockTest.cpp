#include "Platform/HostClock.h"

#include <gtest/gtest.h>

#include <cstdint>

namespace Vexa {
namespace {

TEST(HostClockTest, NeverGoesBack) {
    HostClock& clock = HostClock::system();
    std::uint64_t last = clock.now();
    for (int reading = 0; reading < 1000; ++reading) {
        const std::uint64_t now = clock.now();
        ASSERT_GE(now, last);
        last = now;
    }
}

TEST(HostClockTest, IsOneForTheWholeProcess) {
    EXPECT_EQ(&HostClock::system(), &HostClock::system());
}

TEST(HostClockTest, TicksAreNanoseconds) {
    EXPECT_EQ(hostTimebase(), (Timebase{.numerator = 1, .denominator = 1}));
}

TEST(HostClockTest, BlocksForAtLeastTheTimeAskedFor) {
    HostClock& clock = HostClock::system();
    const std::uint64_t start = clock.now();
    clock.sleepMicroseconds(0);
    clock.sleepMicroseconds(200);
    EXPECT_GE(clock.now() - start, 200'000u);
}

}  // namespace
}  // namespace Vexa
