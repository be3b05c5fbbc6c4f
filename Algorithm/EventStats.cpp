#include "Algorithm/EventStats.h"

#include <string>
#include <utility>

namespace VexaTouch {

namespace {

using Counters = EventStats::Counters;

/// Adds one to the counter of the region, if the table has one for it; index = region number.
using RegionCounters = std::array<std::uint64_t Counters::*, kRegionCount>;

void countRegion(Counters& counters, const RegionCounters& table, PixelRegion region) noexcept {
    if (region < 0 || static_cast<std::size_t>(region) >= table.size()) {
        return;
    }
    const auto counter = table[static_cast<std::size_t>(region)];
    if (counter != nullptr) {
        ++(counters.*counter);
    }
}

constexpr RegionCounters kTap = {nullptr, &Counters::numPlayPause, &Counters::numVolumeDown,
                                 &Counters::numVolumeUp};
constexpr RegionCounters kRejectedTap = {nullptr, &Counters::numRejectedPlayPause,
                                         &Counters::numRejectedVolumeDown,
                                         &Counters::numRejectedVolumeUp};
constexpr RegionCounters kBeginHold = {
    nullptr, &Counters::numQuarnCall, &Counters::numVolumeDecrement, &Counters::numVolumeIncrement};
constexpr RegionCounters kIncrementHold = {nullptr, &Counters::numQuarnCallIncrement,
                                           &Counters::numVolumeDecrement,
                                           &Counters::numVolumeIncrement};
constexpr RegionCounters kRejectedBeginHold = {nullptr, &Counters::numRejectedQuarnCall,
                                               &Counters::numRejectedVolumeDecrement,
                                               &Counters::numRejectedVolumeIncrement};
constexpr RegionCounters kRejectedIncrementHold = {
    nullptr, &Counters::numRejectedQuarnCallIncrement, &Counters::numRejectedVolumeDecrement,
    &Counters::numRejectedVolumeIncrement};
constexpr RegionCounters kRejectedHoldOnly = {
    nullptr, nullptr, &Counters::numRejectedVolumeDecrement, &Counters::numRejectedVolumeIncrement};

}  // namespace

// "numHolding2Suppressed" is reported as dispatched and "numSuppressed2Holding" as rejected.
constexpr std::array<EventStats::CounterEntry, 24> EventStats::kCounterTable = {{
    {"numTaps", &Counters::numTaps, true},
    {"numBeginHold", &Counters::numBeginHold, true},
    {"numIncrementHold", &Counters::numIncrementHold, true},
    {"numEndHold", &Counters::numEndHold, true},
    {"numVolumeUp", &Counters::numVolumeUp, true},
    {"numVolumeDown", &Counters::numVolumeDown, true},
    {"numPlayPause", &Counters::numPlayPause, true},
    {"numQuarnCall", &Counters::numQuarnCall, true},
    {"numQuarnCallIncrement", &Counters::numQuarnCallIncrement, true},
    {"numVolumeIncrement", &Counters::numVolumeIncrement, true},
    {"numVolumeDecrement", &Counters::numVolumeDecrement, true},
    {"numRejectedTap", &Counters::numRejectedTap, false},
    {"numRejectedBeginHold", &Counters::numRejectedBeginHold, false},
    {"numRejectedIncrementHold", &Counters::numRejectedIncrementHold, false},
    {"numRejectedEndHold", &Counters::numRejectedEndHold, false},
    {"numRejectedVolumeUp", &Counters::numRejectedVolumeUp, false},
    {"numRejectedVolumeDown", &Counters::numRejectedVolumeDown, false},
    {"numRejectedPlayPause", &Counters::numRejectedPlayPause, false},
    {"numRejectedQuarnCall", &Counters::numRejectedQuarnCall, false},
    {"numRejectedQuarnCallIncrement", &Counters::numRejectedQuarnCallIncrement, false},
    {"numRejectedVolumeIncrement", &Counters::numRejectedVolumeIncrement, false},
    {"numRejectedVolumeDecrement", &Counters::numRejectedVolumeDecrement, false},
    {"numSuppressed2Holding", &Counters::numSuppressed2Holding, false},
    {"numHolding2Suppressed", &Counters::numHolding2Suppressed, true},
}};

void EventStats::update(const HandStats& h) noexcept {
    // The first rule that matches decides.
    if (h._isTouching && !h._wasTouching) {
        return;
    }
    if (h._isHoldSuppressed) {
        countSuppressedHold(h);
    } else if (h._isHolding && !h._wasHolding) {
        _stats.numSuppressed2Holding += h._wasHoldSuppressed ? 1U : 0U;
        ++_stats.numBeginHold;
        countRegion(_stats, kBeginHold, h._activeRegion);
    } else if (h._isHolding) {
        ++_stats.numIncrementHold;
        countRegion(_stats, kIncrementHold, h._activeRegion);
    } else if (h._wasHolding) {
        ++_stats.numEndHold;
    } else if (!h._wouldBeIsHolding && h._wouldBeWasHolding) {
        ++_stats.numRejectedEndHold;
    } else {
        countTap(h);
    }
}

void EventStats::countSuppressedHold(const HandStats& h) noexcept {
    _stats.numHolding2Suppressed += h._wasHolding ? 1U : 0U;
    if (!h._wouldBeIsHolding) {
        countRegion(_stats, kRejectedHoldOnly, h._activeRegion);
    } else if (!h._wouldBeWasHolding) {
        ++_stats.numRejectedBeginHold;
        countRegion(_stats, kRejectedBeginHold, h._activeRegion);
    } else {
        ++_stats.numRejectedIncrementHold;
        countRegion(_stats, kRejectedIncrementHold, h._activeRegion);
    }
}

void EventStats::countTap(const HandStats& h) noexcept {
    if (h._isTap) {
        ++_stats.numTaps;
        countRegion(_stats, kTap, h._activeRegion);
    } else if (h._maybeTap) {
        ++_stats.numRejectedTap;
        countRegion(_stats, kRejectedTap, h._activeRegion);
    }
}

Vexa::PropertyValue EventStats::statsDictionary() const {
    Vexa::PropertyValue::Dictionary dispatched;
    Vexa::PropertyValue::Dictionary rejected;
    for (const CounterEntry& entry : kCounterTable) {
        (entry.dispatched ? dispatched : rejected)
            .emplace(std::string(entry.name), _stats.*entry.counter);
    }
    return Vexa::PropertyValue::Dictionary{{"Dispatched", std::move(dispatched)},
                                           {"Rejected", std::move(rejected)}};
}

}  // namespace VexaTouch
