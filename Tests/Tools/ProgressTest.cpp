#include "Tools/Progress.h"

#include "Tests/Support/FakeHostClock.h"

#include <gmock/gmock.h>

#include <sstream>

namespace VexaTouch::Tools {
namespace {

using ::testing::EndsWith;

class ProgressTest : public ::testing::Test {
protected:
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Testing::FakeHostClock clock;
    Streams streams{.in = in, .out = out, .error = error, .errorIsTerminal = true, .clock = clock};

    void waitMs(std::uint64_t milliseconds) { clock.ticks += milliseconds * 1'000'000; }
};

TEST_F(ProgressTest, ALongWorkShowsHowFarItIsAndLeavesNothing) {
    {
        Progress progress(streams, "reading", 200, 1);
        progress.update(10);
        waitMs(500);
        progress.update(50);
        waitMs(99);
        progress.update(51);
        waitMs(1);
        progress.update(199);
        waitMs(100);
        progress.update(400);
        EXPECT_EQ(error.str(),
                  "\r\x1b[Kreading 25 %"
                  "\r\x1b[Kreading 99 %"
                  "\r\x1b[Kreading 100 %");
    }
    EXPECT_THAT(error.str(), EndsWith("100 %\r\x1b[K"));
}

TEST_F(ProgressTest, WithoutAKnownEndOnlyTheWorkIsNamed) {
    {
        Progress progress(streams, "reading", 0, 1);
        waitMs(500);
        progress.update(1);
    }
    EXPECT_EQ(error.str(), "\r\x1b[Kreading\r\x1b[K");
}

TEST_F(ProgressTest, AShortWorkShowsNothing) {
    {
        Progress progress(streams, "reading", 100, 1);
        waitMs(499);
        progress.update(50);
    }
    EXPECT_EQ(error.str(), "");
}

TEST_F(ProgressTest, TheTimeIsLookedAtOnlyNowAndThen) {
    Progress progress(streams, "playing", 10'000);
    const int before = clock.reads;
    for (std::uint64_t frame = 0; frame < 10'000; ++frame) {
        progress.update(frame);
    }
    EXPECT_EQ(clock.reads - before, 10);
}

TEST_F(ProgressTest, WhatIsNoTerminalIsLeftAlone) {
    streams.errorIsTerminal = false;
    {
        Progress progress(streams, "reading", 100, 1);
        waitMs(1000);
        progress.update(50);
    }
    EXPECT_EQ(error.str(), "");
}

}  // namespace
}  // namespace VexaTouch::Tools
