#include "Platform/DeviceBackend.h"
#include "Platform/HidDevice.h"
#include "Tests/Support/LeakCheck.h"
#include "Tests/Support/LiveObjects.h"
#include "Tests/Support/LogCapture.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/ProcessThreads.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"

#include <gmock/gmock.h>
#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>

#include <fcntl.h>
#include <unistd.h>
#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <thread>
#include <tuple>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using testing::Contains;
using testing::ElementsAre;
using Vexa::PropertyValue;
using Vexa::ScriptedDevice;

class ServiceLifecycleTest : public testing::Test {
protected:
    [[nodiscard]] std::vector<std::string> deviceCalls() const {
        std::vector<std::string> calls;
        for (const ScriptedDevice::Call& call : stand.device->calls()) {
            calls.push_back(std::string(call.operation) + " " + std::to_string(call.options));
        }
        return calls;
    }

    ServiceStand stand{VEXATOUCH_PLUGIN_FILE};
};

TEST_F(ServiceLifecycleTest, EachOperationLogsItsName) {
    LogCapture log;
    {
        const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
        const ServiceUnderTest service(plugin.make());
        std::int32_t score = 3;
        ASSERT_EQ(service.probe(stand.registration.service(), &score), 0U);
        EXPECT_EQ(score, 3);
        ASSERT_EQ(service.start(stand.registration.service()), 0U);
        service.setEventCallback(nullptr, nullptr, nullptr);
        EXPECT_THAT(log.take(), ElementsAre(debug("probeWithService:properties:outScore:"),
                                            debug("startWithService:properties:"),
                                            debug("setEventCallback:target:refcon:")));
        service.schedule(stand.queue);
        EXPECT_THAT(log.take(), ElementsAre(debug("scheduleWithDispatchQueue:"),
                                            debug("input report thread start")));
        EXPECT_TRUE(service.open(0x1F2E));
        EXPECT_EQ((*service.service())->copyEvent(service.service(), 11, nullptr, 0), nullptr);
        EXPECT_EQ((*service.service())->setOutputEvent(service.service(), nullptr), 0xE00002C7U);
        service.close(0xFFFFFFFF);
        EXPECT_THAT(
            log.take(),
            ElementsAre(debug("openWithOptions:1f2e"), debug("copyEventWithType:matching:options:"),
                        debug("setOutputEvent:"), debug("closeWithOptions:ffffffff")));
        const std::size_t threads = threadCount();
        service.unschedule(stand.queue);
        ASSERT_TRUE(waitForThreads(threads - 1));
        std::vector<LogLine> lines = log.take();
        // The thread says goodbye whenever it gets around to it.
        EXPECT_EQ(std::erase(lines, debug("input report thread end")), 1U);
        EXPECT_THAT(lines, ElementsAre(debug("unscheduleWithDispatchQueue:"),
                                       debug("signalling input report thread to exit"),
                                       debug("waiting for input report thread to exit"),
                                       debug("input report thread exited")));
        service.unschedule(stand.queue);
        EXPECT_EQ(service.stop(), 0U);
        EXPECT_THAT(log.take(), ElementsAre(debug("unscheduleWithDispatchQueue:"), debug("stop")));
    }
    EXPECT_THAT(log.take(), ElementsAre(debug("dealloc")));
}

TEST_F(ServiceLifecycleTest, NothingIsLoggedAboveDebugInAnOrdinaryLife) {
    LogCapture log;
    stand.startUp();
    const std::size_t threads = threadCount();
    ASSERT_TRUE(stand.feed({imageReport(nothing(), 1, 10)}));
    EXPECT_EQ(stand.service.get("Version"), PropertyValue(PropertyValue::Array{13, 0, 0}));
    stand.tearDown();
    ASSERT_TRUE(waitForThreads(threads - 1));
    const std::vector<LogLine> lines = log.take();
    for (const LogLine& line : lines) EXPECT_EQ(line.level, Vexa::LogLevel::Debug) << line;
    // All of the life was seen.
    EXPECT_EQ(lines.front(), debug("probeWithService:properties:outScore:"));
    for (const char* text :
         {"scheduleWithDispatchQueue:", "input report thread start", "openWithOptions:0",
          "Input report probe", "getPropertyForKey:Version", "closeWithOptions:0",
          "unscheduleWithDispatchQueue:", "input report thread end", "stop"}) {
        EXPECT_THAT(lines, Contains(debug(text)));
    }
}

