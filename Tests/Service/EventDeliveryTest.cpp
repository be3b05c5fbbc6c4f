// The road of events, from the pipeline to the host's callback.

#include "Service/EventDelivery.h"

#include "Platform/HostClock.h"
#include "Tests/Support/EventMatchers.h"
#include "Tests/Support/LiveObjects.h"
#include "Tests/Support/LogCapture.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"
#include "Tests/Support/TraceCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <vexa/event.h>
#include <vexa/queue.h>
#include <vexa/trace.h>
#include <atomic>
#include <cstdint>
#include <mutex>
#include <ostream>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

std::vector<std::vector<std::uint8_t>> tap(std::uint32_t firstFrame) {
    FrameSequence sequence;
    sequence.nextFrame = firstFrame;
    sequence.nowMs = 10'000 + 10 * firstFrame;
    std::vector<std::vector<std::uint8_t>> reports;
    for (const Touch& touch : {nothing().forMs(50), touch("H").at(350).with("I", 150).forMs(120),
                               nothing().forMs(200)}) {
        for (auto& report : sequence.reports(touch)) reports.push_back(std::move(report));
    }
    return reports;
}

class EventDeliveryTest : public testing::Test {
protected:
    void TearDown() override { stand.tearDown(); }

    ServiceStand stand{VEXATOUCH_PLUGIN_FILE};
};

TEST_F(EventDeliveryTest, ATapIsDeliveredInOrder) {
    int refcon = 0;
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    stand.service.setEventCallback(&EventCollector::callback, &stand.events, &refcon);
    stand.service.schedule(stand.queue);
    ASSERT_TRUE(stand.service.open());
    const std::uint64_t before = Vexa::HostClock::system().now();
    ASSERT_TRUE(stand.feed(tap(1)));
    const std::uint64_t after = Vexa::HostClock::system().now();

    const std::vector<Vexa::HidEvent> events = stand.events.take();
    EXPECT_THAT(events, ElementsAre(MayBegin(3), Tap(3)));
    for (const Vexa::HidEvent& event : events) {
        EXPECT_GE(event.timestamp(), before);
        EXPECT_LE(event.timestamp(), after);
    }
    for (const EventCollector::Delivery& delivery : stand.events.takeDeliveries()) {
        EXPECT_EQ(delivery.refcon, &refcon);
        EXPECT_EQ(delivery.sender, stand.service.service());
        EXPECT_EQ(delivery.options, 0U);
    }
}

TEST_F(EventDeliveryTest, DeliveryRunsOnTheHostsQueue) {
    struct Seen {
        vexa_queue* queue = nullptr;
        std::atomic<int> onQueue{0};
        std::atomic<int> elsewhere{0};
    } seen;
    seen.queue = stand.queue.get();
    stand.startUp();
    stand.service.unschedule(stand.queue);
    stand.service.setEventCallback(
        [](void* target, void*, void*, vexa_event*, std::uint32_t) noexcept {
            auto& self = *static_cast<Seen*>(target);
            ++(vexa_queue_is_current(self.queue) ? self.onQueue : self.elsewhere);
        },
        &seen, nullptr);
    stand.service.schedule(stand.queue);
    ASSERT_TRUE(stand.feed(tap(1)));
    EXPECT_EQ(seen.onQueue, 2);
    EXPECT_EQ(seen.elsewhere, 0);
}

TEST_F(EventDeliveryTest, AFirmwareResetIsDeliveredAsAVendorsEvent) {
    stand.startUp();
    ASSERT_TRUE(stand.feed({firmwareReport(0)}));
    EXPECT_THAT(stand.events.take(), ElementsAre(FirmwareReset()));
}

TEST_F(EventDeliveryTest, ABatchIsDeliveredWhole) {
    stand.startUp();
    ASSERT_TRUE(
        stand.feed({imageReport(touch("H").at(350).with("I", 150), 1, 10),
                    imageReport(touch("H").at(350).with("I", 150), 2, 20), firmwareReport(0)}));
    const std::vector<Vexa::HidEvent> events = stand.events.take();
    ASSERT_THAT(events, ElementsAre(MayBegin(3), Cancel(), FirmwareReset()));
    EXPECT_EQ(events[1].timestamp(), events[2].timestamp());
}

