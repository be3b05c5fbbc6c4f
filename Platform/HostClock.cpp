#include "Platform/HostClock.h"

#include <vexa/clock.h>
#include <algorithm>
#include <chrono>
#include <thread>

namespace Vexa {

namespace {

class SteadyHostClock final : public HostClock {
public:
    // The library's, whose time stamps of reports must be of the same clock.
    std::uint64_t now() override { return vexa_clock_now(); }

    void sleepMicroseconds(std::uint64_t microseconds) override {
        // Whole days one after another: a longer duration would overflow on its way to the kernel.
        constexpr std::uint64_t kDay = 86'400'000'000;
        while (microseconds > 0) {
            const std::uint64_t step = std::min(microseconds, kDay);
            std::this_thread::sleep_for(std::chrono::microseconds(step));
            microseconds -= step;
        }
    }
};

}  // namespace

HostClock& HostClock::system() noexcept {
    // Trivially destructible, hence still there for threads that outlive main.
    static SteadyHostClock clock;
    return clock;
}

}  // namespace Vexa