TEST_F(ServiceLifecycleTest, StartFailsForAnUnknownHandle) {
    EXPECT_EQ(stand.service.start(0), 0xE00002BEU);
    EXPECT_EQ(stand.service.start(0xFFFFFFFF), 0xE00002BEU);
    EXPECT_FALSE(stand.service.open());
    EXPECT_EQ(stand.service.start(stand.registration.service()), 0U);
    EXPECT_TRUE(stand.service.open());
}

TEST_F(ServiceLifecycleTest, OpenAndCloseReachTheDeviceWithTheirOptions) {
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    EXPECT_TRUE(stand.service.open(7));
    EXPECT_FALSE(stand.service.open(8));
    stand.service.close(9);
    stand.service.close(10);
    EXPECT_TRUE(stand.service.open(11));
    EXPECT_THAT(deviceCalls(), ElementsAre("open 7", "close 9", "open 11"));
}

TEST_F(ServiceLifecycleTest, AFailedOpenChangesNothing) {
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    stand.device->setNextOpenStatuses({VEXA_STATUS_IO_ERROR, VEXA_STATUS_GONE, 1});
    EXPECT_FALSE(stand.service.open());
    EXPECT_FALSE(stand.service.open());
    EXPECT_FALSE(stand.service.open());
    EXPECT_TRUE(stand.service.open());
}

TEST_F(ServiceLifecycleTest, StopGivesTheDeviceBack) {
    const LiveObjects before = LiveObjects::now();
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    EXPECT_EQ(LiveObjects::now().counts[VEXA_OBJECT_DEVICE], before.counts[VEXA_OBJECT_DEVICE] + 1);
    EXPECT_TRUE(stand.service.open());
    EXPECT_EQ(stand.service.stop(), 0U);
    EXPECT_EQ(stand.service.stop(), 0U);
    EXPECT_FALSE(stand.device->isOpen());
    EXPECT_FALSE(stand.service.open());
    EXPECT_EQ(LiveObjects::now(), before);
}

TEST_F(ServiceLifecycleTest, StartingAgainTakesTheNewDevice) {
    const auto other = std::make_shared<ScriptedDevice>();
    const Vexa::DeviceRegistration registration(other);
    ASSERT_EQ(stand.service.start(stand.registration.service()), 0U);
    EXPECT_TRUE(stand.service.open());
    ASSERT_EQ(stand.service.start(registration.service()), 0U);
    EXPECT_FALSE(stand.device->isOpen());
    EXPECT_TRUE(stand.service.open());
    EXPECT_TRUE(other->isOpen());
}

TEST_F(ServiceLifecycleTest, ReportsAfterUnschedulingAreNotTaken) {
    stand.startUp();
    ASSERT_TRUE(stand.feed({imageReport(nothing(), 1, 10)}));
    stand.service.unschedule(stand.queue);
    ASSERT_TRUE(stand.device->sendReport(imageReport(nothing(), 9, 20)));
    stand.service.unschedule(stand.queue);
    EXPECT_EQ(stand.device->handled(), 1U);
    EXPECT_EQ(stand.service.get("DisjointImageCount"), PropertyValue(0U));
}

