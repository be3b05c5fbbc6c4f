// Events by the C interface, as a host or plug-in in another language meets them.

#include "Platform/Handle.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <vexa/abi.h>
#include <vexa/event.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <string>
#include <thread>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;

using Event = Handle<vexa_event, vexa_event_retain, vexa_event_release>;

constexpr vexa_digitizer_record kDigitizer{.timestamp = 7,
                                           .transducer_type = 2,
                                           .index = 3,
                                           .identity = 4,
                                           .event_mask = 0x20000,
                                           .button_mask = 5,
                                           .x = 0.5,
                                           .y = 1,
                                           .z = 2,
                                           .tip_pressure = 3,
                                           .barrel_pressure = 4,
                                           .in_range = true,
                                           .touching = true,
                                           .options = 6};

constexpr std::array<std::uint8_t, 2> kPayload{0x01, 0xAB};
constexpr vexa_vendor_record kVendor{.timestamp = 8,
                                     .usage_page = 0xFF60,
                                     .usage = 2,
                                     .version = 3,
                                     .payload = kPayload.data(),
                                     .payload_length = kPayload.size(),
                                     .options = 4};

Event digitizer() {
    return Event::adopt(vexa_event_create_digitizer(&kDigitizer));
}

Event vendorDefined() {
    return Event::adopt(vexa_event_create_vendor_defined(&kVendor));
}

std::string description(const vexa_event* event) {
    vexa_value* const text = vexa_event_create_description(event);
    std::size_t length = 0;
    const char* content = vexa_value_get_string(text, &length);
    std::string copy(content, length);
    vexa_value_release(text);
    return copy;
}

/// Every test ends with as many objects as it began with.
class VexaEventTest : public testing::Test {
protected:
    void TearDown() override {
        EXPECT_EQ(live(), 0);
        EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_VALUE), values_);
    }

    /// How many events live that the test made.
    [[nodiscard]] std::int64_t live() const {
        return vexa_live_objects(VEXA_OBJECT_EVENT) - events_;
    }

private:
    std::int64_t events_ = vexa_live_objects(VEXA_OBJECT_EVENT);
    std::int64_t values_ = vexa_live_objects(VEXA_OBJECT_VALUE);
};

TEST_F(VexaEventTest, ADigitizerEventKeepsItsRecord) {
    const Event event = digitizer();
    EXPECT_EQ(vexa_event_get_type(event.get()), VEXA_EVENT_TYPE_DIGITIZER);
    EXPECT_EQ(vexa_event_get_timestamp(event.get()), 7u);
    EXPECT_EQ(vexa_event_get_phase(event.get()), VEXA_EVENT_PHASE_NONE);
    vexa_digitizer_record record{};
    ASSERT_TRUE(vexa_event_get_digitizer(event.get(), &record));
    EXPECT_EQ(record.timestamp, 7u);
    EXPECT_EQ(record.transducer_type, 2u);
    EXPECT_EQ(record.index, 3u);
    EXPECT_EQ(record.identity, 4u);
    EXPECT_EQ(record.event_mask, 0x20000u);
    EXPECT_EQ(record.button_mask, 5u);
    EXPECT_EQ(record.x, 0.5);
    EXPECT_EQ(record.y, 1);
    EXPECT_EQ(record.z, 2);
    EXPECT_EQ(record.tip_pressure, 3);
    EXPECT_EQ(record.barrel_pressure, 4);
    EXPECT_TRUE(record.in_range);
    EXPECT_TRUE(record.touching);
    EXPECT_EQ(record.options, 6u);
}

TEST_F(VexaEventTest, AVendorEventKeepsItsRecordAndItsOwnPayload) {
    std::vector<std::uint8_t> payload(kPayload.begin(), kPayload.end());
    vexa_vendor_record given = kVendor;
    given.payload = payload.data();
    const Event event = Event::adopt(vexa_event_create_vendor_defined(&given));
    payload.assign({9, 9});
    EXPECT_EQ(vexa_event_get_type(event.get()), VEXA_EVENT_TYPE_VENDOR_DEFINED);
    EXPECT_EQ(vexa_event_get_timestamp(event.get()), 8u);
    vexa_vendor_record record{};
    ASSERT_TRUE(vexa_event_get_vendor_defined(event.get(), &record));
    EXPECT_EQ(record.timestamp, 8u);
    EXPECT_EQ(record.usage_page, 0xFF60u);
    EXPECT_EQ(record.usage, 2u);
    EXPECT_EQ(record.version, 3u);
    EXPECT_EQ(record.options, 4u);
    EXPECT_THAT(std::vector(record.payload, record.payload + record.payload_length),
                ElementsAre(0x01, 0xAB));
}

TEST_F(VexaEventTest, ARecordIsGivenForItsOwnTypeOnly) {
    vexa_vendor_record vendor{};
    vendor.version = 77;
    EXPECT_FALSE(vexa_event_get_vendor_defined(digitizer().get(), &vendor));
    EXPECT_EQ(vendor.version, 77u);
    vexa_digitizer_record touch{};
    touch.index = 77;
    EXPECT_FALSE(vexa_event_get_digitizer(vendorDefined().get(), &touch));
    EXPECT_EQ(touch.index, 77u);
}

TEST_F(VexaEventTest, AnEmptyPayloadNeedsNoPointer) {
    const vexa_vendor_record given{};
    const Event event = Event::adopt(vexa_event_create_vendor_defined(&given));
    vexa_vendor_record record = kVendor;
    ASSERT_TRUE(vexa_event_get_vendor_defined(event.get(), &record));
    EXPECT_EQ(record.payload_length, 0u);
    EXPECT_EQ(description(event.get()), "vendor-defined");
}

