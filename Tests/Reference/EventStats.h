#pragma once

#include "Platform/PropertyValue.h"
#include "Tests/Reference/HandStats.h"

#include <cstdint>

namespace VexaTouch::Reference {

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
    };

    void Reset() { _stats = Counters{}; }
    void update(const HandStats& h);
    Vexa::PropertyValue statsDictionary() const;

    Counters _stats;
};

}  // namespace VexaTouch::Reference