TEST_F(ServiceLifecycleTest, UnschedulingWhatWasNeverScheduledDoesNothing) {
    const LeakCheck leaks;
    stand.service.unschedule({});
    stand.service.unschedule(stand.queue);
    stand.service.unschedule(stand.queue);
    leaks.expectNothingLeft();
    EXPECT_EQ(stand.service.references(), 2U);
    stand.startUp();
    EXPECT_TRUE(stand.feed({firmwareReport(0)}));
    EXPECT_EQ(stand.events.take().size(), 1U);
    stand.tearDown();
}

TEST_F(ServiceLifecycleTest, TheQueueIsHeldWhileScheduled) {
    const std::int64_t queues = vexa_live_objects(VEXA_OBJECT_QUEUE);
    {
        Vexa::SerialQueue own("own");
        stand.service.schedule(own);
    }
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_QUEUE), queues + 1);
    stand.service.unschedule({});
    EXPECT_EQ(vexa_live_objects(VEXA_OBJECT_QUEUE), queues);
}

TEST_F(ServiceLifecycleTest, UnschedulingLeavesTheServiceToItsHost) {
    stand.startUp();
    EXPECT_GT(stand.service.references(), 2U);
    stand.service.unschedule(stand.queue);
    EXPECT_EQ(stand.service.references(), 2U);
}

TEST_F(ServiceLifecycleTest, NoOperationLeavesAnObjectBehind) {
    const ServiceUnderTest& service = stand.service;
    stand.device->setFeatureReport(4, {4, 1, 2});
    stand.device->setFeatureReport(31, {31, 1, 0, 0, 0});
    stand.device->setFeatureReport(63, {63, 1, 0, 0, 0});
    stand.device->setWrites(ScriptedDevice::Writes::Accepted);
    stand.device->setPropertyValue("Product", PropertyValue::Array{1, "two"});
    const PropertyValue value(PropertyValue::Array{1, "a longer text than fits anywhere"});
    const Vexa::HidEvent event = Vexa::HidEvent::digitizer({});

    const auto leaves = [](const std::function<void()>& operation) {
        const LiveObjects before = LiveObjects::now();
        operation();
        const LiveObjects after = LiveObjects::now();
        LiveObjects difference;
        for (std::size_t kind = 0; kind < after.counts.size(); ++kind) {
            difference.counts.at(kind) = after.counts.at(kind) - before.counts.at(kind);
        }
        return difference;
    };
    const LiveObjects nothing;
    LiveObjects aDevice;
    aDevice.counts[VEXA_OBJECT_DEVICE] = 1;
    LiveObjects aRunLoop;
    aRunLoop.counts[VEXA_OBJECT_RUN_LOOP] = 1;

    EXPECT_EQ(
        leaves([&] {
            void* out = nullptr;
            (*service.plugin())->QueryInterface(service.plugin(), VEXA_PLUGIN_INTERFACE, &out);
            (*service.plugin())->AddRef(service.plugin());
            (*service.plugin())->Release(service.plugin());
            (*service.plugin())->Release(service.plugin());
        }),
        nothing);
    std::int32_t score = 0;
    EXPECT_EQ(leaves([&] { static_cast<void>(service.probe(1, &score, value)); }), nothing);
    EXPECT_EQ(leaves([&] { ASSERT_EQ(service.start(stand.registration.service(), value), 0U); }),
              aDevice);
    EXPECT_EQ(leaves([&] { service.setEventCallback(nullptr, nullptr, nullptr); }), nothing);
    EXPECT_EQ(leaves([&] { service.schedule(stand.queue); }), aRunLoop);
    EXPECT_EQ(leaves([&] { EXPECT_TRUE(service.open()); }), nothing);
    for (const PropertyValue& key : std::vector<PropertyValue>{"Version",
                                                               "Recording",
                                                               "DisjointImageCount",
                                                               "FirmwareVersion",
                                                               "FactoryResetHoldDuration",
                                                               "CriticalErrors",
                                                               "ServicePluginDebug",
                                                               "Pipeline.Algs.ActivationThreshold",
                                                               "Pipeline.Algs.EventStats",
                                                               "Pipeline.Algs.DebugInfo",
                                                               "Pipeline.DebugInfo",
                                                               "Product",
                                                               "Unknown",
                                                               {},
                                                               5}) {
        EXPECT_EQ(leaves([&] { static_cast<void>(service.get(key)); }), nothing)
            << key.description();
        EXPECT_EQ(leaves([&] { service.set(key, value); }), nothing) << key.description();
    }
    EXPECT_EQ(leaves([&] {
                  EXPECT_EQ(
                      (*service.service())->copyEvent(service.service(), 11, event.handle(), 0),
                      nullptr);
                  (*service.service())->setOutputEvent(service.service(), event.handle());
              }),
              nothing);
    EXPECT_EQ(leaves([&] { ASSERT_TRUE(stand.feed({imageReport(Touch(), 1, 10), {9}})); }),
              nothing);
    EXPECT_EQ(leaves([&] { service.close(); }), nothing);
    const LiveObjects scheduled = LiveObjects::now();
    const std::size_t threads = threadCount();
    service.unschedule(stand.queue);
    ASSERT_TRUE(waitForThreads(threads - 1));
    LiveObjects expected = scheduled;
    --expected.counts[VEXA_OBJECT_RUN_LOOP];
    EXPECT_EQ(LiveObjects::now(), expected);
    --expected.counts[VEXA_OBJECT_DEVICE];
    service.stop();
    EXPECT_EQ(LiveObjects::now(), expected);
}

