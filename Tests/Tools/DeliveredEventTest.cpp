#include "Tools/DeliveredEvent.h"

#include <gtest/gtest.h>

#include <cstdint>

namespace VexaTouch::Tools {
namespace {

constexpr std::uint64_t kTaken = 5'000'000'000;

Vexa::HidEvent tap(std::uint64_t timestamp) {
    Vexa::DigitizerEventRecord record;
    record.timestamp = timestamp;
    record.eventMask = 131'072;
    record.y = 3;
    const auto event = Vexa::HidEvent::digitizer(record);
    event.setIntegerField(Vexa::HidEventField::DigitizerFrameNumber, 18);
    return event;
}

TEST(DeliveredEventTest, LatencyIsFromTheReadingOfTheReportToTheCallback) {
    const auto delivered = DeliveredEvent::of(tap(kTaken), kTaken - 1000, kTaken + 44'678);
    EXPECT_EQ(delivered.latencyNs, 45'678U);
    EXPECT_EQ(deliveredEventJson(delivered),
              R"({"time_ns":5000000000,"latency_ns":45678,"frame":18,"kind":"tap","region":3,)"
              R"("phase":0,"mask":131072})");
}

TEST(DeliveredEventTest, ClockThatStandsBeforeTheReportGivesNoLatency) {
    EXPECT_EQ(DeliveredEvent::of(tap(kTaken), kTaken, kTaken - 1).latencyNs, 0U);
}

TEST(DeliveredEventTest, LineStandsUnderItsHeading) {
    const auto delivered = DeliveredEvent::of(tap(kTaken), kTaken, kTaken + 45'678);
    EXPECT_EQ(deliveredEventHeading(), "     host ms  latency us  event           region\n");
    EXPECT_EQ(deliveredEventLine(delivered, kTaken - 1'234'567'000),
              "    1234.567        45.7  tap             3 volume up\n");
    EXPECT_EQ(deliveredEventLine(delivered, kTaken + 500'000),
              "      -0.500        45.7  tap             3 volume up\n");
}

}  // namespace
}  // namespace VexaTouch::Tools
