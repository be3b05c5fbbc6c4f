#include "Tools/EventInbox.h"

#include <gmock/gmock.h>

#include <cstdint>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

DeliveredEvent eventWithLatency(std::uint64_t ns) {
    DeliveredEvent event;
    event.latencyNs = ns;
    return event;
}

std::vector<std::uint64_t> latencies(const EventInbox::Taken& taken) {
    std::vector<std::uint64_t> all;
    for (const DeliveredEvent& event : taken.events) {
        all.push_back(event.latencyNs);
    }
    return all;
}

TEST(EventInboxTest, GivesEventsOnceInTheirOrder) {
    const WakeUp wake;
    EventInbox inbox(wake);
    inbox.put(eventWithLatency(2));
    inbox.put(eventWithLatency(1));
    wake.wait({});  // was notified
    EXPECT_THAT(latencies(inbox.take()), ElementsAre(2, 1));
    EXPECT_THAT(latencies(inbox.take()), IsEmpty());
}

TEST(EventInboxTest, CountsWhatFindsNoRoomAndHasRoomAgainWhenEmptied) {
    const WakeUp wake;
    EventInbox inbox(wake, 2);
    for (std::uint64_t ns = 1; ns <= 5; ++ns) {
        inbox.put(eventWithLatency(ns));
    }
    const EventInbox::Taken full = inbox.take();
    EXPECT_THAT(latencies(full), ElementsAre(1, 2));
    EXPECT_EQ(full.lost, 3U);
    inbox.put(eventWithLatency(6));
    const EventInbox::Taken next = inbox.take();
    EXPECT_THAT(latencies(next), ElementsAre(6));
    EXPECT_EQ(next.lost, 0U);
}

}  // namespace
}  // namespace VexaTouch::Tools
