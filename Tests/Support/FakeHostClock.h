#pragma once

#include "Platform/HostClock.h"

#include <cstdint>
#include <vector>

namespace VexaTouch::Testing {

/// A clock that stands still until a test moves it; sleeping moves it too and is remembered.
/// One thread.
class FakeHostClock : public Vexa::HostClock {
public:
    std::uint64_t now() override {
        ++reads;
        return ticks;
    }
    void sleepMicroseconds(std::uint64_t microseconds) override {
        sleeps.push_back(microseconds);
        ticks += microseconds * ticksPerMicrosecond;
    }

    std::uint64_t ticks = 0;
    /// Of the default timebase, whose tick is a nanosecond.
    std::uint64_t ticksPerMicrosecond = 1000;
    int reads = 0;
    std::vector<std::uint64_t> sleeps;
};

}  // namespace VexaTouch::Testing