TEST_F(ServiceLifecycleTest, AServiceMayBeReleasedInEveryStateWithoutAThread) {
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    const LeakCheck leaks;
    {
        const ServiceUnderTest fresh(plugin.make());
    }
    leaks.expectNothingLeft();
    {
        const ServiceUnderTest started(plugin.make());
        ASSERT_EQ(started.start(stand.registration.service()), 0U);
    }
    leaks.expectNothingLeft();
    {
        const ServiceUnderTest opened(plugin.make());
        ASSERT_EQ(opened.start(stand.registration.service()), 0U);
        ASSERT_TRUE(opened.open(5));
    }
    EXPECT_FALSE(stand.device->isOpen());
    leaks.expectNothingLeft();
    {
        const ServiceUnderTest unscheduled(plugin.make());
        ASSERT_EQ(unscheduled.start(stand.registration.service()), 0U);
        unscheduled.schedule(stand.queue);
        ASSERT_TRUE(unscheduled.open());
        unscheduled.unschedule(stand.queue);
    }
    leaks.expectNothingLeft();
}

// Nobody else holds the plug-in, so each life ends in its unloading, with the input thread perhaps
// in its last instructions.
TEST(ServiceLivesTest, AThousandLivesLeaveNothing) {
    const auto device = std::make_shared<Vexa::ScriptedDevice>();
    const Vexa::DeviceRegistration registration(device);
    EventCollector events;
    const Vexa::SerialQueue queue("events");
    const auto live = [&] {
        const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
        const ServiceUnderTest service(plugin.make());
        ASSERT_EQ(service.start(registration.service()), 0U);
        service.setEventCallback(&EventCollector::callback, &events, nullptr);
        service.schedule(queue);
        ASSERT_TRUE(service.open());
        ASSERT_TRUE(device->sendReport(firmwareReport(0)));
        service.unschedule(queue);
        // An event on its way keeps the service, and that its device.
        service.stop();
    };
    const LeakCheck leaks;
    for (int i = 0; i < 1000; ++i) live();
    queue.drain();
    EXPECT_LE(events.take().size(), 1000U);
    leaks.expectNothingLeft();
}

/// What the host does, step by step; a fault strikes before one of them.
enum class Step { Probe, Start, SetCallback, Schedule, Open, Properties, Close, Unschedule, Stop };

