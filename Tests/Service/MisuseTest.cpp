// What is defined although a host should not do it.

#include "Tests/Support/LogCapture.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"
#include "Tests/Support/TraceCapture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <unistd.h>
#include <cstdio>
#include <memory>
#include <string_view>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using Vexa::PropertyValue;
using Vexa::ScriptedDevice;

/// Death tests start a process of their own: forked threads would be missing.
class MisuseTest : public testing::Test {
protected:
    MisuseTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }
};

using MisuseDeathTest = MisuseTest;

void check(bool holds, const char* what) {
    if (holds) return;
    std::fprintf(stderr, "%s\n", what);
    ::_exit(1);
}

/// Schedules twice and lives on. The first thread cannot be stopped, so the process must end.
[[noreturn]] void scheduleTwice() {
    auto stand = std::make_unique<ServiceStand>(VEXATOUCH_PLUGIN_FILE);
    const auto device = stand->device;
    stand->startUp();
    check(stand->feed({firmwareReport(0)}), "the first thread handles no reports");
    check(stand->events.take().size() == 1, "the event is not delivered");

    LogCapture log;
    EventCollector second;
    const Vexa::SerialQueue secondQueue("second");
    stand->service.setEventCallback(&EventCollector::callback, &second, nullptr);
    stand->service.schedule(secondQueue);
    // Until the second thread has put its probes in place, events still go the first way.
    std::size_t elsewhere = 0;
    std::size_t here = 0;
    while (here == 0) {
        check(stand->feed({firmwareReport(0)}), "the first thread handles no reports");
        secondQueue.drain();
        here = second.take().size();
        elsewhere = stand->events.take().size();
        check(here + elsewhere == 1, "the event is not delivered once");
    }

    stand->service.unschedule(secondQueue);
    std::vector<LogLine> errors = log.take();
    std::erase_if(errors, [](const LogLine& line) { return line.level != Vexa::LogLevel::Error; });
    check(errors == std::vector{error("device not scheduled: a7510005")},
          "the second thread does not tell that it has no device");
    check(stand->feed({firmwareReport(0)}), "the first thread handles no reports");
    secondQueue.drain();
    check(stand->events.take().empty() && second.take().empty(), "an event without probes");
    check(stand->service.get("Version") == PropertyValue(PropertyValue::Array{13, 0, 0}),
          "no answer");
    // There is no thread to be stopped any more.
    stand->service.unschedule(secondQueue);
    check(stand->service.references() > 2, "the first thread lost its service");
    device->unplug();
    stand.reset();
    ::_exit(0);
}

TEST_F(MisuseDeathTest, SchedulingTwiceIsSurvived) {
    EXPECT_EXIT(scheduleTwice(), testing::ExitedWithCode(0), "");
}

TEST_F(MisuseTest, SchedulingWithoutADeviceWaitsForNothing) {
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    const ServiceUnderTest service(plugin.make());
    const Vexa::SerialQueue queue("events");
    LogCapture log;
    service.schedule(queue);
    service.unschedule(queue);
    for (const LogLine& line : log.take()) EXPECT_NE(line.level, Vexa::LogLevel::Error) << line;
    EXPECT_EQ(service.references(), 2U);
}

TEST_F(MisuseTest, UnschedulingTwiceOnlyLetsTheQueueGo) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    stand.startUp();
    stand.service.unschedule(stand.queue);
    stand.service.unschedule(stand.queue);
    stand.service.unschedule({});
    stand.service.schedule(stand.queue);
    EXPECT_TRUE(stand.feed({firmwareReport(0)}));
    EXPECT_EQ(stand.events.take().size(), 1U);
    stand.tearDown();
}

TEST_F(MisuseTest, StoppingBeforeUnschedulingLeavesTheDeviceToTheThread) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    stand.startUp();
    EXPECT_EQ(stand.service.stop(), 0U);
    EXPECT_TRUE(stand.device->isOpen());
    EXPECT_TRUE(stand.feed({firmwareReport(0)}));
    stand.service.unschedule(stand.queue);
    EXPECT_FALSE(stand.device->isOpen());
}

#ifndef NDEBUG

/// Unschedules on the input thread, while it is in an operation of the device.
void unscheduleFromTheInputThread() {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    stand.device->setHook([&stand](std::string_view operation) {
        if (operation == ScriptedDevice::kReportHandled) stand.service.unschedule(stand.queue);
    });
    stand.startUp();
    static_cast<void>(stand.feed({firmwareReport(0)}));
}

/// Unschedules where a trace point is passed while the pipeline's lock is held.
void unscheduleUnderTheLock() {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    const Vexa::TraceListener listener([&stand](std::uint32_t code, auto) {
        if (code == VEXA_TRACE_REPORT) stand.service.unschedule(stand.queue);
    });
    stand.startUp();
    static_cast<void>(stand.feed({firmwareReport(0)}));
}

TEST_F(MisuseDeathTest, TheInputThreadCannotUnscheduleItself) {
    EXPECT_DEATH(unscheduleFromTheInputThread(),
                 "unscheduleWithDispatchQueue: the input report thread cannot wait for itself");
}

TEST_F(MisuseDeathTest, NobodyUnschedulesUnderTheLock) {
    EXPECT_DEATH(unscheduleUnderTheLock(),
                 "unscheduleWithDispatchQueue: .* holds the pipeline's lock");
}

#endif

}  // namespace
}  // namespace VexaTouch::Testing
