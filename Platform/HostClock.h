#pragma once

#include <cstdint>

namespace Vexa {

/// The ratio of host ticks to time: nanoseconds = ticks * numerator / denominator.
struct Timebase {
    std::uint32_t numerator = 1;
    std::uint32_t denominator = 1;

    friend bool operator==(const Timebase&, const Timebase&) = default;
};

/// The timebase of the host tick clock. Fixed for the life of the process; any thread.
Timebase hostTimebase() noexcept;

/// A monotonic tick clock and the blocking sleep that goes with it.
///
/// Whoever reads time takes one of these, so that a test or a replay can supply its own.
class HostClock {
public:
    virtual ~HostClock() = default;

    /// Host ticks, never decreasing. Any thread.
    [[nodiscard]] virtual std::uint64_t now() = 0;

    /// Blocks the calling thread for at least this long. Any duration is accepted.
    virtual void sleepMicroseconds(std::uint64_t microseconds) = 0;

    /// The clock of the machine; lives as long as the process. Any thread.
    static HostClock& system() noexcept;

protected:
    HostClock() = default;
    HostClock(const HostClock&) = default;
    HostClock(HostClock&&) = default;
    HostClock& operator=(const HostClock&) = default;
    HostClock& operator=(HostClock&&) = default;
};

}  // namespace Vexa
