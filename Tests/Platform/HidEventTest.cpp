#include "Platform/HidEvent.h"

#include <gtest/gtest.h>

namespace Vexa {
namespace {

TEST(HidEventTest, ADigitizerEventKeepsItsRecord) {
    const DigitizerEventRecord record{.timestamp = 7,
                                      .transducerType = 2,
                                      .index = 3,
                                      .identity = 4,
                                      .eventMask = 0x20000,
                                      .buttonMask = 5,
                                      .x = 0.5,
                                      .y = 1,
                                      .z = 2,
                                      .tipPressure = 3,
                                      .barrelPressure = 4,
                                      .inRange = true,
                                      .touching = true,
                                      .options = 6};
    const HidEvent event = HidEvent::digitizer(record);
    EXPECT_EQ(event.type(), HidEventType::Digitizer);
    EXPECT_EQ(event.timestamp(), 7u);
    EXPECT_EQ(event.phase(), HidEventPhase::None);
    EXPECT_EQ(event.integerField(HidEventField::DigitizerFrameNumber), 0);
    ASSERT_TRUE(event.digitizerRecord());
    EXPECT_EQ(*event.digitizerRecord(), record);
    EXPECT_FALSE(event.vendorRecord());
    EXPECT_EQ(event.description(),
              "digitizer timestamp=7 transducerType=2 index=3 identity=4 eventMask=0x20000 "
              "buttonMask=0x5 x=0.5 y=1.0 z=2.0 tipPressure=3.0 barrelPressure=4.0 inRange "
              "touching options=0x6");
}

TEST(HidEventTest, AVendorEventKeepsItsRecord) {
    const VendorEventRecord record{.timestamp = 7,
                                   .usagePage = 0xFF60,
                                   .usage = 2,
                                   .version = 3,
                                   .payload = {0x01, 0xAB},
                                   .options = 4};
    const HidEvent event = HidEvent::vendorDefined(record);
    EXPECT_EQ(event.type(), HidEventType::VendorDefined);
    EXPECT_EQ(event.timestamp(), 7u);
    ASSERT_TRUE(event.vendorRecord());
    EXPECT_EQ(*event.vendorRecord(), record);
    EXPECT_FALSE(event.digitizerRecord());
    EXPECT_EQ(event.description(),
              "vendor-defined timestamp=7 usagePage=0xff60 usage=0x2 version=3 payload=<01ab> "
              "options=0x4");
}

TEST(HidEventTest, FieldsAtTheirDefaultsAreNotDescribed) {
    EXPECT_EQ(HidEvent::digitizer({}).description(), "digitizer");
    EXPECT_EQ(HidEvent::vendorDefined({}).description(), "vendor-defined");
}

TEST(HidEventTest, EveryCopySeesWhatIsSet) {
    const HidEvent event = HidEvent::digitizer({.eventMask = 2, .y = 3});
    const HidEvent copy = event;  // NOLINT(performance-unnecessary-copy-initialization)
    copy.setTimestamp(99);
    copy.setPhase(HidEventPhase::MayBegin);
    copy.setIntegerField(HidEventField::DigitizerFrameNumber, 4294967295);
    EXPECT_EQ(event.timestamp(), 99u);
    EXPECT_EQ(event.digitizerRecord()->timestamp, 99u);
    EXPECT_EQ(event.phase(), HidEventPhase::MayBegin);
    EXPECT_EQ(event.integerField(HidEventField::DigitizerFrameNumber), 4294967295);
    EXPECT_EQ(event.description(),
              "digitizer timestamp=99 phase=may-begin frameNumber=4294967295 eventMask=0x2 y=3.0");
}

TEST(HidEventTest, DescribesEachPhase) {
    const HidEvent event = HidEvent::vendorDefined({});
    const auto describe = [&event](HidEventPhase phase) {
        event.setPhase(phase);
        return event.description();
    };
    EXPECT_EQ(describe(HidEventPhase::Began), "vendor-defined phase=began");
    EXPECT_EQ(describe(HidEventPhase::Changed), "vendor-defined phase=changed");
    EXPECT_EQ(describe(HidEventPhase::Ended), "vendor-defined phase=ended");
    EXPECT_EQ(describe(HidEventPhase::Cancelled), "vendor-defined phase=cancelled");
    EXPECT_EQ(describe(static_cast<HidEventPhase>(3)), "vendor-defined phase=3");
    EXPECT_EQ(describe(HidEventPhase::None), "vendor-defined");
}

TEST(HidEventTest, AVendorEventHasNoFrameNumber) {
    const HidEvent event = HidEvent::vendorDefined({});
    event.setIntegerField(HidEventField::DigitizerFrameNumber, 5);
    event.setTimestamp(8);
    EXPECT_EQ(event.integerField(HidEventField::DigitizerFrameNumber), 0);
    EXPECT_EQ(event.vendorRecord()->timestamp, 8u);
}

TEST(HidEventTest, AnUnknownFieldIsIgnored) {
    const HidEvent event = HidEvent::digitizer({});
    event.setIntegerField(static_cast<HidEventField>(0x000B0001), 5);
    EXPECT_EQ(event.integerField(static_cast<HidEventField>(0x000B0001)), 0);
    EXPECT_EQ(event.integerField(HidEventField::DigitizerFrameNumber), 0);
}

TEST(HidEventTest, ReferencesGoInAndOut) {
    const std::int64_t before = vexa_live_objects(VEXA_OBJECT_EVENT);
    {
        const vexa_digitizer_record record{};
        HidEvent event = HidEvent::adopt(vexa_event_create_digitizer(&record));
        const HidEvent shared = HidEvent::share(event.handle());
        EXPECT_EQ(shared, event);
        vexa_event* const detached = event.detach();
        EXPECT_EQ(event.handle(), nullptr);
        EXPECT_EQ(detached, shared.handle());
        vexa_event_set_phase(detached, VEXA_EVENT_PHASE_ENDED);
        vexa_event_release(detached);
        EXPECT_EQ(shared.phase(), HidEventPhase::Ended);
    }
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_EVENT), before);
}

TEST(HidEventTest, EventsAreEqualWhenTheyAreTheSameObject) {
    const HidEvent event = HidEvent::digitizer({});
    const HidEvent copy = event;  // NOLINT(performance-unnecessary-copy-initialization)
    EXPECT_EQ(event, copy);
    EXPECT_FALSE(event == HidEvent::digitizer({}));
}

}  // namespace
}  // namespace Vexa
