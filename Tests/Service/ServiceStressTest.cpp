// Everything at once, for the thread sanitizer to look at.

#include "Platform/Log.h"
#include "Tests/Support/LeakCheck.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <memory>
#include <thread>
#include <vector>

namespace VexaTouch::Testing {
namespace {

/// Runs a function over and over on a thread of its own.
class Repeating {
public:
    template <typename Function>
    explicit Repeating(Function function)
        : thread_([this, function] {
              for (std::uint32_t round = 0; !stop_; ++round) function(round);
          }) {}
    ~Repeating() {
        stop_ = true;
        thread_.join();
    }
    Repeating(const Repeating&) = delete;
    Repeating(Repeating&&) = delete;
    Repeating& operator=(const Repeating&) = delete;
    Repeating& operator=(Repeating&&) = delete;

private:
    std::atomic<bool> stop_{false};
    std::thread thread_;
};

/// What is expected to go wrong, a thousand times, is not shown.
class QuietLog {
public:
    QuietLog() { Vexa::Log::setLevel(Vexa::LogCategory::HIDService, Vexa::LogLevel::Off); }
    ~QuietLog() { Vexa::Log::setLevel(Vexa::LogCategory::HIDService, before_); }
    QuietLog(const QuietLog&) = delete;
    QuietLog(QuietLog&&) = delete;
    QuietLog& operator=(const QuietLog&) = delete;
    QuietLog& operator=(QuietLog&&) = delete;

private:
    Vexa::LogLevel before_ = Vexa::Log::level(Vexa::LogCategory::HIDService);
};

void stress() {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    const ServiceUnderTest& service = stand.service;
    stand.device->setFeatureReport(4, {4, 1, 2});
    stand.startUp();
    {
        // Touches and pauses, so that gestures are found, and now and then a firmware reset.
        const Repeating reports([&stand](std::uint32_t round) {
            const Touch touch = round % 40 < 20 ? Testing::touch("A").at(350) : nothing();
            static_cast<void>(stand.device->trySendReport(
                round % 97 == 0 ? firmwareReport(0) : imageReport(touch, round, round * 10)));
        });
        const Repeating writes([&service](std::uint32_t round) {
            EXPECT_TRUE(service.set("Pipeline.Algs.ActivationThreshold", 150 + round % 100));
            service.set("Colour", round);
        });
        const Repeating reads([&service](std::uint32_t) {
            EXPECT_TRUE(service.get("Pipeline.Algs.ActivationThreshold"));
            EXPECT_TRUE(service.get("DisjointImageCount"));
            EXPECT_TRUE(service.get("Pipeline.Algs.EventStats"));
            static_cast<void>(service.get("FirmwareVersion"));
            static_cast<void>(service.get("Colour"));
        });
        const Repeating recordings([&service](std::uint32_t round) {
            EXPECT_TRUE(service.get(round % 2 == 0 ? "Recording" : "ServicePluginDebug"));
        });
        for (int i = 0; i < 50; ++i) {
            service.unschedule(stand.queue);
            service.setEventCallback(&EventCollector::callback, &stand.events, nullptr);
            service.schedule(stand.queue);
            if (i % 10 == 5) {
                service.close();
                EXPECT_TRUE(service.open());
            }
        }
        const bool delivered = stand.events.waitFor(1);
        EXPECT_TRUE(delivered);
        stand.device->unplug();
    }
    stand.tearDown();
}

TEST(ServiceStressTest, ReportsPropertiesReschedulingAndUnplugMeet) {
    const QuietLog quiet;
    const LeakCheck leaks;
    for (int i = 0; i < 3; ++i) stress();
    leaks.expectNothingLeft();
}

// Which of the hosts' threads, the input thread and the events on their way has the last reference
// is open each time.
TEST(ServiceStressTest, ReferencesGoFromSeveralThreads) {
    const QuietLog quiet;
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    EventCollector events;
    const Vexa::SerialQueue queue("events");
    const LeakCheck leaks;
    constexpr int kThreads = 3;
    for (int i = 0; i < 200; ++i) {
        const auto device = std::make_shared<Vexa::ScriptedDevice>();
        const Vexa::DeviceRegistration registration(device);
        auto* const made = static_cast<vexa_plugin_interface**>(plugin.make());
        const auto useAndLetGo = [made] {
            void* other = nullptr;
            EXPECT_EQ((*made)->QueryInterface(made, VEXA_SERVICE_INTERFACE, &other), 0U);
            (*made)->AddRef(made);
            (*made)->Release(made);
            auto* const service = static_cast<vexa_service_interface**>(other);
            (*service)->Release(service);
            (*made)->Release(made);
        };
        std::vector<std::thread> threads;
        {
            const ServiceUnderTest service(made);
            ASSERT_EQ(service.start(registration.service()), 0U);
            service.setEventCallback(&EventCollector::callback, &events, nullptr);
            service.schedule(queue);
            ASSERT_TRUE(service.open());
            for (int thread = 0; thread < kThreads; ++thread) {
                (*made)->AddRef(made);
                threads.emplace_back(useAndLetGo);
            }
            ASSERT_TRUE(device->sendReport(firmwareReport(0)));
            service.unschedule(queue);
        }
        for (std::thread& thread : threads) thread.join();
    }
    queue.drain();
    EXPECT_LE(events.take().size(), 200U);
    leaks.expectNothingLeft();
}

TEST(ServiceStressTest, TheLastReferenceMayGoWhileEventsLand) {
    const QuietLog quiet;
    const LeakCheck leaks;
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    for (int i = 0; i < 200; ++i) {
        const auto device = std::make_shared<Vexa::ScriptedDevice>();
        const Vexa::DeviceRegistration registration(device);
        EventCollector events;
        const Vexa::SerialQueue queue("events");
        {
            const ServiceUnderTest service(plugin.make());
            ASSERT_EQ(service.start(registration.service()), 0U);
            service.setEventCallback(&EventCollector::callback, &events, nullptr);
            service.schedule(queue);
            ASSERT_TRUE(service.open());
            ASSERT_TRUE(device->sendReport(firmwareReport(0)));
            ASSERT_TRUE(device->waitUntilHandled(1));
            service.unschedule(queue);
        }
        queue.drain();
        EXPECT_EQ(events.take().size(), 1U);
    }
    leaks.expectNothingLeft();
}

}  // namespace
}  // namespace VexaTouch::Testing