TEST_F(EventDeliveryTest, EachStageIsLoggedAndTraced) {
    stand.startUp();
    LogCapture log;
    TraceCapture trace;
    ASSERT_TRUE(stand.feed({imageReport(touch("H").at(350).with("I", 150), 1, 10)}));
    ASSERT_TRUE(stand.feed({firmwareReport(0)}));
    std::vector<LogLine> lines = log.take();
    std::erase_if(lines, [](const LogLine& line) { return line.text.starts_with("Received"); });
    const std::vector<Vexa::HidEvent> events = stand.events.take();
    ASSERT_EQ(events.size(), 3U);
    EXPECT_THAT(
        lines,
        ElementsAre(debug("Input report probe"), debug("HID events probe: 1 event(s)"),
                    debug("Dispatch 1 event(s) takeoff"), debug("Dispatch 1 event(s) land"),
                    info("Dispatch event: " + events[0].description()), debug("Input report probe"),
                    info("Firmware event probe; event: 0, context: 0"),
                    debug("HID events probe: 2 event(s)"), debug("Dispatch 2 event(s) takeoff"),
                    debug("Dispatch 2 event(s) land"),
                    info("Dispatch event: " + events[1].description()),
                    info("Dispatch event: " + events[2].description())));
    EXPECT_THAT(trace.take(),
                ElementsAre(TracePoint{0x2B150180, {1, 1, 0, 0}}, TracePoint{0x2B150184, {1}},
                            TracePoint{0x2B150188, {11, 128}}, TracePoint{0x2B150180, {2, 0, 0, 0}},
                            TracePoint{0x2B15018C, {0, 0}}, TracePoint{0x2B150184, {2}},
                            TracePoint{0x2B150188, {11, 8}}, TracePoint{0x2B150188, {1, 0}}));
}

/// What happens in a delivery, in one order: trace points, messages and callbacks.
class DeliveryJournal {
public:
    DeliveryJournal() {
        Vexa::Log::setSink(
            [this](Vexa::LogCategory, Vexa::LogLevel, std::string_view text) { logged(text); });
        Vexa::Log::setLevel(Vexa::LogCategory::HIDService, Vexa::LogLevel::Debug);
    }
    ~DeliveryJournal() {
        Vexa::Log::setLevel(Vexa::LogCategory::HIDService, before_);
        Vexa::Log::setSink({});
    }
    DeliveryJournal(const DeliveryJournal&) = delete;
    DeliveryJournal(DeliveryJournal&&) = delete;
    DeliveryJournal& operator=(const DeliveryJournal&) = delete;
    DeliveryJournal& operator=(DeliveryJournal&&) = delete;

    static void callback(void* target, void*, void*, vexa_event* event, std::uint32_t) noexcept {
        static_cast<DeliveryJournal*>(target)->note("callback " +
                                                    Vexa::HidEvent::share(event).description());
    }
    [[nodiscard]] std::vector<std::string> take() {
        const std::lock_guard lock(mutex_);
        return std::exchange(lines_, {});
    }

private:
    void logged(std::string_view text) {
        if (text.starts_with("Dispatch ") && !text.ends_with("takeoff")) {
            note("log " + std::string(text));
        }
    }
    void traced(std::uint32_t code, Vexa::TraceListener::Arguments arguments) {
        if (code == VEXA_TRACE_BATCH) {
            note("trace batch of " + std::to_string(arguments[0]));
        } else if (code == VEXA_TRACE_EVENT) {
            note("trace event of type " + std::to_string(arguments[0]));
        }
    }
    void note(std::string line) {
        const std::lock_guard lock(mutex_);
        lines_.push_back(std::move(line));
    }

