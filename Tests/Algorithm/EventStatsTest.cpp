#include "Algorithm/EventStats.h"

#include "Tests/Support/PrintCounters.h"
#include "Tests/Support/PrintPropertyValue.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <set>
#include <string>

namespace VexaTouch {
namespace {

using Counters = EventStats::Counters;
using Dictionary = Vexa::PropertyValue::Dictionary;

/// A hand with nothing but an active region.
HandStats handIn(PixelRegion region) {
    HandStats hand;
    hand._activeRegion = region;
    return hand;
}

/// What one frame of this hand adds.
Counters countsOf(const HandStats& hand) {
    EventStats stats;
    stats.update(hand);
    return stats._stats;
}

/// The same hand in regions 0 to 4 must add `common`, and 1 to the counter of its region.
void expectCounts(HandStats hand, const Counters& common,
                  const std::array<std::uint64_t Counters::*, 3>& ofRegion) {
    for (int region = -1; region <= 5; ++region) {
        hand._activeRegion = region;
        Counters expected = common;
        if (region >= 1 && region <= 3) {
            const auto counter = ofRegion[static_cast<std::size_t>(region - 1)];
            if (counter != nullptr) {
                ++(expected.*counter);
            }
        }
        EXPECT_EQ(countsOf(hand), expected) << "region " << region;
    }
}

const Counters kNothing;

TEST(EventStatsTest, AnIdleFrameCountsNothing) {
    expectCounts(handIn(1), kNothing, {});
}

TEST(EventStatsTest, TheTouchDownFrameCountsNothingWhateverElseIsSet) {
    HandStats hand;
    hand._isTouching = true;
    hand._isHolding = true;
    hand._isTap = true;
    hand._isHoldSuppressed = true;
    hand._wouldBeIsHolding = true;
    expectCounts(hand, kNothing, {});
    hand._wasTouching = true;
    EXPECT_NE(countsOf(hand), kNothing);
}

TEST(EventStatsTest, ASuppressedHoldBegins) {
    HandStats hand;
    hand._isHoldSuppressed = true;
    hand._wouldBeIsHolding = true;
    expectCounts(hand, {.numRejectedBeginHold = 1},
                 {&Counters::numRejectedQuarnCall, &Counters::numRejectedVolumeDecrement,
                  &Counters::numRejectedVolumeIncrement});
}

TEST(EventStatsTest, ASuppressedHoldGoesOn) {
    HandStats hand;
    hand._isHoldSuppressed = true;
    hand._wouldBeIsHolding = true;
    hand._wouldBeWasHolding = true;
    expectCounts(hand, {.numRejectedIncrementHold = 1},
                 {&Counters::numRejectedQuarnCallIncrement, &Counters::numRejectedVolumeDecrement,
                  &Counters::numRejectedVolumeIncrement});
}

TEST(EventStatsTest, ASuppressedHoldThatIsNotDueCountsVolumeAlone) {
    HandStats hand;
    hand._isHoldSuppressed = true;
    expectCounts(
        hand, kNothing,
        {nullptr, &Counters::numRejectedVolumeDecrement, &Counters::numRejectedVolumeIncrement});
    hand._wouldBeWasHolding = true;
    expectCounts(
        hand, kNothing,
        {nullptr, &Counters::numRejectedVolumeDecrement, &Counters::numRejectedVolumeIncrement});
}

TEST(EventStatsTest, AHoldThatBecomesSuppressedIsCountedBesides) {
    HandStats hand;
    hand._isHoldSuppressed = true;
    hand._wasHolding = true;
    hand._wouldBeIsHolding = true;
    expectCounts(hand, {.numRejectedBeginHold = 1, .numHolding2Suppressed = 1},
                 {&Counters::numRejectedQuarnCall, &Counters::numRejectedVolumeDecrement,
                  &Counters::numRejectedVolumeIncrement});
}

TEST(EventStatsTest, SuppressionComesBeforeAHold) {
    HandStats hand;
    hand._isHoldSuppressed = true;
    hand._isHolding = true;
    hand._isTap = true;
    expectCounts(
        hand, kNothing,
        {nullptr, &Counters::numRejectedVolumeDecrement, &Counters::numRejectedVolumeIncrement});
}

TEST(EventStatsTest, AHoldBegins) {
    HandStats hand;
    hand._isHolding = true;
    expectCounts(
        hand, {.numBeginHold = 1},
        {&Counters::numQuarnCall, &Counters::numVolumeDecrement, &Counters::numVolumeIncrement});
}

TEST(EventStatsTest, AHoldThatWasSuppressedBeforeIsCountedBesides) {
    HandStats hand;
    hand._isHolding = true;
    hand._wasHoldSuppressed = true;
    expectCounts(
        hand, {.numBeginHold = 1, .numSuppressed2Holding = 1},
        {&Counters::numQuarnCall, &Counters::numVolumeDecrement, &Counters::numVolumeIncrement});
}

TEST(EventStatsTest, AHoldGoesOn) {
    HandStats hand;
    hand._isHolding = true;
    hand._wasHolding = true;
    hand._wasHoldSuppressed = true;  // of the begin alone
    expectCounts(hand, {.numIncrementHold = 1},
                 {&Counters::numQuarnCallIncrement, &Counters::numVolumeDecrement,
                  &Counters::numVolumeIncrement});
}

TEST(EventStatsTest, TheEndOfAHoldWinsOverEverythingAfterIt) {
    HandStats hand;
    hand._wasHolding = true;
    hand._wouldBeWasHolding = true;
    hand._isTap = true;
    hand._maybeTap = true;
    expectCounts(hand, {.numEndHold = 1}, {});
}

TEST(EventStatsTest, TheEndOfASuppressedHoldWinsOverATap) {
    HandStats hand;
    hand._wouldBeWasHolding = true;
    hand._isTap = true;
    expectCounts(hand, {.numRejectedEndHold = 1}, {});
    hand._wouldBeIsHolding = true;
    EXPECT_EQ(countsOf(hand), (Counters{.numTaps = 1}));
}

TEST(EventStatsTest, ATap) {
    HandStats hand;
    hand._isTap = true;
    hand._maybeTap = true;
    expectCounts(hand, {.numTaps = 1},
                 {&Counters::numPlayPause, &Counters::numVolumeDown, &Counters::numVolumeUp});
    hand._maybeTap = false;
    expectCounts(hand, {.numTaps = 1},
                 {&Counters::numPlayPause, &Counters::numVolumeDown, &Counters::numVolumeUp});
}

TEST(EventStatsTest, ARejectedTap) {
    HandStats hand;
    hand._maybeTap = true;
    expectCounts(hand, {.numRejectedTap = 1},
                 {&Counters::numRejectedPlayPause, &Counters::numRejectedVolumeDown,
                  &Counters::numRejectedVolumeUp});
}

TEST(EventStatsTest, HoldCountersOfARegionCountFrames) {
    EventStats stats;
    HandStats hand = handIn(2);
    hand._isTouching = true;
    hand._wasTouching = true;
    hand._isHolding = true;
    for (int frame = 0; frame < 5; ++frame) {
        stats.update(hand);
        hand._wasHolding = true;
    }
    EXPECT_EQ(stats._stats,
              (Counters{.numBeginHold = 1, .numIncrementHold = 4, .numVolumeDecrement = 5}));
}

TEST(EventStatsTest, CountersWrap) {
    EventStats stats;
    stats._stats.numTaps = std::numeric_limits<std::uint64_t>::max();
    HandStats hand;
    hand._isTap = true;
    stats.update(hand);
    EXPECT_EQ(stats._stats.numTaps, 0U);
}

TEST(EventStatsTest, ResetClearsEveryCounter) {
    EventStats stats;
    for (const EventStats::CounterEntry& entry : EventStats::kCounterTable) {
        stats._stats.*entry.counter = 7;
    }
    EXPECT_NE(stats._stats, kNothing);
    stats.Reset();
    EXPECT_EQ(stats._stats, kNothing);
}

TEST(EventStatsTest, TheTableNamesEveryCounterOnce) {
    std::set<std::string_view> names;
    EventStats stats;
    std::uint64_t next = 1;
    for (const EventStats::CounterEntry& entry : EventStats::kCounterTable) {
        names.insert(entry.name);
        EXPECT_EQ(stats._stats.*entry.counter, 0U) << entry.name;
        stats._stats.*entry.counter = next++;
    }
    EXPECT_EQ(names.size(), 24U);
}

TEST(EventStatsTest, TheDictionaryHoldsTwelveDispatchedAndTwelveRejectedNumbers) {
    EventStats stats;
    std::uint64_t next = 1;
    for (const EventStats::CounterEntry& entry : EventStats::kCounterTable) {
        stats._stats.*entry.counter = next++;
    }
    const auto number = [](std::uint64_t value) { return Vexa::PropertyValue(value); };
    const Dictionary dispatched = {{"numTaps", number(1)},
                                   {"numBeginHold", number(2)},
                                   {"numIncrementHold", number(3)},
                                   {"numEndHold", number(4)},
                                   {"numVolumeUp", number(5)},
                                   {"numVolumeDown", number(6)},
                                   {"numPlayPause", number(7)},
                                   {"numQuarnCall", number(8)},
                                   {"numQuarnCallIncrement", number(9)},
                                   {"numVolumeIncrement", number(10)},
                                   {"numVolumeDecrement", number(11)},
                                   {"numHolding2Suppressed", number(24)}};
    const Dictionary rejected = {{"numRejectedTap", number(12)},
                                 {"numRejectedBeginHold", number(13)},
                                 {"numRejectedIncrementHold", number(14)},
                                 {"numRejectedEndHold", number(15)},
                                 {"numRejectedVolumeUp", number(16)},
                                 {"numRejectedVolumeDown", number(17)},
                                 {"numRejectedPlayPause", number(18)},
                                 {"numRejectedQuarnCall", number(19)},
                                 {"numRejectedQuarnCallIncrement", number(20)},
                                 {"numRejectedVolumeIncrement", number(21)},
                                 {"numRejectedVolumeDecrement", number(22)},
                                 {"numSuppressed2Holding", number(23)}};
    EXPECT_EQ(stats.statsDictionary(),
              Vexa::PropertyValue(Dictionary{{"Dispatched", dispatched}, {"Rejected", rejected}}));
    for (const char* half : {"Dispatched", "Rejected"}) {
        const Vexa::PropertyValue counters = stats.statsDictionary().member(half);
        for (const auto [name, value] : *counters.asDictionary()) {
            EXPECT_EQ(value.type(), Vexa::PropertyValue::Type::Unsigned) << name;
        }
    }
}

TEST(EventStatsTest, AFreshDictionaryHoldsZeros) {
    std::size_t zeros = 0;
    const Vexa::PropertyValue stats = EventStats().statsDictionary();
    for (const char* half : {"Dispatched", "Rejected"}) {
        const Vexa::PropertyValue counters = stats.member(half);
        for (const auto [name, value] : *counters.asDictionary()) {
            EXPECT_EQ(value.toUnsigned64(), 0U) << name;
            ++zeros;
        }
    }
    EXPECT_EQ(zeros, 24U);
}

}  // namespace
}  // namespace VexaTouch
