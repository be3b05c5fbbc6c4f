#include "Service/VexaHIDService.h"

#include "Tests/Support/LiveObjects.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/ServiceUnderTest.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <thread>
#include <vector>

namespace VexaTouch {
namespace {

using Testing::LiveObjects;
using Testing::ServiceUnderTest;
using Vexa::PropertyValue;

/// Tells when it goes, and remembers what its operations got.
class RecordingService final : public VexaHIDService {
public:
    std::vector<std::string> calls;
    std::vector<std::string>* farewells = nullptr;

    vexa_status probeWithService(std::uint32_t service, const PropertyValue& properties,
                                 std::int32_t* outScore) override {
        calls.push_back("probe " + std::to_string(service) + " " + properties.description());
        *outScore += 5;
        return 0x11;
    }
    vexa_status startWithService(std::uint32_t service, const PropertyValue& properties) override {
        calls.push_back("start " + std::to_string(service) + " " + properties.description());
        return 0x12;
    }
    vexa_status stop() override {
        calls.emplace_back("stop");
        return 0x13;
    }
    bool openWithOptions(std::uint32_t options) override {
        calls.push_back("open " + std::to_string(options));
        return true;
    }
    void closeWithOptions(std::uint32_t options) override {
        calls.push_back("close " + std::to_string(options));
    }
    PropertyValue getPropertyForKey(const PropertyValue& key) override {
        calls.push_back("get " + key.description());
        return "the answer";
    }
    bool setPropertyForKey(const PropertyValue& value, const PropertyValue& key) override {
        calls.push_back("set " + value.description() + " for " + key.description());
        return true;
    }
    void setEventCallback(vexa_event_callback callback, void* target, void* refcon) override {
        calls.emplace_back("callback");
        seenCallback = callback;
        seenTarget = target;
        seenRefcon = refcon;
    }
    void scheduleWithDispatchQueue(const Vexa::SerialQueue& queue) override {
        calls.emplace_back("schedule");
        seenQueue = queue.get();
        if (onQueue) onQueue(queue);
    }
    void unscheduleWithDispatchQueue(const Vexa::SerialQueue& queue) override {
        calls.emplace_back("unschedule");
        seenQueue = queue.get();
        if (onQueue) onQueue(queue);
    }
    std::optional<Vexa::HidEvent> copyEventWithType(std::uint32_t type,
                                                    const Vexa::HidEvent& matching,
                                                    std::uint32_t options) override {
        calls.push_back("event " + std::to_string(type) + " " + std::to_string(options));
        return matching;
    }
    vexa_status setOutputEvent(const Vexa::HidEvent& event) override {
        calls.emplace_back("output");
        seenEvent = event.handle();
        return 0x14;
    }

