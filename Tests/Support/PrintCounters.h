#pragma once

#include "Algorithm/EventStats.h"

#include <ostream>

namespace VexaTouch {

/// What a failed test shows: the counters that are not 0.
inline void PrintTo(const EventStats::Counters& counters, std::ostream* out) {
    for (const EventStats::CounterEntry& entry : EventStats::kCounterTable) {
        if (counters.*entry.counter != 0) {
            *out << entry.name << "=" << counters.*entry.counter << " ";
        }
    }
}

}  // namespace VexaTouch
