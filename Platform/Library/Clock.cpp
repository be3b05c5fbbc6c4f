#include <vexa/clock.h>
#include <ctime>

extern "C" uint64_t vexa_clock_now(void) noexcept {
    timespec now{};
    static_cast<void>(::clock_gettime(CLOCK_MONOTONIC, &now));
    return static_cast<uint64_t>(now.tv_sec) * 1'000'000'000 + static_cast<uint64_t>(now.tv_nsec);
}