    vexa_event_callback seenCallback = nullptr;
    void* seenTarget = nullptr;
    void* seenRefcon = nullptr;
    vexa_queue* seenQueue = nullptr;
    std::function<void(const Vexa::SerialQueue& queue)> onQueue;
    vexa_event* seenEvent = nullptr;

protected:
    void dealloc() noexcept override {
        if (farewells) farewells->emplace_back("dealloc");
        VexaHIDService::dealloc();
        if (farewells) {
            farewells->emplace_back(getPluginInterface() && *getPluginInterface() == nullptr &&
                                            *getServiceInterface() == nullptr
                                        ? "no tables"
                                        : "tables");
        }
    }
    ~RecordingService() override {
        if (farewells) farewells->emplace_back("gone");
    }
};

/// A reference for a host to a new service.
template <typename Service>
void* referenceFor(const ServiceReference<Service>& service) {
    service.get()->retain();
    return service.get()->getPluginInterface();
}

TEST(VexaHIDServiceTest, TheBareServiceRefusesEverything) {
    const auto made = makeService<VexaHIDService>();
    ASSERT_TRUE(made);
    const ServiceUnderTest bare(referenceFor(made));

    std::int32_t score = 77;
    EXPECT_EQ(bare.probe(1, &score), 0xE00002C7U);
    EXPECT_EQ(score, 77);
    EXPECT_EQ(bare.start(1), 0xE00002C7U);
    EXPECT_EQ(bare.stop(), 0xE00002C7U);
    EXPECT_FALSE(bare.open(0));
    bare.close(0);
    EXPECT_EQ(bare.get("Version"), PropertyValue());
    EXPECT_EQ(bare.get("anything"), PropertyValue());
    EXPECT_FALSE(bare.set("anything", 1));
    bare.setEventCallback(nullptr, nullptr, nullptr);
    bare.schedule({});
    bare.unschedule({});
    EXPECT_EQ((*bare.service())->copyEvent(bare.service(), 11, nullptr, 0), nullptr);
    EXPECT_EQ((*bare.service())->setOutputEvent(bare.service(), nullptr), 0xE00002C7U);
}

TEST(VexaHIDServiceTest, TablesSayWhatTheyAre) {
    const auto made = makeService<VexaHIDService>();
    vexa_plugin_interface** plugin = made.get()->getPluginInterface();
    vexa_service_interface** service = made.get()->getServiceInterface();
    EXPECT_EQ((*plugin)->_reserved, made.get());
    EXPECT_EQ((*service)->_reserved, made.get());
    EXPECT_EQ((*plugin)->version, 1);
    EXPECT_EQ((*plugin)->revision, 0);
    EXPECT_NE(static_cast<void*>(*plugin), static_cast<void*>(*service));
}

TEST(VexaHIDServiceTest, SlotsStandWhereTheTablesSay) {
    constexpr std::size_t kSlot = sizeof(void*);
    using Plugin = vexa_plugin_interface;
    EXPECT_EQ(offsetof(Plugin, _reserved), 0U);
    EXPECT_EQ(offsetof(Plugin, QueryInterface), 1 * kSlot);
    EXPECT_EQ(offsetof(Plugin, AddRef), 2 * kSlot);
    EXPECT_EQ(offsetof(Plugin, Release), 3 * kSlot);
    EXPECT_EQ(offsetof(Plugin, version), 4 * kSlot);
    EXPECT_EQ(offsetof(Plugin, revision), 4 * kSlot + 2);
    EXPECT_EQ(offsetof(Plugin, Probe), 5 * kSlot);
    EXPECT_EQ(offsetof(Plugin, Start), 6 * kSlot);
    EXPECT_EQ(offsetof(Plugin, Stop), 7 * kSlot);
    EXPECT_EQ(sizeof(Plugin), 8 * kSlot);
    using Service = vexa_service_interface;
    EXPECT_EQ(offsetof(Service, _reserved), 0U);
    EXPECT_EQ(offsetof(Service, QueryInterface), 1 * kSlot);
    EXPECT_EQ(offsetof(Service, AddRef), 2 * kSlot);
    EXPECT_EQ(offsetof(Service, Release), 3 * kSlot);
    EXPECT_EQ(offsetof(Service, open), 4 * kSlot);
    EXPECT_EQ(offsetof(Service, close), 5 * kSlot);
    EXPECT_EQ(offsetof(Service, copyProperty), 6 * kSlot);
    EXPECT_EQ(offsetof(Service, setProperty), 7 * kSlot);
    EXPECT_EQ(offsetof(Service, setEventCallback), 8 * kSlot);
    EXPECT_EQ(offsetof(Service, scheduleWithDispatchQueue), 9 * kSlot);
    EXPECT_EQ(offsetof(Service, unscheduleFromDispatchQueue), 10 * kSlot);
    EXPECT_EQ(offsetof(Service, copyEvent), 11 * kSlot);
    EXPECT_EQ(offsetof(Service, setOutputEvent), 12 * kSlot);
    EXPECT_EQ(sizeof(Service), 13 * kSlot);
}

TEST(VexaHIDServiceTest, TrampolinesForwardAndReorder) {
    const auto made = makeService<RecordingService>();
    RecordingService& service = *made.get();
    const ServiceUnderTest host(referenceFor(made));

    std::int32_t score = 1;
    EXPECT_EQ(host.probe(42, &score, "properties"), 0x11U);
    EXPECT_EQ(score, 6);
    EXPECT_EQ(host.start(43, PropertyValue::Dictionary{{"a", 1}}), 0x12U);
    EXPECT_TRUE(host.open(7));
    EXPECT_EQ(host.get("a key"), PropertyValue("the answer"));
    EXPECT_TRUE(host.set("a key", "a value"));
    host.close(8);
    EXPECT_EQ(host.stop(), 0x13U);
    EXPECT_THAT(
        service.calls,
        testing::ElementsAre("probe 42 \"properties\"", R"(start 43 {"a": 1})", "open 7",
                             "get \"a key\"", R"(set "a value" for "a key")", "close 8", "stop"));
}

TEST(VexaHIDServiceTest, TrampolinesPassPointersOn) {
    const auto made = makeService<RecordingService>();
    RecordingService& service = *made.get();
    const ServiceUnderTest host(referenceFor(made));

    int target = 0;
    int refcon = 0;
    host.setEventCallback(&Testing::EventCollector::callback, &target, &refcon);
    EXPECT_EQ(service.seenCallback, &Testing::EventCollector::callback);
    EXPECT_EQ(service.seenTarget, &target);
    EXPECT_EQ(service.seenRefcon, &refcon);

    const Vexa::SerialQueue queue("queue");
    host.schedule(queue);
    EXPECT_EQ(service.seenQueue, queue.get());
    service.seenQueue = nullptr;
    host.unschedule(queue);
    EXPECT_EQ(service.seenQueue, queue.get());

    const Vexa::HidEvent event = Vexa::HidEvent::digitizer({});
    EXPECT_EQ((*host.service())->setOutputEvent(host.service(), event.handle()), 0x14U);
    EXPECT_EQ(service.seenEvent, event.handle());
    const Vexa::HidEvent copy =
        Vexa::HidEvent::adopt((*host.service())->copyEvent(host.service(), 11, event.handle(), 3));
    EXPECT_EQ(copy, event);
    EXPECT_THAT(service.calls,
                testing::ElementsAre("callback", "schedule", "unschedule", "output", "event 11 3"));
}

TEST(VexaHIDServiceTest, SchedulingSlotsHoldTheQueueForTheCall) {
    const auto made = makeService<RecordingService>();
    const ServiceUnderTest host(referenceFor(made));
    const std::int64_t before = vexa_live_objects(VEXA_OBJECT_QUEUE);
    Vexa::SerialQueue own;
    int ran = 0;
    made.get()->onQueue = [&](const Vexa::SerialQueue& queue) {
        own.reset();
        EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_QUEUE), before + 1);
        queue.submit([&ran]() noexcept { ++ran; });
        queue.drain();
    };
    own = Vexa::SerialQueue("the host's");
    host.schedule(own);
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_QUEUE), before);
    own = Vexa::SerialQueue("the host's");
    host.unschedule(own);
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_QUEUE), before);
    EXPECT_EQ(ran, 2);
}

