// A process of its own, since it replaces functions that the plug-in calls.

#include "Pipeline/PipelineRecording.h"
#include "Platform/HostClock.h"
#include "Platform/TraceListener.h"
#include "Shared/Util.h"
#include "Tests/Support/LiveObjects.h"
#include "Tests/Support/LogCapture.h"
#include "Tests/Support/ProcessThreads.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <pthread.h>
#include <sched.h>
#include <semaphore.h>

#include <vexa/device.h>
#include <vexa/run_loop.h>
#include <vexa/value.h>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdint>
#include <functional>
#include <future>
#include <mutex>
#include <ostream>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

// That sanitizer learns from its own semaphores who waits for whom, so it keeps them.
#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
#define VEXA_COUNTS_SIGNALS 0
#endif
#elif defined(__SANITIZE_THREAD__)
#define VEXA_COUNTS_SIGNALS 0
#endif
#ifndef VEXA_COUNTS_SIGNALS
#define VEXA_COUNTS_SIGNALS 1
#endif

namespace {

std::atomic<bool> abiServes{true};
std::atomic<std::uint32_t> askedFor{0};
std::atomic<bool> haveRunLoops{true};
/// Whether loops can make a mode to wait in, and wait in it for ever.
std::atomic<bool> loopsHaveModes{true};
std::atomic<bool> loopsWait{true};
std::atomic<int> priorityError{0};
std::atomic<int> policy{-1};
std::atomic<int> priority{-1};
std::atomic<pthread_t> raised{};
std::atomic<bool> loopsTakeTasks{true};

/// The semaphore that was last made while its thread watched, and what it was told.
thread_local bool watchesSemaphores = false;
[[maybe_unused]] std::atomic<void*> semaphore{nullptr};
[[maybe_unused]] std::atomic<int> semaphoresMade{0};
std::atomic<int> signals{0};
[[maybe_unused]] std::atomic<int> waits{0};

/// Called when the elements of this array are read next, once.
std::atomic<const vexa_value*> watchedArray{nullptr};
std::function<void()> onReadOfArray;

/// Called when this value is read as a number next, once.
std::atomic<const vexa_value*> watchedNumber{nullptr};
std::function<void()> onReadOfNumber;

/// The time that reports come with, in place of the host's; 0: the host's.
std::atomic<std::uint64_t> deviceTime{0};
/// What reports have in their id besides its lowest byte.
std::atomic<std::uint32_t> deviceIdBits{0};
std::atomic<vexa_input_report_callback> serviceCallback{nullptr};

void passReportOn(void* context, vexa_status result, vexa_device* sender, vexa_report_type type,
                  std::uint32_t reportId, const std::uint8_t* report, std::size_t length,
                  std::uint64_t timestamp) {
    const std::uint64_t other = deviceTime;
    serviceCallback.load()(context, result, sender, type, reportId | deviceIdBits, report, length,
                           other != 0 ? other : timestamp);
}

/// A call that gives the device a place to send reports to, or takes it away.
struct DeviceCall {
    std::string name;
    std::string mode{};
    std::uint8_t* buffer = nullptr;
    std::size_t length = 0;
    bool hasCallback = false;
    /// How often the run's semaphore had been signalled.
    int signals = ::signals;

    friend bool operator==(const DeviceCall&, const DeviceCall&) = default;
    friend std::ostream& operator<<(std::ostream& out, const DeviceCall& call) {
        return out << call.name << " \"" << call.mode << "\" "
                   << static_cast<const void*>(call.buffer) << " (" << call.length << " bytes), "
                   << (call.hasCallback ? "callback" : "no callback") << ", " << call.signals
                   << " signals";
    }
};

class DeviceCalls {
public:
    void add(DeviceCall call) {
        const std::lock_guard lock(mutex_);
        calls_.push_back(std::move(call));
    }
    [[nodiscard]] std::vector<DeviceCall> take() {
        const std::lock_guard lock(mutex_);
        return std::exchange(calls_, {});
    }

private:
    std::mutex mutex_;
    std::vector<DeviceCall> calls_;
} deviceCalls;

/// Called on the input thread before the device is unscheduled.
std::function<void()> onUnscheduling;

template <typename Function>
Function* original(const char* name) {
    return reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
}

}  // namespace