    Vexa::LogLevel before_ = Vexa::Log::level(Vexa::LogCategory::HIDService);
    std::mutex mutex_;
    std::vector<std::string> lines_;
    Vexa::TraceListener listener_{
        [this](std::uint32_t code, Vexa::TraceListener::Arguments arguments) {
            traced(code, arguments);
        }};
};

TEST_F(EventDeliveryTest, EachEventIsTracedThenLoggedThenHandedOver) {
    DeliveryJournal journal;
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    stand.service.setEventCallback(&DeliveryJournal::callback, &journal, nullptr);
    stand.service.schedule(stand.queue);
    ASSERT_TRUE(stand.service.open());
    // The reset during a touch makes a batch of two.
    ASSERT_TRUE(
        stand.feed({imageReport(touch("H").at(350).with("I", 150), 1, 10), firmwareReport(0)}));
    stand.service.unschedule(stand.queue);
    const std::vector<std::string> lines = journal.take();
    const auto described = [&lines](std::size_t callback) {
        std::vector<std::string> callbacks;
        for (const std::string& line : lines) {
            if (line.starts_with("callback ")) callbacks.push_back(line.substr(9));
        }
        return callback < callbacks.size() ? callbacks[callback] : "no callback";
    };
    EXPECT_THAT(
        lines,
        ElementsAre("trace batch of 1", "log Dispatch 1 event(s) land", "trace event of type 11",
                    "log Dispatch event: " + described(0), "callback " + described(0),
                    "trace batch of 2", "log Dispatch 2 event(s) land", "trace event of type 11",
                    "log Dispatch event: " + described(1), "callback " + described(1),
                    "trace event of type 1", "log Dispatch event: " + described(2),
                    "callback " + described(2)));
}

/// What a callback got, and on which of two queues.
class TwoQueues {
public:
    struct Seen {
        std::uint32_t type = 0;
        EventCollector::Delivery delivery;
        std::string queue;

        friend bool operator==(const Seen&, const Seen&) = default;
        friend std::ostream& operator<<(std::ostream& out, const Seen& seen) {
            return out << "type " << seen.type << ", refcon " << seen.delivery.refcon << ", sender "
                       << seen.delivery.sender << ", options " << seen.delivery.options << ", on "
                       << seen.queue;
        }
    };

    TwoQueues(const Vexa::SerialQueue& first, const Vexa::SerialQueue& second)
        : first_(first), second_(second) {}

    static void callback(void* target, void* refcon, void* sender, vexa_event* event,
                         std::uint32_t options) noexcept {
        auto& self = *static_cast<TwoQueues*>(target);
        const char* queue = vexa_queue_is_current(self.first_.get())    ? "first"
                            : vexa_queue_is_current(self.second_.get()) ? "second"
                                                                        : "none";
        const std::lock_guard lock(self.mutex_);
        self.seen_.push_back({vexa_event_get_type(event), {refcon, sender, options}, queue});
    }
    [[nodiscard]] std::vector<Seen> take() {
        const std::lock_guard lock(mutex_);
        return std::exchange(seen_, {});
    }

private:
    Vexa::SerialQueue first_;
    Vexa::SerialQueue second_;
    std::mutex mutex_;
    std::vector<Seen> seen_;
};

TEST_F(EventDeliveryTest, ALateCallbackIsForTheNextRun) {
    int earlyRefcon = 0;
    int lateRefcon = 0;
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    stand.service.setEventCallback(&EventCollector::callback, &stand.events, &earlyRefcon);
    stand.service.schedule(stand.queue);
    ASSERT_TRUE(stand.service.open());
    EventCollector late;
    stand.service.setEventCallback(&EventCollector::callback, &late, &lateRefcon);
    ASSERT_TRUE(stand.feed(tap(1)));
    const EventCollector::Delivery early{&earlyRefcon, stand.service.service(), 0};
    EXPECT_THAT(stand.events.take(), ElementsAre(MayBegin(3), Tap(3)));
    EXPECT_THAT(stand.events.takeDeliveries(), ElementsAre(early, early));
    EXPECT_THAT(late.take(), IsEmpty());

    stand.service.unschedule(stand.queue);
    stand.service.schedule(stand.queue);
    ASSERT_TRUE(stand.feed(tap(100)));
    const EventCollector::Delivery next{&lateRefcon, stand.service.service(), 0};
    EXPECT_THAT(stand.events.take(), IsEmpty());
    EXPECT_THAT(late.take(), ElementsAre(MayBegin(3), Tap(3)));
    EXPECT_THAT(late.takeDeliveries(), ElementsAre(next, next));
    stand.service.unschedule(stand.queue);
}