enum class Strike {
    Unplug,
    FailedOpen,
    NoDescriptor,
    RegularFile,
    RefusedWrite,
    FailedFeatureReport
};

/// What an answering device and one that was struck answer.
struct Answers {
    vexa_status open = VEXA_STATUS_SUCCESS;
    vexa_status report = VEXA_STATUS_SUCCESS;
    bool reads = true;
    bool writes = true;
};

/// The back-end's own word for not opening; the library hands on whatever it is.
constexpr vexa_status kNotToday = 0x12345678;

Answers answersAfter(Strike strike) {
    switch (strike) {
        case Strike::Unplug:
            return {VEXA_STATUS_GONE, VEXA_STATUS_GONE, false, false};
        case Strike::FailedOpen:
            return {.open = kNotToday};
        case Strike::NoDescriptor:
            return {.open = VEXA_STATUS_IO_ERROR};
        case Strike::RegularFile:
            return {.open = VEXA_STATUS_NO_RESOURCES};
        case Strike::RefusedWrite:
            return {.writes = false};
        case Strike::FailedFeatureReport:
            return {.report = VEXA_STATUS_IO_ERROR};
    }
    return {};
}

/// A scripted device that can be struck, from then on, and counts what was opened and closed.
class StruckDevice final : public Vexa::DeviceBackend {
public:
    void strike(Strike strike) {
        switch (strike) {
            case Strike::Unplug:
                scripted.unplug();
                break;
            case Strike::RefusedWrite:
                scripted.setWrites(ScriptedDevice::Writes::Refused);
                break;
            case Strike::FailedFeatureReport:
                scripted.setFeatureReportStatus(4, VEXA_STATUS_IO_ERROR);
                break;
            default:
                openStrike_ = strike;
        }
    }
    /// Successful opens that no close was told for.
    [[nodiscard]] int leftOpen() const { return leftOpen_; }

    vexa_status open(std::uint32_t options, int& descriptor) noexcept override {
        if (openStrike_ == Strike::FailedOpen) return kNotToday;
        badOpen_ = openStrike_.has_value();
        if (badOpen_) {
            descriptor = openStrike_ == Strike::NoDescriptor
                             ? -1
                             : ::open("/proc/self/exe", O_RDONLY | O_CLOEXEC);
            ++leftOpen_;
            return VEXA_STATUS_SUCCESS;
        }
        const vexa_status status = scripted.open(options, descriptor);
        if (status == VEXA_STATUS_SUCCESS) ++leftOpen_;
        return status;
    }
    void close(std::uint32_t options) noexcept override {
        --leftOpen_;
        // An open with a useless descriptor is taken back at once.
        if (!std::exchange(badOpen_, false)) scripted.close(options);
    }
    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) noexcept override {
        return scripted.getReport(type, reportId, report, length);
    }
    PropertyValue property(const PropertyValue& key) noexcept override {
        return scripted.property(key);
    }
    bool setProperty(const PropertyValue& key, const PropertyValue& value) noexcept override {
        return scripted.setProperty(key, value);
    }
    void reportHandled() noexcept override { scripted.reportHandled(); }

    ScriptedDevice scripted;

private:
    // The host's thread alone opens and closes.
    std::optional<Strike> openStrike_;
    bool badOpen_ = false;
    int leftOpen_ = 0;
};

class FaultTest : public testing::TestWithParam<std::tuple<Strike, Step>> {};

std::string faultName(const testing::TestParamInfo<std::tuple<Strike, Step>>& info) {
    static const std::vector<std::string> strikes = {"Unplug",       "FailedOpen",
                                                     "NoDescriptor", "RegularFile",
                                                     "RefusedWrite", "FailedFeatureReport"};
    static const std::vector<std::string> steps = {"Probe",    "Start",      "SetCallback",
                                                   "Schedule", "Open",       "Properties",
                                                   "Close",    "Unschedule", "Stop"};
    return strikes.at(static_cast<std::size_t>(std::get<Strike>(info.param))) + "Before" +
           steps.at(static_cast<std::size_t>(std::get<Step>(info.param)));
}