extern "C" {

VEXA_API bool vexa_abi_serves(uint32_t built_for) noexcept {
    askedFor = built_for;
    return abiServes;
}

VEXA_API vexa_run_loop* vexa_run_loop_current(void) noexcept {
    static const auto current = original<vexa_run_loop*()>("vexa_run_loop_current");
    return haveRunLoops ? current() : nullptr;
}

VEXA_API vexa_run_result vexa_run_loop_run(vexa_run_loop* loop, const char* mode,
                                           uint64_t timeout_ns, bool return_after_source) noexcept {
    static const auto run =
        original<vexa_run_result(vexa_run_loop*, const char*, uint64_t, bool)>("vexa_run_loop_run");
    if (!loopsHaveModes || (timeout_ns == VEXA_RUN_FOREVER && !loopsWait)) return VEXA_RUN_FAILED;
    return run(loop, mode, timeout_ns, return_after_source);
}

VEXA_API int pthread_setschedparam(pthread_t thread, int newPolicy,
                                   const sched_param* parameters) noexcept {
    raised = thread;
    policy = newPolicy;
    priority = parameters->sched_priority;
    return priorityError;
}

VEXA_API bool vexa_run_loop_submit(vexa_run_loop* loop, const char* mode, vexa_task task,
                                   vexa_task drop, void* context) noexcept {
    static const auto submit =
        original<bool(vexa_run_loop*, const char*, vexa_task, vexa_task, void*)>(
            "vexa_run_loop_submit");
    return loopsTakeTasks && submit(loop, mode, task, drop, context);
}

VEXA_API const vexa_value* const* vexa_value_get_elements(const vexa_value* array,
                                                          size_t* count) noexcept {
    static const auto elements =
        original<const vexa_value* const*(const vexa_value*, size_t*)>("vexa_value_get_elements");
    const vexa_value* watched = array;
    if (array && watchedArray.compare_exchange_strong(watched, nullptr)) onReadOfArray();
    return elements(array, count);
}

VEXA_API float vexa_value_to_float(const vexa_value* value) noexcept {
    static const auto number = original<float(const vexa_value*)>("vexa_value_to_float");
    const vexa_value* watched = value;
    if (value && watchedNumber.compare_exchange_strong(watched, nullptr)) onReadOfNumber();
    return number(value);
}

VEXA_API vexa_status vexa_device_schedule(vexa_device* device, vexa_run_loop* loop,
                                          const char* mode) noexcept {
    static const auto schedule =
        original<vexa_status(vexa_device*, vexa_run_loop*, const char*)>("vexa_device_schedule");
    deviceCalls.add({.name = "schedule", .mode = mode});
    return schedule(device, loop, mode);
}

VEXA_API void vexa_device_unschedule(vexa_device* device, vexa_run_loop* loop,
                                     const char* mode) noexcept {
    static const auto unschedule =
        original<void(vexa_device*, vexa_run_loop*, const char*)>("vexa_device_unschedule");
    deviceCalls.add({.name = "unschedule", .mode = mode});
    if (onUnscheduling) onUnscheduling();
    unschedule(device, loop, mode);
}

VEXA_API vexa_status vexa_device_set_input_report_callback(vexa_device* device, uint8_t* buffer,
                                                           size_t length,
                                                           vexa_input_report_callback callback,
                                                           void* context) noexcept {
    static const auto set =
        original<vexa_status(vexa_device*, uint8_t*, size_t, vexa_input_report_callback, void*)>(
            "vexa_device_set_input_report_callback");
    deviceCalls.add({.name = "setInputReportCallback",
                     .buffer = buffer,
                     .length = length,
                     .hasCallback = callback != nullptr});
    if (callback) serviceCallback = callback;
    return set(device, buffer, length, callback ? passReportOn : nullptr, context);
}

#if VEXA_COUNTS_SIGNALS

VEXA_API int sem_init(sem_t* made, int shared, unsigned value) noexcept {
    static const auto init = original<int(sem_t*, int, unsigned)>("sem_init");
    if (watchesSemaphores) {
        semaphore = made;
        ++semaphoresMade;
        signals = 0;
        waits = 0;
    }
    return init(made, shared, value);
}

VEXA_API int sem_post(sem_t* posted) noexcept {
    static const auto post = original<int(sem_t*)>("sem_post");
    if (posted == semaphore) ++signals;
    return post(posted);
}

VEXA_API int sem_wait(sem_t* awaited) {
    static const auto wait = original<int(sem_t*)>("sem_wait");
    const bool isWatched = awaited == semaphore;
    const int result = wait(awaited);
    if (isWatched && result == 0) ++waits;
    return result;
}

#endif

}  // extern "C"