TEST_F(EventDeliveryTest, AHeldBatchStaysWithTheQueueAndCallbackOfItsRun) {
    const Vexa::SerialQueue second("second");
    TwoQueues early(stand.queue, second);
    TwoQueues late(stand.queue, second);
    int earlyRefcon = 0;
    int lateRefcon = 0;
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    stand.service.setEventCallback(&TwoQueues::callback, &early, &earlyRefcon);
    stand.service.schedule(stand.queue);
    ASSERT_TRUE(stand.service.open());
    std::atomic<bool> goOn{false};
    stand.queue.submit([&goOn]() noexcept { goOn.wait(false); });
    ASSERT_TRUE(stand.device->sendReport(firmwareReport(0)));
    ASSERT_TRUE(stand.device->waitUntilHandled(1));

    stand.service.unschedule(stand.queue);
    stand.service.setEventCallback(&TwoQueues::callback, &late, &lateRefcon);
    stand.service.schedule(second);
    ASSERT_TRUE(stand.device->sendReport(firmwareReport(0)));
    ASSERT_TRUE(stand.device->waitUntilHandled(2));
    second.drain();
    EXPECT_THAT(early.take(), IsEmpty());
    EXPECT_THAT(late.take(), ElementsAre(TwoQueues::Seen{VEXA_EVENT_TYPE_VENDOR_DEFINED,
                                                         {&lateRefcon, stand.service.service(), 0},
                                                         "second"}));
    goOn = true;
    goOn.notify_all();
    stand.queue.drain();
    EXPECT_THAT(
        early.take(),
        ElementsAre(TwoQueues::Seen{
            VEXA_EVENT_TYPE_VENDOR_DEFINED, {&earlyRefcon, stand.service.service(), 0}, "first"}));
    EXPECT_THAT(late.take(), IsEmpty());
    stand.service.unschedule(second);
}

TEST_F(EventDeliveryTest, EachServiceNamesItselfAsTheSender) {
    int refcon = 0;
    int otherRefcon = 0;
    ServiceStand other(VEXATOUCH_PLUGIN_FILE);
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    ASSERT_EQ(other.service.start(other.registration.service()), 0U);
    stand.service.setEventCallback(&EventCollector::callback, &stand.events, &refcon);
    other.service.setEventCallback(&EventCollector::callback, &stand.events, &otherRefcon);
    stand.service.schedule(stand.queue);
    other.service.schedule(stand.queue);
    ASSERT_TRUE(stand.service.open());
    ASSERT_TRUE(other.service.open());
    ASSERT_TRUE(other.feed({firmwareReport(0)}));
    ASSERT_TRUE(stand.feed({firmwareReport(0)}));
    EXPECT_NE(stand.service.service(), other.service.service());
    EXPECT_THAT(stand.events.takeDeliveries(),
                ElementsAre(EventCollector::Delivery{&otherRefcon, other.service.service(), 0},
                            EventCollector::Delivery{&refcon, stand.service.service(), 0}));
    EXPECT_THAT(stand.events.take(), ElementsAre(FirmwareReset(), FirmwareReset()));
    other.tearDown();
}

