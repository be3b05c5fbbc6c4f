#include "Host/GestureEvent.h"

#include "Algorithm/Algs.h"

#include <gtest/gtest.h>

#include <limits>
#include <ostream>
#include <utility>
#include <vector>

namespace VexaTouch::Host {

static void PrintTo(const GestureEvent& gesture, std::ostream* out) {
    *out << eventKindName(gesture.kind) << " in region " << gesture.region;
}

namespace {

Vexa::HidEvent eventAt(double y) {
    return Vexa::HidEvent::digitizer({.y = y});
}

TEST(GestureEventTest, EveryEventOfTheServiceIsTold) {
    const std::vector<std::pair<Vexa::HidEvent, GestureEvent>> cases = {
        {Algs::createMayBeginEvent(1), {EventKind::MayBegin, 1}},
        {Algs::createHoldStartEvent(2), {EventKind::HoldStart, 2}},
        {Algs::createHoldChangeEvent(3), {EventKind::HoldChange, 3}},
        {Algs::createHoldEndEvent(0), {EventKind::HoldEnd, 0}},
        {Algs::createTapEvent(3), {EventKind::Tap, 3}},
        {Algs::createCancelEvent(), {EventKind::Cancel, 0}},
        {Vexa::HidEvent::vendorDefined({.usagePage = 0xFF60, .usage = 2, .payload = {}}),
         {EventKind::FirmwareReset, 0}},
    };
    for (const auto& [event, expected] : cases) {
        EXPECT_EQ(GestureEvent::of(event), expected);
    }
}

TEST(GestureEventTest, PhaseThatIsNotKnownIsNoTap) {
    const Vexa::HidEvent event = eventAt(1);
    for (const int phase : {3, 16, 129}) {
        event.setPhase(static_cast<Vexa::HidEventPhase>(phase));
        EXPECT_EQ(GestureEvent::of(event), (GestureEvent{EventKind::Cancel, 1})) << phase;
    }
}

TEST(GestureEventTest, CoordinateThatIsNoNumberOfARegionIsNone) {
    using Limits = std::numeric_limits<double>;
    for (const double y :
         {-1.0, -0.5, 4294967296.0, Limits::infinity(), -Limits::infinity(), Limits::quiet_NaN()}) {
        EXPECT_EQ(GestureEvent::of(eventAt(y)).region, 0U) << y;
    }
    EXPECT_EQ(GestureEvent::of(eventAt(4294967295.0)).region, 4294967295U);
}

}  // namespace
}  // namespace VexaTouch::Host