namespace VexaTouch::Testing {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

/// Schedules a service and counts what its new semaphore is told.
void scheduleWatched(const ServiceStand& stand) {
    watchesSemaphores = true;
    stand.service.schedule(stand.queue);
    watchesSemaphores = false;
}

/// The plug-in's lines, with those about the priority.
class EveryLine {
public:
    EveryLine() {
        Vexa::Log::setSink([this](Vexa::LogCategory, Vexa::LogLevel level, std::string_view text) {
            if (level != Vexa::LogLevel::Debug) lines_.push_back({level, std::string(text)});
        });
    }
    ~EveryLine() { Vexa::Log::setSink({}); }
    EveryLine(const EveryLine&) = delete;
    EveryLine(EveryLine&&) = delete;
    EveryLine& operator=(const EveryLine&) = delete;
    EveryLine& operator=(EveryLine&&) = delete;

    [[nodiscard]] std::vector<LogLine> take() {
        Vexa::Log::flush();
        return std::exchange(lines_, {});
    }

private:
    std::vector<LogLine> lines_;
};

TEST(ServiceSeamsTest, AFactoryWithoutItsLibraryMakesNothing) {
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    abiServes = false;
    EXPECT_EQ(plugin.make(), nullptr);
    EXPECT_EQ(askedFor, VEXA_ABI_VERSION);
    abiServes = true;
    EXPECT_NO_THROW(ServiceUnderTest(plugin.make()));
}

TEST(ServiceSeamsTest, TheInputThreadAsksForRoundRobinAt63) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    EveryLine log;
    stand.startUp();
    // It has asked before it handles the first report.
    ASSERT_TRUE(stand.feed({{9}}));
    EXPECT_EQ(policy, SCHED_RR);
    EXPECT_EQ(priority, 63);
    EXPECT_NE(raised, pthread_t{});
    EXPECT_EQ(pthread_equal(raised, pthread_self()), 0);
    stand.tearDown();
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST(ServiceSeamsTest, ARefusedPriorityIsLoggedAndIgnored) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    EveryLine log;
    for (const int refusal : {EPERM, EINVAL, 4711}) {
        priorityError = refusal;
        stand.service.schedule(stand.queue);
        stand.service.unschedule(stand.queue);
    }
    priorityError = EPERM;
    stand.startUp();
    EXPECT_TRUE(stand.feed({firmwareReport(0)}));
    EXPECT_EQ(stand.events.take().size(), 1U);
    stand.tearDown();
    priorityError = 0;
    EXPECT_THAT(log.take(), ElementsAre(error("pthread_setschedparam failed: 1"),
                                        error("pthread_setschedparam failed: 22"),
                                        error("pthread_setschedparam failed: 4711"),
                                        error("pthread_setschedparam failed: 1")));
}