TEST_F(EventDeliveryTest, WithoutACallbackEventsAreTracedAndSkipped) {
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    stand.service.schedule(stand.queue);
    ASSERT_TRUE(stand.service.open());
    TraceCapture trace;
    ASSERT_TRUE(stand.feed({firmwareReport(0)}));
    EXPECT_THAT(trace.take(),
                ElementsAre(TracePoint{0x2B150180, {2}}, TracePoint{0x2B15018C, {}},
                            TracePoint{0x2B150184, {1}}, TracePoint{0x2B150188, {1, 0}}));
}

TEST_F(EventDeliveryTest, WithoutAQueueEventsAreDroppedAndReportsProcessed) {
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    stand.service.setEventCallback(&EventCollector::callback, &stand.events, nullptr);
    stand.service.schedule({});
    ASSERT_TRUE(stand.service.open());
    LogCapture log;
    ASSERT_TRUE(stand.feed({firmwareReport(0)}));
    std::vector<LogLine> lines = log.take();
    std::erase_if(lines, [](const LogLine& line) { return line.text.starts_with("Received"); });
    EXPECT_THAT(lines, ElementsAre(debug("Input report probe"),
                                   info("Firmware event probe; event: 0, context: 0"),
                                   debug("HID events probe: 1 event(s)"),
                                   debug("Dispatch 1 event(s) dropped, no queue")));
    EXPECT_THAT(stand.events.take(), IsEmpty());
    stand.service.unschedule({});
}

TEST_F(EventDeliveryTest, EventsOnTheQueueComeAfterUnscheduling) {
    stand.startUp();
    std::atomic<bool> goOn{false};
    stand.queue.submit([&goOn]() noexcept { goOn.wait(false); });
    ASSERT_TRUE(stand.device->sendReport(firmwareReport(0)));
    ASSERT_TRUE(stand.device->waitUntilHandled(1));
    stand.service.unschedule(stand.queue);
    EXPECT_THAT(stand.events.take(), IsEmpty());
    goOn = true;
    goOn.notify_all();
    stand.queue.drain();
    EXPECT_THAT(stand.events.take(), ElementsAre(FirmwareReset()));
}

TEST(EventDeliveryAloneTest, AnEmptyBatchNeverReachesTheQueue) {
    EventCollector events;
    const Vexa::SerialQueue queue("events");
    DispatchEventContext context;
    context.queue = queue;
    context.callback = &EventCollector::callback;
    context.target = &events;
    const EventDelivery delivery(makeService<VexaHIDService>(), context,
                                 Vexa::Log(Vexa::LogCategory::HIDService));
    LogCapture log;
    TraceCapture trace;
    delivery({});
    queue.drain();
    EXPECT_THAT(log.take(), ElementsAre(debug("HID events probe: 0 event(s)")));
    EXPECT_THAT(trace.take(), IsEmpty());
}

TEST(EventDeliveryAloneTest, ABatchOnItsWayKeepsTheServiceAndTheQueue) {
    EventCollector events;
    const LiveObjects before = LiveObjects::now();
    auto service = makeService<VexaHIDService>();
    VexaHIDService& shell = *service.get();
    shell.retain();
    std::atomic<bool> goOn{false};
    {
        DispatchEventContext context;
        context.queue = Vexa::SerialQueue("events");
        context.callback = &EventCollector::callback;
        context.target = &events;
        context.queue.submit([&goOn]() noexcept { goOn.wait(false); });
        const EventDelivery delivery(std::move(service), context,
                                     Vexa::Log(Vexa::LogCategory::HIDService));
        delivery({Vexa::HidEvent::digitizer({})});
        EXPECT_EQ(shell.retainCount(), 3U);
        goOn = true;
        goOn.notify_all();
        ASSERT_TRUE(events.waitFor(1));
        context.queue.drain();
        EXPECT_EQ(shell.retainCount(), 2U);
    }
    EXPECT_EQ(shell.retainCount(), 1U);
    shell.release();
    static_cast<void>(events.take());
    EXPECT_EQ(LiveObjects::now(), before);
}

}  // namespace
}  // namespace VexaTouch::Testing
