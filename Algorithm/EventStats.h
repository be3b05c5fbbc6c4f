#pragma once

#include "Algorithm/HandStats.h"
#include "Platform/PropertyValue.h"

#include <array>
#include <cstdint>
#include <string_view>

namespace VexaTouch {

/// Counts, per frame, the gestures that were dispatched or rejected, split by action and by what
/// the region means. Counters wrap at 2^64. Not thread safe.
class EventStats {
public:
    struct Counters {
        std::uint64_t numTaps = 0;
        std::uint64_t numBeginHold = 0;
        std::uint64_t numIncrementHold = 0;
        std::uint64_t numEndHold = 0;
        std::uint64_t numVolumeUp = 0;
        std::uint64_t numVolumeDown = 0;
        std::uint64_t numPlayPause = 0;
        std::uint64_t numQuarnCall = 0;
        std::uint64_t numQuarnCallIncrement = 0;
        std::uint64_t numVolumeIncrement = 0;
        std::uint64_t numVolumeDecrement = 0;
        std::uint64_t numRejectedTap = 0;
        std::uint64_t numRejectedBeginHold = 0;
        std::uint64_t numRejectedIncrementHold = 0;
        std::uint64_t numRejectedEndHold = 0;
        std::uint64_t numRejectedVolumeUp = 0;
        std::uint64_t numRejectedVolumeDown = 0;
        std::uint64_t numRejectedPlayPause = 0;
        std::uint64_t numRejectedQuarnCall = 0;
        std::uint64_t numRejectedQuarnCallIncrement = 0;
        std::uint64_t numRejectedVolumeIncrement = 0;
        std::uint64_t numRejectedVolumeDecrement = 0;
        std::uint64_t numSuppressed2Holding = 0;
        std::uint64_t numHolding2Suppressed = 0;

        friend bool operator==(const Counters&, const Counters&) = default;
    };

    /// One counter: its name, its place, and under which of the two dictionaries it is reported.
    struct CounterEntry {
        std::string_view name;
        std::uint64_t Counters::* counter;
        bool dispatched;
    };
    /// All 24 counters in declaration order.
    static const std::array<CounterEntry, 24> kCounterTable;

    /// Sets all counters to 0.
    void Reset() noexcept { _stats = {}; }

    /// One frame's counting, from the flags and the active region alone.
    void update(const HandStats& h) noexcept;

    /// Two dictionaries, "Dispatched" and "Rejected", of 12 unsigned numbers each by counter name.
    /// Throws nothing but std::bad_alloc.
    [[nodiscard]] Vexa::PropertyValue statsDictionary() const;

    Counters _stats;

private:
    void countSuppressedHold(const HandStats& h) noexcept;
    void countTap(const HandStats& h) noexcept;
};

}  // namespace VexaTouch