TEST(ServiceSeamsTest, AThreadWithoutARunLoopLeavesTheServiceUnscheduled) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    EveryLine log;
    // The log's own thread starts with the first thread that it must not hold up, and stays.
    const Vexa::LogWithoutBlocking startsTheLogsThread;
    const std::size_t threads = threadCount();
    const std::int64_t queues = vexa_live_objects(VEXA_OBJECT_QUEUE);
    haveRunLoops = false;
    stand.service.schedule(Vexa::SerialQueue("the service's alone"));
    haveRunLoops = true;
    EXPECT_THAT(log.take(), ElementsAre(error("input report thread has no run loop")));
    EXPECT_EQ(stand.service.references(), 2U);
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_QUEUE), queues + 1);
    stand.service.unschedule({});
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_QUEUE), queues);
    ASSERT_TRUE(waitForThreads(threads));
    stand.startUp();
    EXPECT_TRUE(stand.feed({firmwareReport(0)}));
    stand.tearDown();
}

TEST(ServiceSeamsTest, ALoopWithoutAModeLeavesTheServiceUnscheduled) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    EveryLine log;
    const Vexa::LogWithoutBlocking startsTheLogsThread;
    const std::size_t threads = threadCount();
    loopsHaveModes = false;
    stand.service.schedule(stand.queue);
    loopsHaveModes = true;
    EXPECT_THAT(log.take(), ElementsAre(error("input report thread has no run loop")));
    stand.service.unschedule(stand.queue);
    ASSERT_TRUE(waitForThreads(threads));
    EXPECT_EQ(stand.service.references(), 2U);
    stand.startUp();
    EXPECT_TRUE(stand.feed({firmwareReport(0)}));
    stand.tearDown();
}

TEST(ServiceSeamsTest, AThreadWhoseLoopFailsIsUnscheduledLikeAnyOther) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    const Vexa::LogWithoutBlocking startsTheLogsThread;
    const std::size_t threads = threadCount();
    // Whether it has ended by itself or is about to when it is told to stop.
    for (const bool hasEnded : {false, true}) {
        EveryLine log;
        loopsWait = false;
        stand.service.schedule(stand.queue);
        if (hasEnded) {
            ASSERT_TRUE(waitForThreads(threads));
        }
        stand.service.unschedule(stand.queue);
        loopsWait = true;
        ASSERT_TRUE(waitForThreads(threads));
        EXPECT_THAT(log.take(), ElementsAre(error("input report run loop failed")));
        EXPECT_EQ(stand.service.references(), 2U);
    }
    stand.startUp();
    EXPECT_TRUE(stand.feed({firmwareReport(0)}));
    stand.tearDown();
}

/// While one lives no thread can be started: none has a stack as large as it asks for.
class NoThreads {
public:
    NoThreads() {
        EXPECT_EQ(pthread_getattr_default_np(&usual_), 0);
        pthread_attr_t endless = usual_;
        EXPECT_EQ(pthread_attr_setstacksize(&endless, SIZE_MAX / 4 + 1), 0);
        EXPECT_EQ(pthread_setattr_default_np(&endless), 0);
    }
    ~NoThreads() {
        EXPECT_EQ(pthread_setattr_default_np(&usual_), 0);
        pthread_attr_destroy(&usual_);
    }
    NoThreads(const NoThreads&) = delete;
    NoThreads(NoThreads&&) = delete;
    NoThreads& operator=(const NoThreads&) = delete;
    NoThreads& operator=(NoThreads&&) = delete;

private:
    pthread_attr_t usual_{};
};

