#include "Platform/HostClock.h"

// Alone in its file, so that a program may bring a timebase of its own when it is linked.

namespace Vexa {

Timebase hostTimebase() noexcept {
    return {.numerator = 1, .denominator = 1};
}

}  // namespace Vexa