TEST(VexaHIDServiceTest, WhatTheHostLendsIsNotKept) {
    const LiveObjects before = LiveObjects::now();
    {
        const auto made = makeService<RecordingService>();
        const ServiceUnderTest host(referenceFor(made));
        const PropertyValue value("a text that is longer than any buffer inside an object");
        const Vexa::HidEvent event = Vexa::HidEvent::digitizer({});
        const LiveObjects lent = LiveObjects::now();
        std::int32_t score = 0;
        static_cast<void>(host.probe(1, &score, value));
        static_cast<void>(host.start(1, value));
        static_cast<void>(host.get(value));
        host.set(value, value);
        vexa_event_release((*host.service())->copyEvent(host.service(), 1, event.handle(), 0));
        (*host.service())->setOutputEvent(host.service(), event.handle());
        EXPECT_EQ(LiveObjects::now(), lent);
    }
    EXPECT_EQ(LiveObjects::now(), before);
}

TEST(VexaHIDServiceTest, EitherInterfaceGivesBoth) {
    const auto made = makeService<VexaHIDService>();
    vexa_plugin_interface** plugin = made.get()->getPluginInterface();
    vexa_service_interface** service = made.get()->getServiceInterface();

    void* out = nullptr;
    EXPECT_EQ((*plugin)->QueryInterface(plugin, VEXA_SERVICE_INTERFACE, &out), 0U);
    EXPECT_EQ(out, service);
    EXPECT_EQ((*service)->QueryInterface(service, VEXA_PLUGIN_INTERFACE, &out), 0U);
    EXPECT_EQ(out, plugin);
    EXPECT_EQ((*plugin)->QueryInterface(plugin, VEXA_PLUGIN_INTERFACE, &out), 0U);
    EXPECT_EQ(out, plugin);
    EXPECT_EQ((*service)->QueryInterface(service, VEXA_SERVICE_INTERFACE, &out), 0U);
    EXPECT_EQ(out, service);
    EXPECT_EQ(made.get()->retainCount(), 5U);
    for (int i = 0; i < 4; ++i) (*plugin)->Release(plugin);
    EXPECT_EQ(made.get()->retainCount(), 1U);
}