TEST(ServiceSeamsTest, ASecondSchedulingThatFailsLeavesTheFirstAsItWas) {
    for (const bool threadStarts : {false, true}) {
        ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
        EveryLine log;
        const Vexa::LogWithoutBlocking startsTheLogsThread;
        const std::size_t threads = threadCount();
        stand.startUp();
        {
            const Vexa::SerialQueue second("second");
            if (threadStarts) {
                haveRunLoops = false;
                stand.service.schedule(second);
                haveRunLoops = true;
            } else {
                const NoThreads none;
                stand.service.schedule(second);
            }
        }
        EXPECT_THAT(log.take(),
                    ElementsAre(error(threadStarts ? "input report thread has no run loop"
                                                   : "input report thread not started: 11")));
        EXPECT_TRUE(stand.feed({firmwareReport(0)}));
        EXPECT_EQ(stand.events.take().size(), 1U);
        stand.tearDown();
        ASSERT_TRUE(waitForThreads(threads));
    }
}

TEST(ServiceSeamsTest, AThreadThatDoesNotStartLeavesTheServiceUnscheduled) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    EveryLine log;
    const std::size_t threads = threadCount();
    const std::int64_t queues = vexa_live_objects(VEXA_OBJECT_QUEUE);
    Vexa::SerialQueue own("the service's alone");
    {
        const NoThreads none;
        stand.service.schedule(own);
    }
    own.reset();
    static_assert(EAGAIN == 11);
    EXPECT_THAT(log.take(), ElementsAre(error("input report thread not started: 11")));
    EXPECT_EQ(stand.service.references(), 2U);
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_QUEUE), queues + 1);
    stand.service.unschedule({});
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_QUEUE), queues);
    EXPECT_LE(threadCount(), threads);
    stand.startUp();
    EXPECT_TRUE(stand.feed({firmwareReport(0)}));
    EXPECT_EQ(stand.events.take().size(), 1U);
    stand.tearDown();
    EXPECT_EQ(stand.service.references(), 2U);
}

#if VEXA_COUNTS_SIGNALS

TEST(ServiceSeamsTest, ARunSignalsTwiceAndIsAwaitedTwice) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    // The log's own thread starts with the first input thread, and stays.
    const Vexa::LogWithoutBlocking startsTheLogsThread;
    const std::size_t threads = threadCount();
    for (int run = 1; run <= 3; ++run) {
        scheduleWatched(stand);
        EXPECT_EQ(semaphoresMade, run);
        EXPECT_EQ(signals, 1);
        EXPECT_EQ(waits, 1);
        ASSERT_TRUE(stand.service.open());
        ASSERT_TRUE(stand.feed({firmwareReport(0)}));
        stand.service.close();
        EXPECT_EQ(signals, 1);
        stand.service.unschedule(stand.queue);
        ASSERT_TRUE(waitForThreads(threads));
        EXPECT_EQ(signals, 2);
        EXPECT_EQ(waits, 2);
        stand.service.unschedule(stand.queue);
        EXPECT_EQ(signals, 2);
        EXPECT_EQ(waits, 2);
    }
}

#endif

TEST(ServiceSeamsTest, UnschedulingReturnsOnlyAfterTheDeviceIsUnscheduled) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    static_cast<void>(deviceCalls.take());
    std::promise<void> unscheduling;
    std::promise<void> goOn;
    onUnscheduling = [&unscheduling, latch = goOn.get_future().share()] {
        unscheduling.set_value();
        latch.wait();
    };
    scheduleWatched(stand);
    ASSERT_TRUE(stand.service.open());
    ASSERT_TRUE(stand.feed({firmwareReport(0)}));

    std::atomic<bool> returned{false};
    std::thread host([&] {
        stand.service.unschedule(stand.queue);
        returned = true;
    });
    unscheduling.get_future().wait();
    EXPECT_FALSE(returned);
    EXPECT_EQ(deviceCalls.take().size(), 3U);
    // The thread, its probes and its handler still hold the service.
    EXPECT_GT(stand.service.references(), 2U);
    goOn.set_value();
    host.join();
    onUnscheduling = nullptr;
    EXPECT_EQ(stand.service.references(), 2U);
    stand.service.stop();
}

