// A process of its own, since it brings the host's timebase itself: one that makes no sense.

#include "Platform/HostClock.h"
#include "Shared/Util.h"

#include <gtest/gtest.h>

#include <cstdint>

Vexa::Timebase Vexa::hostTimebase() noexcept {
    return {.numerator = 0, .denominator = 0};
}

namespace VexaTouch::Util {
namespace {

TEST(ZeroTimebaseTest, ANumeratorOfZeroMakesZeroTicks) {
    for (const std::uint64_t value : {std::uint64_t{0}, std::uint64_t{1}, ~std::uint64_t{0}}) {
        EXPECT_EQ(machTimeFromNanoseconds(value), 0U);
    }
}

TEST(ZeroTimebaseTest, ADenominatorOfZeroMakesZeroNanoseconds) {
    for (const std::uint64_t value : {std::uint64_t{0}, std::uint64_t{1}, ~std::uint64_t{0}}) {
        EXPECT_EQ(nanosecondsFromMachTime(value), 0U);
    }
}

}  // namespace
}  // namespace VexaTouch::Util