TEST_F(VexaEventTest, WhatIsSetIsReadThroughEveryReference) {
    const Event event = digitizer();
    const Event same = event;  // NOLINT(performance-unnecessary-copy-initialization)
    vexa_event_set_timestamp(event.get(), UINT64_MAX);
    vexa_event_set_phase(event.get(), VEXA_EVENT_PHASE_MAY_BEGIN);
    vexa_event_set_integer(event.get(), VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER, INT64_MIN);
    EXPECT_EQ(vexa_event_get_timestamp(same.get()), UINT64_MAX);
    vexa_digitizer_record record{};
    ASSERT_TRUE(vexa_event_get_digitizer(same.get(), &record));
    EXPECT_EQ(record.timestamp, UINT64_MAX);
    EXPECT_EQ(vexa_event_get_phase(same.get()), VEXA_EVENT_PHASE_MAY_BEGIN);
    EXPECT_EQ(vexa_event_get_integer(same.get(), VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER),
              INT64_MIN);

    const Event vendor = vendorDefined();
    vexa_event_set_timestamp(vendor.get(), 9);
    vexa_vendor_record content{};
    ASSERT_TRUE(vexa_event_get_vendor_defined(vendor.get(), &content));
    EXPECT_EQ(content.timestamp, 9u);
}

TEST_F(VexaEventTest, AFieldThatTheTypeLacksIsIgnored) {
    const Event event = digitizer();
    vexa_event_set_integer(event.get(), 0x000B0001u, 5);
    EXPECT_EQ(vexa_event_get_integer(event.get(), 0x000B0001u), 0);
    EXPECT_EQ(vexa_event_get_integer(event.get(), VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER), 0);
    const Event vendor = vendorDefined();
    vexa_event_set_integer(vendor.get(), VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER, 5);
    EXPECT_EQ(vexa_event_get_integer(vendor.get(), VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER), 0);
}

TEST_F(VexaEventTest, EventsAreDescribedWithEveryFieldThatSaysSomething) {
    const Event event = digitizer();
    vexa_event_set_phase(event.get(), VEXA_EVENT_PHASE_BEGAN);
    vexa_event_set_integer(event.get(), VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER, 12);
    EXPECT_EQ(description(event.get()),
              "digitizer timestamp=7 phase=began frameNumber=12 transducerType=2 index=3 "
              "identity=4 eventMask=0x20000 buttonMask=0x5 x=0.5 y=1.0 z=2.0 tipPressure=3.0 "
              "barrelPressure=4.0 inRange touching options=0x6");
    EXPECT_EQ(description(vendorDefined().get()),
              "vendor-defined timestamp=8 usagePage=0xff60 usage=0x2 version=3 payload=<01ab> "
              "options=0x4");
}

TEST_F(VexaEventTest, EachIsCountedWhileItLives) {
    vexa_event* const event = vexa_event_create_digitizer(&kDigitizer);
    EXPECT_EQ(live(), 1);
    EXPECT_EQ(vexa_event_retain(event), event);
    EXPECT_EQ(live(), 1);
    vexa_event_release(event);
    EXPECT_EQ(live(), 1);
    const Event other = vendorDefined();
    EXPECT_EQ(live(), 2);
    vexa_event_release(event);
    EXPECT_EQ(live(), 1);
}

TEST_F(VexaEventTest, NullIsNoEvent) {
    EXPECT_EQ(vexa_event_create_digitizer(nullptr), nullptr);
    EXPECT_EQ(vexa_event_create_vendor_defined(nullptr), nullptr);
    vexa_vendor_record lacking = kVendor;
    lacking.payload = nullptr;
    EXPECT_EQ(vexa_event_create_vendor_defined(&lacking), nullptr);

    EXPECT_EQ(vexa_event_retain(nullptr), nullptr);
    vexa_event_release(nullptr);
    EXPECT_EQ(vexa_event_get_type(nullptr), 0u);
    EXPECT_EQ(vexa_event_get_timestamp(nullptr), 0u);
    EXPECT_EQ(vexa_event_get_phase(nullptr), VEXA_EVENT_PHASE_NONE);
    EXPECT_EQ(vexa_event_get_integer(nullptr, VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER), 0);
    vexa_digitizer_record touch{};
    EXPECT_FALSE(vexa_event_get_digitizer(nullptr, &touch));
    vexa_vendor_record vendor{};
    EXPECT_FALSE(vexa_event_get_vendor_defined(nullptr, &vendor));
    EXPECT_EQ(description(nullptr), "no event");
    vexa_event_set_timestamp(nullptr, 1);
    vexa_event_set_phase(nullptr, 1);
    vexa_event_set_integer(nullptr, VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER, 1);
}

TEST_F(VexaEventTest, AFinishedEventIsReadAndReleasedOnManyThreads) {
    constexpr std::size_t kThreads = 4;
    for (int round = 0; round < 100; ++round) {
        Event event = digitizer();
        vexa_event_set_phase(event.get(), VEXA_EVENT_PHASE_ENDED);
        std::array<bool, kThreads> isGood{};
        std::atomic<std::size_t> ready{0};
        std::vector<std::thread> threads;
        threads.reserve(kThreads);
        for (bool& good : isGood) {
            threads.emplace_back([&good, &ready, mine = event]() mutable {
                ++ready;
                while (ready < kThreads) std::this_thread::yield();
                const Event copy = mine;
                mine.reset();
                good = vexa_event_get_phase(copy.get()) == VEXA_EVENT_PHASE_ENDED &&
                       vexa_event_get_timestamp(copy.get()) == 7;
            });
        }
        event.reset();
        for (std::thread& thread : threads) thread.join();
        ASSERT_THAT(isGood, testing::Each(true));
        ASSERT_EQ(live(), 0);
    }
}

}  // namespace
}  // namespace Vexa