TEST(ServiceSeamsTest, ARunGivesTheDeviceOneBufferAndTakesItBack) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    static_cast<void>(deviceCalls.take());
    scheduleWatched(stand);
    ASSERT_TRUE(stand.service.open());
    ASSERT_TRUE(stand.feed({firmwareReport(0)}));
    stand.service.unschedule(stand.queue);
    stand.service.stop();

    const std::vector<DeviceCall> calls = deviceCalls.take();
    ASSERT_EQ(calls.size(), 4U);
    std::uint8_t* const buffer = calls[0].buffer;
    EXPECT_NE(buffer, nullptr);
    const std::string mode = "kHandleInputReportsRunLoopMode";
    // All between the two signals of the run, since its host waits for the second one.
    const int started = VEXA_COUNTS_SIGNALS;
    EXPECT_THAT(calls,
                ElementsAre(DeviceCall{.name = "setInputReportCallback",
                                       .buffer = buffer,
                                       .length = 512,
                                       .hasCallback = true,
                                       .signals = started},
                            DeviceCall{.name = "schedule", .mode = mode, .signals = started},
                            DeviceCall{.name = "unschedule", .mode = mode, .signals = started},
                            DeviceCall{.name = "setInputReportCallback",
                                       .buffer = buffer,
                                       .length = 512,
                                       .hasCallback = false,
                                       .signals = started}));
}

std::vector<std::string> recordedKeys(const Vexa::PropertyValue& recording) {
    std::vector<std::string> keys;
    const PipelineRecording pipeline{std::string_view(recording.asString().value())};
    for (const auto& frame : pipeline.frames()) keys.push_back(frame.key);
    return keys;
}

TEST(ServiceSeamsTest, ARecordingIsWrittenOutsideTheLock) {
    const ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    const Vexa::PropertyValue array(Vexa::PropertyValue::Array{1, "two"});
    ASSERT_TRUE(stand.service.set("Pipeline.Unknown", array));
    std::future<bool> write;
    std::future_status came = std::future_status::deferred;
    // The array is read when its frame is turned into text; meanwhile somebody wants the lock.
    onReadOfArray = [&] {
        write = std::async(std::launch::async, [&stand] {
            return stand.service.set("Pipeline.Algs.ActivationThreshold", 321);
        });
        came = write.wait_for(std::chrono::minutes(1));
    };
    watchedArray = array.handle();
    const Vexa::PropertyValue recording = stand.service.get("Recording");
    ASSERT_EQ(watchedArray, nullptr) << "the array was not read";
    EXPECT_EQ(came, std::future_status::ready);
    EXPECT_TRUE(write.get());
    onReadOfArray = nullptr;
    // What is written is the copy, so the next one is the first to have the change.
    EXPECT_THAT(recordedKeys(recording), ElementsAre("Unknown"));
    EXPECT_THAT(recordedKeys(stand.service.get("Recording")),
                ElementsAre("Unknown", "Algs.ActivationThreshold"));
    EXPECT_EQ(stand.service.get("Pipeline.Algs.ActivationThreshold").toDouble(), 321.0);
}