INSTANTIATE_TEST_SUITE_P(
    Of, FaultTest,
    testing::Combine(testing::Values(Strike::Unplug, Strike::FailedOpen, Strike::NoDescriptor,
                                     Strike::RegularFile, Strike::RefusedWrite,
                                     Strike::FailedFeatureReport),
                     testing::Values(Step::Probe, Step::Start, Step::SetCallback, Step::Schedule,
                                     Step::Open, Step::Properties, Step::Close, Step::Unschedule,
                                     Step::Stop)),
    faultName);

/// The statuses behind the service's answers, of another device of the same back-end.
void expectAnswers(const Answers& answers, std::uint32_t handle) {
    const Vexa::HidDevice device = Vexa::HidDevice::create(handle);
    ASSERT_TRUE(device);
    if (answers.open != VEXA_STATUS_SUCCESS) {
        EXPECT_EQ(device.open(0), answers.open);
    }
    std::array<std::uint8_t, 32> report{};
    std::size_t length = report.size();
    EXPECT_EQ(device.featureReport(4, report.data(), length), answers.report);
    EXPECT_EQ(static_cast<bool>(device.property("Product")), answers.reads);
    EXPECT_EQ(device.setProperty("Colour", 1), answers.writes);
}

/// Takes a service through its whole life; `strike` is called before one step, and what the host
/// gets from then on must be `struck`.
void liveThrough(Step when, const Answers& struck, const LoadedPlugin& plugin, StruckDevice& device,
                 std::uint32_t handle, const Vexa::SerialQueue& queue, EventCollector& events,
                 const std::function<void()>& strike) {
    Answers now;
    const auto comesTo = [&](Step next) {
        if (next != when) return;
        strike();
        now = struck;
    };
    const ServiceUnderTest service(plugin.make());
    std::int32_t score = 4;
    comesTo(Step::Probe);
    EXPECT_EQ(service.probe(handle, &score), 0U);
    EXPECT_EQ(score, 4);
    comesTo(Step::Start);
    EXPECT_EQ(service.start(handle), 0U);
    comesTo(Step::SetCallback);
    service.setEventCallback(&EventCollector::callback, &events, nullptr);
    comesTo(Step::Schedule);
    service.schedule(queue);
    comesTo(Step::Open);
    const bool opened = service.open();
    EXPECT_EQ(opened, now.open == VEXA_STATUS_SUCCESS);
    comesTo(Step::Properties);
    const bool arrives = opened && now.reads;
    EXPECT_EQ(device.scripted.sendReport(firmwareReport(0)), arrives);
    EXPECT_EQ(service.get("Product"), now.reads ? PropertyValue("surface") : PropertyValue());
    EXPECT_EQ(service.set("Colour", 1), now.writes);
    EXPECT_EQ(service.get("FirmwareVersion"), now.report == VEXA_STATUS_SUCCESS
                                                  ? PropertyValue(PropertyValue::Array{1, 2})
                                                  : PropertyValue());
    EXPECT_EQ(service.get("CriticalErrors"), PropertyValue());
    EXPECT_TRUE(service.set("Pipeline.Algs.ActivationThreshold", 200));
    EXPECT_EQ(service.get("Version"), PropertyValue(PropertyValue::Array{13, 0, 0}));
    if (arrives) {
        EXPECT_TRUE(device.scripted.waitUntilHandled(1));
        EXPECT_TRUE(events.waitFor(1));
    }
    comesTo(Step::Close);
    service.close();
    EXPECT_EQ(device.leftOpen(), 0);
    comesTo(Step::Unschedule);
    service.unschedule(queue);
    comesTo(Step::Stop);
    EXPECT_EQ(service.stop(), 0U);
    queue.drain();
    EXPECT_EQ(events.take().size(), arrives ? 1U : 0U);
}