TEST(VexaHIDServiceTest, AnUnknownInterfaceLeavesTheOutPointerAlone) {
    const auto made = makeService<VexaHIDService>();
    vexa_plugin_interface** plugin = made.get()->getPluginInterface();
    // The identifier of the scheme that interfaces of this kind have in common is not answered.
    const vexa_identifier base = {{0, 0, 0, 0, 0, 0, 0, 0, 0xC0, 0, 0, 0, 0, 0, 0, 0x46}};
    std::vector<vexa_identifier> unknown = {VEXA_HID_SERVICE_PLUGIN_TYPE, base, {}};
    for (const vexa_identifier& known : {VEXA_PLUGIN_INTERFACE, VEXA_SERVICE_INTERFACE}) {
        vexa_identifier other = known;
        for (std::uint8_t& byte : other.bytes) {
            byte ^= 1;
            unknown.push_back(other);
            byte ^= 1;
        }
    }
    for (const vexa_identifier& identifier : unknown) {
        int untouched = 0;
        void* out = &untouched;
        EXPECT_EQ((*plugin)->QueryInterface(plugin, identifier, &out), 0x80000004U);
        EXPECT_EQ(out, &untouched);
    }
    EXPECT_EQ(made.get()->retainCount(), 1U);
}

TEST(VexaHIDServiceTest, CountsAreThoseAfterTheCall) {
    const auto made = makeService<VexaHIDService>();
    vexa_plugin_interface** plugin = made.get()->getPluginInterface();
    vexa_service_interface** service = made.get()->getServiceInterface();
    EXPECT_EQ((*plugin)->AddRef(plugin), 2U);
    EXPECT_EQ((*service)->AddRef(service), 3U);
    EXPECT_EQ((*plugin)->Release(plugin), 2U);
    EXPECT_EQ((*service)->Release(service), 1U);
}

TEST(VexaHIDServiceTest, TheLastReleaseEndsTheService) {
    std::vector<std::string> farewells;
    vexa_plugin_interface** plugin = nullptr;
    {
        const auto made = makeService<RecordingService>();
        made.get()->farewells = &farewells;
        plugin = static_cast<vexa_plugin_interface**>(referenceFor(made));
    }
    EXPECT_THAT(farewells, testing::IsEmpty());
    EXPECT_EQ((*plugin)->Release(plugin), 0U);
    EXPECT_THAT(farewells, testing::ElementsAre("dealloc", "no tables", "gone"));
}

TEST(VexaHIDServiceTest, ReferencesMayBeCountedOnManyThreads) {
    std::vector<std::string> farewells;
    {
        auto made = makeService<RecordingService>();
        made.get()->farewells = &farewells;
        vexa_plugin_interface** plugin = made.get()->getPluginInterface();
        std::vector<std::thread> threads;
        for (int thread = 0; thread < 4; ++thread) {
            threads.emplace_back([plugin] {
                for (int i = 0; i < 10'000; ++i) {
                    (*plugin)->AddRef(plugin);
                    void* out = nullptr;
                    (*plugin)->QueryInterface(plugin, VEXA_SERVICE_INTERFACE, &out);
                    (*plugin)->Release(plugin);
                    (*plugin)->Release(plugin);
                }
            });
        }
        for (std::thread& thread : threads) thread.join();
        EXPECT_EQ(made.get()->retainCount(), 1U);
        EXPECT_THAT(farewells, testing::IsEmpty());
    }
    EXPECT_EQ(farewells.size(), 3U);
}

/// Cannot be made ready.
class HalfMadeService final : public VexaHIDService {
public:
    [[nodiscard]] bool init() noexcept override { return false; }
};

TEST(VexaHIDServiceTest, AServiceThatCannotBeMadeReadyIsNone) {
    EXPECT_FALSE(makeService<HalfMadeService>());
}

}  // namespace
}  // namespace VexaTouch