TEST(ServiceSeamsTest, AnArrivalIsLoggedBeforeTheLockIsTaken) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    stand.startUp();
    // The thread takes the lock for its probes, too, before it handles the first report.
    ASSERT_TRUE(stand.feed({{9}}));
    LogCapture log;
    const Vexa::PropertyValue threshold(321.0F);
    std::vector<LogLine> whileLocked;
    // A setting is read under the lock, while a report comes.
    onReadOfNumber = [&] {
        ASSERT_TRUE(stand.device->sendReport(std::vector<std::uint8_t>{9}));
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::minutes(1);
        while (whileLocked.empty() && std::chrono::steady_clock::now() < deadline) {
            whileLocked = log.take();
            std::erase_if(whileLocked,
                          [](const LogLine& line) { return !line.text.starts_with("Received"); });
        }
        EXPECT_EQ(stand.device->handled(), 1U);
    };
    watchedNumber = threshold.handle();
    ASSERT_TRUE(stand.service.set("Pipeline.Algs.ActivationThreshold", threshold));
    ASSERT_EQ(watchedNumber, nullptr) << "the setting was not read";
    onReadOfNumber = nullptr;
    ASSERT_EQ(whileLocked.size(), 1U);
    EXPECT_TRUE(whileLocked.front().text.starts_with(
        "Received input report (type 0, reportID 9, reportLength 1, timestampMach "));
    ASSERT_TRUE(stand.device->waitUntilHandled(2));
    EXPECT_THAT(log.take(),
                ElementsAre(debug("Input report probe"), debug("Invalid input report with ID 9")));
    stand.tearDown();
}

TEST(ServiceSeamsTest, TheDevicesTimeIsOnlyLogged) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    stand.startUp();
    LogCapture log;
    deviceTime = 4711;
    const std::uint64_t before = Vexa::HostClock::system().now();
    ASSERT_TRUE(stand.feed({firmwareReport(0)}));
    const std::uint64_t after = Vexa::HostClock::system().now();
    deviceTime = 0;
    EXPECT_EQ(log.take().front(),
              debug("Received input report (type 0, reportID 2, reportLength 10, timestampMach "
                    "4711)"));
    const std::vector<Vexa::HidEvent> events = stand.events.take();
    ASSERT_EQ(events.size(), 1U);
    EXPECT_GE(events[0].timestamp(), before);
    EXPECT_LE(events[0].timestamp(), after);
    const Vexa::PropertyValue text = stand.service.get("Recording");
    const PipelineRecording recording{std::string_view(text.asString().value())};
    ASSERT_EQ(recording.frames().size(), 1U);
    EXPECT_EQ(recording.frames().begin()->timestamp,
              Util::nanosecondsFromMachTime(events[0].timestamp()));
    stand.tearDown();
}

TEST(ServiceSeamsTest, AReportIdHasOneByte) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    stand.startUp();
    LogCapture log;
    deviceTime = 4711;
    deviceIdBits = 0x5A00;
    ASSERT_TRUE(stand.feed({{0xFE}}));
    deviceIdBits = 0;
    deviceTime = 0;
    EXPECT_EQ(log.take().front(),
              debug("Received input report (type 0, reportID 254, reportLength 1, timestampMach "
                    "4711)"));
    stand.tearDown();
}

TEST(ServiceSeamsTest, TheInputThreadHasItsNameAndBlocksAllSignals) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    std::array<char, 16> name{};
    sigset_t blocked{};
    const Vexa::TraceListener listener([&](std::uint32_t code, auto) {
        if (code != VEXA_TRACE_REPORT) return;
        pthread_getname_np(pthread_self(), name.data(), name.size());
        pthread_sigmask(SIG_BLOCK, nullptr, &blocked);
    });
    stand.startUp();
    ASSERT_TRUE(stand.feed({{9}}));
    stand.tearDown();
    EXPECT_STREQ(name.data(), "vexa-input");
    for (const int signal : {SIGINT, SIGTERM, SIGHUP, SIGUSR1, SIGALRM, SIGCHLD, SIGRTMIN}) {
        EXPECT_EQ(::sigismember(&blocked, signal), 1) << signal;
    }
}

/// Unschedules a service whose run loop takes no more tasks.
void unscheduleWithoutMemory() {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    stand.service.schedule(stand.queue);
    loopsTakeTasks = false;
    stand.service.unschedule(stand.queue);
}

TEST(ServiceSeamsDeathTest, AThreadThatCannotBeStoppedEndsTheProcess) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_DEATH(unscheduleWithoutMemory(),
                 "unscheduleWithDispatchQueue: the input report thread cannot be told to stop");
}

}  // namespace
}  // namespace VexaTouch::Testing
