#include "Tools/EventRecord.h"

#include "Algorithm/Algs.h"
#include "Tests/Tools/CommandRun.h"
#include "Tools/Failure.h"

#include <gmock/gmock.h>

#include <array>
#include <limits>
#include <string>

namespace VexaTouch::Tools {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Testing::TemporaryFolder;

struct KindCase {
    Vexa::HidEvent event;
    EventRecord expected;
};

TEST(EventRecordTest, EveryEventThatTheAlgorithmMakesHasItsKind) {
    const std::array cases = {
        KindCase{Algs::createMayBeginEvent(1),
                 {.frame = 77, .kind = EventKind::MayBegin, .region = 1, .phase = 128, .mask = 0}},
        KindCase{Algs::createHoldStartEvent(2),
                 {.frame = 77, .kind = EventKind::HoldStart, .region = 2, .phase = 1, .mask = 2}},
        KindCase{Algs::createHoldChangeEvent(3),
                 {.frame = 77, .kind = EventKind::HoldChange, .region = 3, .phase = 2, .mask = 2}},
        KindCase{Algs::createHoldEndEvent(0),
                 {.frame = 77, .kind = EventKind::HoldEnd, .region = 0, .phase = 4, .mask = 2}},
        KindCase{Algs::createTapEvent(3),
                 {.frame = 77, .kind = EventKind::Tap, .region = 3, .phase = 0, .mask = 131072}},
        KindCase{Algs::createCancelEvent(),
                 {.frame = 77, .kind = EventKind::Cancel, .region = 0, .phase = 8, .mask = 0}},
    };
    for (const KindCase& each : cases) {
        each.event.setIntegerField(Vexa::HidEventField::DigitizerFrameNumber, 77);
        EXPECT_EQ(eventRecordFromHidEvent(each.event), each.expected)
            << eventKindName(each.expected.kind);
    }
}

TEST(EventRecordTest, AVendorDefinedEventIsTheFirmwareReset) {
    const Vexa::HidEvent event =
        Vexa::HidEvent::vendorDefined({.usagePage = 0xFF60, .usage = 2, .payload = {}});
    EXPECT_EQ(eventRecordFromHidEvent(event), (EventRecord{.kind = EventKind::FirmwareReset}));
}

TEST(EventRecordTest, TheFrameNumberIsUnsigned) {
    const Vexa::HidEvent event = Algs::createTapEvent(1);
    event.setIntegerField(Vexa::HidEventField::DigitizerFrameNumber, 0xFFFFFFFF);
    EXPECT_EQ(eventRecordFromHidEvent(event).frame, 0xFFFFFFFFU);
}

TEST(EventRecordTest, RegionsMeanWhatTheEventDoesThere) {
    EXPECT_EQ(regionMeaning(EventKind::Tap, 1), "play/pause");
    EXPECT_EQ(regionMeaning(EventKind::Tap, 2), "volume down");
    EXPECT_EQ(regionMeaning(EventKind::Tap, 3), "volume up");
    EXPECT_EQ(regionMeaning(EventKind::HoldStart, 1), "voice-assistant call");
    EXPECT_EQ(regionMeaning(EventKind::HoldChange, 2), "volume decrement");
    EXPECT_EQ(regionMeaning(EventKind::HoldEnd, 3), "volume increment");
    EXPECT_EQ(regionMeaning(EventKind::MayBegin, 2), "volume down or decrement");
    EXPECT_EQ(regionMeaning(EventKind::Cancel, 0), "none");
    EXPECT_EQ(regionMeaning(EventKind::Tap, 4), "none");
}

TEST(EventRecordTest, JsonIsFlatAndExact) {
    const EventRecord event{.index = 12,
                            .timeNs = std::numeric_limits<std::uint64_t>::max(),
                            .deviceMs = 4294967295,
                            .frame = 7,
                            .kind = EventKind::HoldStart,
                            .region = 2,
                            .phase = 1,
                            .mask = 2};
    const std::string text =
        R"({"index":12,"time_ns":18446744073709551615,"device_ms":4294967295,"frame":7,)"
        R"("kind":"hold-start","region":2,"phase":1,"mask":2})";
    EXPECT_EQ(eventJson(event), text);
    EXPECT_EQ(eventFromJson(text), event);
}

TEST(EventRecordTest, EveryKindReadsBackInAnyOrderOfMembers) {
    for (const std::string name : {"may-begin", "hold-start", "hold-change", "hold-end", "tap",
                                   "cancel", "firmware-reset"}) {
        const EventRecord event =
            eventFromJson(R"( {"mask": 1, "phase": 2, "region": 3, "kind": ")" + name +
                          R"(", "frame": 4, "device_ms": 5, "time_ns": 6, "index": 7} )");
        EXPECT_EQ(event, (EventRecord{.index = 7,
                                      .timeNs = 6,
                                      .deviceMs = 5,
                                      .frame = 4,
                                      .kind = eventKindFromName(name).value(),
                                      .region = 3,
                                      .phase = 2,
                                      .mask = 1}));
        EXPECT_EQ(eventKindName(event.kind), name);
    }
}

std::string fault(const std::string& line) {
    try {
        eventFromJson(line);
    } catch (const Failure& failure) {
        return failure.what();
    }
    return "none";
}

TEST(EventRecordTest, WhatIsNoEventSaysWhatIsWrong) {
    const std::string good = eventJson({});
    const auto with = [&good](const std::string& from, const std::string& to) {
        std::string text = good;
        text.replace(text.find(from), from.size(), to);
        return text;
    };
    EXPECT_EQ(fault(good), "none");
    EXPECT_EQ(fault(""), "no JSON object");
    EXPECT_EQ(fault("[]"), "no JSON object");
    EXPECT_EQ(fault(good + ","), "no JSON object");
    EXPECT_EQ(fault(with(R"("frame":0,)", "")), R"("frame" is missing)");
    EXPECT_EQ(fault(with(R"("frame":0,)", R"("frame":-1,)")), R"("frame" is no unsigned integer)");
    EXPECT_EQ(fault(with(R"("mask":0)", R"("mask":0.0)")), R"("mask" is no unsigned integer)");
    EXPECT_EQ(fault(with(R"("index":0)", R"("index":true)")), R"("index" is no unsigned integer)");
    EXPECT_EQ(fault(with(R"("region":0)", R"("region":4294967296)")),
              R"("region" is above 4294967295)");
    EXPECT_EQ(fault(with(R"("kind":"may-begin",)", "")), R"("kind" is missing or no string)");
    EXPECT_EQ(fault(with("may-begin", "swipe")), R"("kind" is "swipe", which is no kind of event)");
    EXPECT_EQ(fault(with(R"("mask":0)", R"("mask":0,"more":1)")), "a member that no event has");
}

TEST(EventRecordTest, ExpectedEventsFilesMayHoldCommentsAndWindowsLineEnds) {
    const TemporaryFolder folder;
    const EventRecord tap{.index = 3, .kind = EventKind::Tap, .region = 1};
    EXPECT_THAT(readExpectedEvents(folder.file(
                    "events", "# why\r\n\r\n" + eventJson({}) + "\r\n\n" + eventJson(tap))),
                ElementsAre(EventRecord{}, tap));
    EXPECT_THAT(readExpectedEvents(folder.file("none", "")), IsEmpty());
}

}  // namespace
}  // namespace VexaTouch::Tools