TEST_P(FaultTest, EndsInTheDocumentedAnswers) {
    const Strike strike = std::get<Strike>(GetParam());
    const Step step = std::get<Step>(GetParam());
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    const LeakCheck leaks;
    {
        const auto device = std::make_shared<StruckDevice>();
        device->scripted.setPropertyValue("Product", "surface");
        device->scripted.setFeatureReport(4, {4, 1, 2});
        const Vexa::DeviceRegistration registration(device);
        EventCollector events;
        const Vexa::SerialQueue queue("events");
        liveThrough(step, answersAfter(strike), plugin, *device, registration.service(), queue,
                    events, [&] {
                        device->strike(strike);
                        expectAnswers(answersAfter(strike), registration.service());
                    });
        EXPECT_EQ(device->leftOpen(), 0);
    }
    leaks.expectNothingLeft();
}

TEST_F(ServiceLifecycleTest, AFailedOpenLetsTheRestOfTheLifeGoOn) {
    stand.device->setNextOpenStatuses({VEXA_STATUS_IO_ERROR});
    EXPECT_THROW(stand.startUp(), std::runtime_error);
    EXPECT_FALSE(stand.device->sendReport(firmwareReport(0)));
    EXPECT_TRUE(stand.service.open());
    EXPECT_TRUE(stand.feed({firmwareReport(0)}));
    EXPECT_EQ(stand.events.take().size(), 1U);
    stand.tearDown();
}

/// The device goes while one of its operations runs.
class UnplugInTheMiddleTest : public testing::TestWithParam<std::string_view> {};

INSTANTIATE_TEST_SUITE_P(Of, UnplugInTheMiddleTest,
                         testing::Values(ScriptedDevice::kOpen, ScriptedDevice::kClose,
                                         ScriptedDevice::kGetReport, ScriptedDevice::kProperty,
                                         ScriptedDevice::kSetProperty,
                                         ScriptedDevice::kReportHandled),
                         [](const auto& operation) { return std::string(operation.param); });

/// Lives until the device has gone in `operation`.
void liveWithUnplugIn(std::string_view operation) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    stand.device->setFeatureReport(4, {4, 1, 2});
    stand.device->setHook([&](std::string_view running) {
        if (running == operation) stand.device->unplug();
    });
    const ServiceUnderTest& service = stand.service;
    ASSERT_EQ(service.start(stand.registration.service()), 0U);
    service.setEventCallback(&EventCollector::callback, &stand.events, nullptr);
    service.schedule(stand.queue);
    static_cast<void>(service.open());
    if (stand.device->sendReport(firmwareReport(0))) {
        ASSERT_TRUE(stand.device->waitUntilHandled(1));
    }
    static_cast<void>(service.get("FirmwareVersion"));
    static_cast<void>(service.get("Product"));
    service.set("Product", 1);
    EXPECT_EQ(service.get("Version"), PropertyValue(PropertyValue::Array{13, 0, 0}));
    stand.tearDown();
    stand.queue.drain();
    EXPECT_EQ(service.references(), 2U);
    stand.device->setHook({});
}

TEST_P(UnplugInTheMiddleTest, TheLifeEndsInOrderAndLeavesNothing) {
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    const LeakCheck leaks;
    liveWithUnplugIn(GetParam());
    leaks.expectNothingLeft();
}

/// A life that ends with one descriptor more than it began with.
void loseADescriptor() {
    const LeakCheck leaks;
    const int lost = ::open("/dev/null", O_RDONLY | O_CLOEXEC);
    leaks.expectNothingLeft();
    ::close(lost);
}

TEST(LeakCheckTest, ALostDescriptorIsFound) {
    EXPECT_NONFATAL_FAILURE(loseADescriptor(), "descriptors");
}

}  // namespace
}  // namespace VexaTouch::Testing
