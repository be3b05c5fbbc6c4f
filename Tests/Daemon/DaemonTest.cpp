#include "Tools/Daemon/Daemon.h"

#include "Platform/Json.h"
#include "Platform/ScriptedDevice.h"
#include "Shared/InputReport.h"
#include "Tests/Daemon/DaemonUnderTest.h"
#include "Tests/Support/Touch.h"
#include "Tests/Tools/VexatouchProgram.h"
#include "Tools/Daemon/BusNames.h"
#include "Tools/Daemon/PropertyRules.h"
#include "Tools/EventRecord.h"
#include "Tools/Failure.h"
#include "Tools/ForwardingDevice.h"
#include "Tools/FrameFeed.h"
#include "Tools/ObservedDevice.h"

#include <gmock/gmock.h>

#include <fcntl.h>
#include <grp.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <fstream>
#include <future>
#include <limits>
#include <map>
#include <memory>
#include <optional>
#include <semaphore>
#include <span>
#include <sstream>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using Tools::Failure;
using Tools::FileDescriptor;
using Tools::Daemon::Bus;
using Tools::Daemon::BusError;
using Tools::Daemon::BusMessage;
using Tools::Daemon::DaemonClient;
using Vexa::PropertyValue;
namespace BusNames = Tools::Daemon::BusNames;

constexpr const char* kActivation = "Pipeline.Algs.ActivationThreshold";
constexpr const char* kHoldTimeout = "Pipeline.Algs.HoldTimeoutMilliseconds";
/// In the example "taps".
constexpr std::uint64_t kReportsOfTaps = 112;
constexpr uid_t kStranger = 65534;

std::string readToEnd(const FileDescriptor& file) {
    std::string text;
    std::array<char, 4096> piece{};
    for (ssize_t got = 0; (got = ::read(file.get(), piece.data(), piece.size())) > 0;) {
        text.append(piece.data(), static_cast<std::size_t>(got));
    }
    return text;
}

/// What a failing operation says; empty when it does not fail.
template <typename Operation>
std::string failureOf(Operation&& operation) {
    try {
        operation();
    } catch (const Failure& error) {
        return error.what();
    }
    return {};
}

class DaemonTest : public ::testing::Test {
protected:
    void SetUp() override {
        if (!PrivateBus::isThere()) {
            GTEST_SKIP() << PrivateBus::kProgram << " is missing: script/bootstrap installs it";
        }
        bus.emplace();
        setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1);
    }
    ~DaemonTest() override { unsetenv("VEXATOUCH_PLUGIN"); }

    /// Starts the daemon with one surface, which is number 1, and waits until it runs.
    void start(const std::string& device = example("taps"),
               Tools::Daemon::RightsPolicy rights = DaemonUnderTest::rightsOfThisUser()) {
        daemon.emplace(bus->address(), std::move(rights));
        client.emplace(bus->address());
        daemon->source.plug(playedSurface("7", device));
        waitForState(1, "running");
    }
    void waitForState(unsigned number, const std::string& state) {
        while (true) {
            for (const auto& device : client->devices()) {
                if (device.number == number &&
                    device.properties.member("State").asString().value_or("") == state) {
                    return;
                }
            }
        }
    }
    /// Until the surface has sent so many reports.
    void waitForReports(unsigned number, std::uint64_t reports) {
        while (client->statistics(BusNames::devicePath(number)).member("Reports").toUnsigned64() <
               reports) {
        }
    }

    std::optional<PrivateBus> bus;
    std::optional<DaemonUnderTest> daemon;
    std::optional<DaemonClient> client;
    const std::string first = BusNames::devicePath(1);
};

TEST_F(DaemonTest, GivesEachPropertyWithItsType) {
    start();
    waitForReports(1, kReportsOfTaps);
    EXPECT_EQ(client->get(first, kHoldTimeout), PropertyValue(500U));
    const PropertyValue threshold = client->get(first, "Pipeline.Algs.ActivationThreshold");
    EXPECT_EQ(threshold.type(), PropertyValue::Type::Float);
    EXPECT_EQ(threshold, PropertyValue(200.0F));
    EXPECT_EQ(client->get(first, "Pipeline.Algs.EnableTapSuppression"), PropertyValue(true));
    EXPECT_EQ(client->get(first, "Version"), PropertyValue(PropertyValue::Array{13, 0, 0}));
    EXPECT_EQ(client->get(first, "Pipeline.Algs.VirtualNormalizationFactors.22").type(),
              PropertyValue::Type::Float);
    EXPECT_EQ(client->get(first, "SerialNumber").type(), PropertyValue::Type::String);
    const PropertyValue debug = client->get(first, "ServicePluginDebug");
    EXPECT_EQ(debug.member("Recording"), PropertyValue(client->recording(first)));
}

TEST_F(DaemonTest, AKeyThatNothingKnowsIsRefusedByName) {
    start();
    for (const char* key :
         {"", "Bogus", "Pipeline", "Pipeline.Bogus", "Pipeline.Algs.", "Pipeline.Algs.Bogus",
          "Pipeline.Algs.ResetEventStats", "Pipeline.Algs.VirtualNormalizationFactors",
          "Pipeline.Algs.VirtualNormalizationFactors.23",
          "Pipeline.Algs.VirtualNormalizationFactors.-1",
          "Pipeline.Algs.VirtualNormalizationFactors. 1",
          "Pipeline.Algs.VirtualNormalizationFactors.01",
          "Pipeline.Algs.VirtualNormalizationFactors.99999999999999999999999"}) {
        EXPECT_THAT(failureOf([&] { static_cast<void>(client->get(first, key)); }),
                    HasSubstr("(org.vexatouch.Touch1.Error.UnknownKey)"))
            << key;
    }
    EXPECT_THAT(
        failureOf([&] { static_cast<void>(client->get(first, std::string(1'000'000, 'k'))); }),
        HasSubstr("UnknownKey"));
}

/// Answers no request for a report.
class RefusingDevice final : public Tools::ForwardingDevice {
public:
    using ForwardingDevice::ForwardingDevice;
    vexa_status getReport(vexa_report_type, std::uint32_t, std::span<std::uint8_t>,
                          std::size_t&) noexcept override {
        return VEXA_STATUS_IO_ERROR;
    }
};

TEST_F(DaemonTest, ADeviceThatRefusesAReportIsNotAKeyThatNothingKnows) {
    start();
    auto surface = playedSurface("8", example("taps"));
    surface.open = [open = surface.open] { return std::make_shared<RefusingDevice>(open()); };
    daemon->source.plug(surface);
    waitForState(2, "running");
    const std::string second = BusNames::devicePath(2);
    for (const char* key : {"FirmwareVersion", "FactoryResetHoldDuration", "CriticalErrors"}) {
        EXPECT_TRUE(client->get(first, key)) << key;
        EXPECT_THAT(failureOf([&] { static_cast<void>(client->get(second, key)); }),
                    AllOf(HasSubstr("(org.vexatouch.Touch1.Error.Failed)"),
                          HasSubstr(std::string(key) + ": the device gives no value: ")));
    }
    EXPECT_THAT(failureOf([&] { static_cast<void>(client->get(second, "Bogus")); }),
                HasSubstr("(org.vexatouch.Touch1.Error.UnknownKey)"));
}

TEST_F(DaemonTest, ASettingIsTakenAndReadBack) {
    start();
    EXPECT_EQ(client->set(first, kHoldTimeout, 300), PropertyValue(300U));
    EXPECT_EQ(client->get(first, kHoldTimeout), PropertyValue(300U));
    EXPECT_EQ(client->set(first, kActivation, 150.5), PropertyValue(150.5F));
    EXPECT_EQ(client->set(first, "Pipeline.Algs.ResetEventStats", true).type(),
              PropertyValue::Type::None);
    EXPECT_EQ(client->set(first, "Product", "Mine"), PropertyValue("Mine"));
}

TEST_F(DaemonTest, WhatIsNoSettingIsNotTakenAndNotRecorded) {
    start();
    waitForReports(1, kReportsOfTaps);
    const std::string before = client->recording(first);
    struct Case {
        std::string key;
        PropertyValue value;
        const char* error;
    };
    const std::vector<Case> cases = {
        {kHoldTimeout, "soon", "InvalidValue"},
        {kHoldTimeout, PropertyValue::null(), "InvalidValue"},
        {kHoldTimeout, PropertyValue::Array{1}, "InvalidValue"},
        {kHoldTimeout, PropertyValue(), "InvalidValue"},
        {kActivation, std::numeric_limits<double>::infinity(), "InvalidValue"},
        {kActivation, -std::numeric_limits<float>::infinity(), "InvalidValue"},
        {kActivation, std::numeric_limits<double>::quiet_NaN(), "InvalidValue"},
        {kActivation, 1e39, "InvalidValue"},
        {"Pipeline.Algs.EventStats", 1, "ReadOnly"},
        {"Pipeline.DebugInfo", 1, "ReadOnly"},
        {"Version", 1, "ReadOnly"},
        {"Recording", "x", "ReadOnly"},
        {"Pipeline.Algs.Bogus", 1, "UnknownKey"},
        {"Pipeline.Algs.VirtualNormalizationFactors.1 ", 1, "UnknownKey"},
        {"Colour", "grey", "UnknownKey"},
        {"Product", std::string(20'000, 'x'), "InvalidValue"},
        {std::string(200, 'k'), 1, "UnknownKey"},
    };
    for (const Case& each : cases) {
        EXPECT_THAT(failureOf([&] { client->set(first, each.key, each.value); }),
                    HasSubstr(std::string("(org.vexatouch.Touch1.Error.") + each.error))
            << each.key;
    }
    EXPECT_EQ(client->recording(first), before);
}

TEST_F(DaemonTest, TheRecordingIsAFileThatNobodyCanChange) {
    start();
    waitForReports(1, kReportsOfTaps);
    BusMessage reply = client->bus().ask(
        client->bus().call(BusNames::kService, first, BusNames::kDevice, "GetRecording"));
    const FileDescriptor file = reply.readDescriptor();
    EXPECT_EQ(::fcntl(file.get(), F_GET_SEALS),
              F_SEAL_SEAL | F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE);
    EXPECT_EQ(::ftruncate(file.get(), 0), -1);
    const std::string text = readToEnd(file);
    EXPECT_THAT(text, HasSubstr("\"Frames\""));
    EXPECT_EQ(text, client->recording(first));
}

TEST_F(DaemonTest, AStreamBeginsWithEverySettingAndHasEveryReport) {
    start("sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture");
    client->set(first, kHoldTimeout, 300);
    const FileDescriptor frames = client->recordStream(first);
    client->set(first, kHoldTimeout, 400);
    const std::uint64_t sent = 78;
    waitForReports(1, sent);
    daemon->source.unplug("7");
    std::vector<std::string> settings;
    std::vector<std::uint32_t> frameNumbers;
    std::optional<PropertyValue> firstTimeout;
    std::optional<PropertyValue> lastTimeout;
    Tools::FrameDecoder decoder(
        {.onFrame =
             [&](const RecordedFrame& frame) {
                 if (frame.type == RecordedFrame::Type::InputReport) {
                     const auto image =
                         InputReport::Image::parse(frame.report.data(), frame.report.size());
                     frameNumbers.push_back(image ? image->frameNumber : 0);
                     return;
                 }
                 settings.push_back(frame.key);
                 if (frame.key == "Algs.HoldTimeoutMilliseconds") {
                     firstTimeout = firstTimeout.value_or(frame.value);
                     lastTimeout = frame.value;
                 }
             },
         .onGap = [](const Tools::FrameGap&) { ADD_FAILURE() << "frames were lost"; }});
    const std::string bytes = readToEnd(frames);  // ends with the surface
    decoder.write({reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size()});
    EXPECT_TRUE(decoder.isBetweenFrames());
    EXPECT_THAT(settings, SizeIs(4 + 23 + 1));
    EXPECT_EQ(firstTimeout, PropertyValue(300));
    EXPECT_EQ(lastTimeout, PropertyValue(400));
    ASSERT_FALSE(frameNumbers.empty());
    for (std::size_t i = 1; i < frameNumbers.size(); ++i) {
        EXPECT_EQ(frameNumbers[i], frameNumbers[0] + i);
    }
}

TEST_F(DaemonTest, TheEndWaitsForWhoReadsAStream) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    daemon->source.plug(playedSurface("7", "sim"));
    waitForState(1, "running");
    const FileDescriptor frames = client->recordStream(first);
    // Until there is no room left, neither in the socket nor with the daemon. Each setting takes a
    // frame as well.
    while (client->statistics(first).member("RecordReportsLost").toUnsigned64() == 0) {
        for (std::uint32_t i = 0; i < 200; ++i) {
            client->set(first, kHoldTimeout, 300 + i);
        }
    }
    auto ended = std::async(std::launch::async, [&] { daemon.reset(); });
    // The surface is gone, and more calls are answered than it takes to come to an end.
    std::string failed;
    for (int empty = 0; empty < 100 && failed.empty();) {
        failed = failureOf([&] { empty += client->devices().empty() ? 1 : 0; });
    }
    EXPECT_EQ(failed, "");
    auto bytes = std::async(std::launch::async, [&] { return readToEnd(frames); });
    ended.get();
    std::uint64_t lost = 0;
    Tools::FrameDecoder decoder(
        {.onFrame = [](const RecordedFrame&) {},
         .onGap = [&](const Tools::FrameGap& gap) { lost += gap.reports; }});
    const std::string read = bytes.get();
    decoder.write({reinterpret_cast<const std::uint8_t*>(read.data()), read.size()});
    EXPECT_TRUE(decoder.isAtEnd());
    EXPECT_GT(lost, 0U);
}

TEST_F(DaemonTest, AReaderThatIsTooSlowLosesFramesAndHoldsNobodyUp) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    daemon->source.plug(playedSurface("7", example("mixed")));
    waitForState(1, "running");
    const FileDescriptor frames = client->recordStream(first);
    daemon->source.plug(playedSurface("8", "sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture"));
    waitForState(2, "running");
    // A reader that reads nothing costs one stream; the others answer.
    EXPECT_EQ(client->get(first, kHoldTimeout), PropertyValue(500U));
    EXPECT_EQ(client->statistics(first).member("RecordStreams"), PropertyValue(1U));
    // Whoever opens too many is told so.
    std::vector<FileDescriptor> all;
    std::string refused;
    for (int i = 0; i < 16 && refused.empty(); ++i) {
        refused = failureOf([&] { all.push_back(client->recordStream(first)); });
    }
    EXPECT_THAT(refused, HasSubstr("(org.vexatouch.Touch1.Error.Busy)"));
    // And whoever leaves makes room.
    all.clear();
    while (client->statistics(first).member("RecordStreams").toUnsigned64() > 1) {
    }
    EXPECT_EQ(failureOf([&] { static_cast<void>(client->recordStream(first)); }), "");
}

TEST_F(DaemonTest, SignalsAreTheGesturesOfTheService) {
    daemon.emplace(bus->address());
    Tools::Daemon::EventLoop loop;
    Bus watcher(bus->address());
    std::vector<std::string> seen;
    const std::vector<Tools::EventRecord> expected =
        Tools::readExpectedEvents(VEXA_SOURCE_DIR "/Examples/holds.events");
    const auto slot = watcher.match(
        std::string("type='signal',interface='") + BusNames::kDevice + "',member='Gesture'",
        [&](BusMessage signal) {
            EXPECT_EQ(signal.path(), first);
            std::string text = signal.readString();
            for (int i = 0; i < 4; ++i) {
                text += ' ' + std::to_string(signal.readNumber32());
            }
            const std::uint64_t event = signal.readNumber64();
            EXPECT_GE(signal.readNumber64(), event);
            seen.push_back(text);
            if (seen.size() == expected.size()) {
                loop.stop();
            }
        });
    watcher.attach(loop, [&] { loop.stop(); });
    daemon->source.plug(playedSurface("7", example("holds")));
    loop.run();
    std::vector<std::string> wanted;
    for (const Tools::EventRecord& event : expected) {
        wanted.push_back(std::string(Tools::eventKindName(event.kind)) + ' ' +
                         std::to_string(event.region) + ' ' + std::to_string(event.phase) + ' ' +
                         std::to_string(event.mask) + ' ' + std::to_string(event.frame));
    }
    EXPECT_EQ(seen, wanted);
}

TEST_F(DaemonTest, ASurfaceThatComesBackHasItsSettings) {
    start();
    client->set(first, kHoldTimeout, 300);
    daemon->source.unplug("7");
    while (!client->devices().empty()) {
    }
    EXPECT_THAT(failureOf([&] { static_cast<void>(client->get(first, kHoldTimeout)); }),
                HasSubstr("UnknownObject"));
    auto again = playedSurface("9", example("taps"));
    again.serial = "serial 7";
    daemon->source.plug(again);
    waitForState(2, "running");
    daemon->source.plug(playedSurface("10", example("taps")));
    waitForState(3, "running");
    EXPECT_EQ(client->get(BusNames::devicePath(2), kHoldTimeout), PropertyValue(300U));
    EXPECT_EQ(client->get(BusNames::devicePath(3), kHoldTimeout), PropertyValue(500U));
    // What it had before they were set.
    client->bus().ask(client->bus().call(BusNames::kService, BusNames::devicePath(2),
                                         BusNames::kDevice, "Reset"));
    EXPECT_EQ(client->get(BusNames::devicePath(2), kHoldTimeout), PropertyValue(500U));
    daemon->stop();
    EXPECT_EQ(daemon->log(),
              "surface 1, /dev/hidraw7, Surface 7: running\n"
              "surface 1, /dev/hidraw7, Surface 7: unplugged\n"
              "surface 2, /dev/hidraw9, Surface 9: running\n"
              "surface 3, /dev/hidraw10, Surface 10: running\n");
}

TEST_F(DaemonTest, TwoSurfacesWithOneSerialNumberHaveTheirOwnSettings) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    const auto twin = [](const std::string& id) {
        auto surface = playedSurface(id, example("taps"));
        surface.serial = "0000";
        return surface;
    };
    daemon->source.plug(twin("7"));
    daemon->source.plug(twin("8"));
    waitForState(1, "running");
    waitForState(2, "running");
    client->set(first, kHoldTimeout, 300);
    daemon->source.unplug("7");
    daemon->source.unplug("8");
    daemon->source.plug(twin("8"));
    daemon->source.plug(twin("7"));
    waitForState(3, "running");
    waitForState(4, "running");
    EXPECT_EQ(client->get(BusNames::devicePath(3), kHoldTimeout), PropertyValue(500U));
    EXPECT_EQ(client->get(BusNames::devicePath(4), kHoldTimeout), PropertyValue(300U));
}

TEST_F(DaemonTest, ASurfaceWithoutASerialNumberHasTheSettingsOfItsPlace) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    const auto nameless = [](const std::string& id) {
        auto surface = playedSurface(id, example("taps"));
        surface.serial.clear();
        return surface;
    };
    daemon->source.plug(nameless("7"));
    waitForState(1, "running");
    client->set(first, kHoldTimeout, 300);
    daemon->source.unplug("7");
    daemon->source.plug(nameless("8"));
    daemon->source.plug(nameless("7"));
    waitForState(2, "running");
    waitForState(3, "running");
    EXPECT_EQ(client->get(BusNames::devicePath(2), kHoldTimeout), PropertyValue(500U));
    EXPECT_EQ(client->get(BusNames::devicePath(3), kHoldTimeout), PropertyValue(300U));
}

/// A device whose feature reports are answered one by one, each once it is allowed.
class GatedDevice final : public Tools::ForwardingDevice {
public:
    using ForwardingDevice::ForwardingDevice;

    std::counting_semaphore<> asked{0};
    std::counting_semaphore<> allowed{0};
    std::atomic<int> requests = 0;

    vexa_status getReport(vexa_report_type type, std::uint32_t reportId,
                          std::span<std::uint8_t> report, std::size_t& length) noexcept override {
        ++requests;
        asked.release();
        allowed.acquire();
        return ForwardingDevice::getReport(type, reportId, report, length);
    }
};

class DaemonGatedTest : public DaemonTest {
protected:
    /// Tells when each surface has been taken down.
    class Leaver final : public Tools::Daemon::EventListener {
    public:
        explicit Leaver(std::counting_semaphore<>& gone) : gone_(gone) {}
        void handle(const Vexa::HidEvent&) noexcept override {}
        void surfaceEnding() noexcept override {}
        void surfaceGone() noexcept override { gone_.release(); }

    private:
        std::counting_semaphore<>& gone_;
    };

    /// Starts the daemon with one such surface.
    std::shared_ptr<GatedDevice> startGated() {
        daemon.emplace(bus->address(), DaemonUnderTest::rightsOfThisUser(),
                       [this] { return std::make_unique<Leaver>(gone); });
        client.emplace(bus->address());
        auto surface = playedSurface("7", example("taps"));
        const auto gated = std::make_shared<GatedDevice>(surface.open());
        surface.open = [gated] { return gated; };
        daemon->source.plug(surface);
        waitForState(1, "running");
        return gated;
    }
    // Before what it tells.
    ~DaemonGatedTest() override { daemon.reset(); }

    std::counting_semaphore<> gone{0};
};

/// More than any test asks.
constexpr int kAll = 1000;

TEST_F(DaemonGatedTest, ASettingThatWasUnderWayAtTheUnplugIsInForceAfterwards) {
    const auto gated = startGated();
    Tools::Daemon::EventLoop loop;
    Bus caller(bus->address());
    const auto failed = [&](const BusError& error) {
        ADD_FAILURE() << error.what();
        loop.stop();
    };
    BusMessage get = caller.call(BusNames::kService, first, BusNames::kDevice, "Get");
    get.string("FirmwareVersion");
    const auto firmware = caller.askLater(get, [](const BusMessage&) {}, failed);
    BusMessage set = caller.call(BusNames::kService, first, BusNames::kDevice, "Set");
    set.string(kHoldTimeout).value(300);
    const auto taken = caller.askLater(set, [&](const BusMessage&) { loop.stop(); }, failed);
    // Both have been asked for when the one behind them is answered.
    static_cast<void>(caller.ask(caller.call(BusNames::kService, BusNames::kManagerPath,
                                             BusNames::kManager, "ListDevices")));
    gated->asked.acquire();
    daemon->source.unplug("7");
    while (!client->devices().empty()) {
    }
    gated->allowed.release(kAll);
    caller.attach(loop, [&] { loop.stop(); });
    loop.run();
    gone.acquire();
    daemon->source.plug(playedSurface("7", example("taps")));
    waitForState(2, "running");
    EXPECT_EQ(client->get(BusNames::devicePath(2), kHoldTimeout), PropertyValue(300U));
}

TEST_F(DaemonGatedTest, WhatWasSetSinceASurfaceIsBackOutlivesWhatWasUnderWay) {
    const auto gated = startGated();
    Bus caller(bus->address());
    BusMessage get = caller.call(BusNames::kService, first, BusNames::kDevice, "Get");
    get.string("FirmwareVersion");
    ASSERT_TRUE(caller.send(get));
    BusMessage set = caller.call(BusNames::kService, first, BusNames::kDevice, "Set");
    set.string(kHoldTimeout).value(300);
    ASSERT_TRUE(caller.send(set));
    // Both have been asked for when the one behind them is answered.
    static_cast<void>(caller.ask(caller.call(BusNames::kService, BusNames::kManagerPath,
                                             BusNames::kManager, "ListDevices")));
    gated->asked.acquire();
    daemon->source.unplug("7");
    daemon->source.plug(playedSurface("7", example("taps")));
    waitForState(2, "running");
    client->set(BusNames::devicePath(2), kHoldTimeout, 400);
    daemon->source.unplug("7");
    while (!client->devices().empty()) {
    }
    // The second one.
    gone.acquire();
    gated->allowed.release(kAll);
    gone.acquire();
    daemon->source.plug(playedSurface("7", example("taps")));
    waitForState(3, "running");
    EXPECT_EQ(client->get(BusNames::devicePath(3), kHoldTimeout), PropertyValue(400U));
}

TEST_F(DaemonGatedTest, TheEndWaitsForNoMoreThanTheRequestThatIsUnderWay) {
    const auto gated = startGated();
    constexpr std::size_t kCalls = 6;
    Bus caller(bus->address());
    Tools::Daemon::EventLoop loop;
    std::vector<std::string> answers;
    std::vector<Tools::Daemon::BusSlot> slots;
    const auto count = [&](const std::string& answer) {
        answers.push_back(answer);
        if (answers.size() == kCalls) {
            loop.stop();
        }
    };
    for (std::size_t i = 0; i < kCalls; ++i) {
        BusMessage get = caller.call(BusNames::kService, first, BusNames::kDevice, "Get");
        get.string("FirmwareVersion");
        slots.push_back(caller.askLater(
            get, [&](const BusMessage&) { count("answered"); },
            [&](const BusError& error) { count(error.name() + ": " + error.what()); }));
    }
    // All have been asked for when the one behind them is answered.
    static_cast<void>(caller.ask(caller.call(BusNames::kService, BusNames::kManagerPath,
                                             BusNames::kManager, "ListDevices")));
    gated->asked.acquire();
    std::promise<void> ended;
    daemon->call([&](Tools::Daemon::Daemon& under) { under.end([&] { ended.set_value(); }); });
    gated->allowed.release(kAll);
    ended.get_future().get();
    EXPECT_EQ(gated->requests, 1);
    caller.attach(loop, [&] { loop.stop(); });
    loop.run();
    std::vector<std::string> wanted(kCalls, std::string(Tools::Daemon::ErrorName::kNotRunning) +
                                                ": the surface is being taken down");
    wanted.front() = "answered";
    EXPECT_EQ(answers, wanted);
}

TEST_F(DaemonTest, TheServiceCountsTheSameGaps) {
    start(example("mixed"));
    waitForReports(1, 1234);
    const PropertyValue statistics = client->statistics(first);
    EXPECT_EQ(statistics.member("Gaps"), PropertyValue(2U));
    EXPECT_EQ(statistics.member("FramesLost"), PropertyValue(4U));
    EXPECT_EQ(statistics.member("DisjointImageCount"), PropertyValue(2U));
    EXPECT_TRUE(statistics.member("EventStats").asDictionary());
}

TEST_F(DaemonTest, LostFramesAreToldWhenTheyAreMissedAndAtTheEnd) {
    LogOfLines log;
    std::ostream stream(&log);
    const auto sent = [](std::uint32_t number) { return imageReport(Samples(), number, 0); };
    for (const bool often : {false, true}) {
        daemon.emplace(
            bus->address(),
            Tools::Daemon::DaemonOptions{
                .rights = DaemonUnderTest::rightsOfThisUser(),
                .times = {.betweenGaps = often ? std::chrono::hours(0) : std::chrono::hours(100)},
            },
            VEXATOUCH_PLUGIN_FILE, &stream);
        client.emplace(bus->address());
        const auto device = std::make_shared<Vexa::ScriptedDevice>();
        auto surface = playedSurface("7", example("taps"));
        surface.open = [device] { return device; };
        daemon->source.plug(surface);
        waitForState(1, "running");
        ASSERT_TRUE(device->sendReport(sent(1)));
        ASSERT_TRUE(device->sendReport(sent(3)));
        log.waitFor(": so far 1 gap, 1 frame lost\n");
        ASSERT_TRUE(device->sendReport(sent(13)));
        if (often) {
            log.waitFor(": so far 2 gaps, 10 frames lost\n");
        }
        waitForReports(1, 3);
        daemon->source.unplug("7");
        while (!client->devices().empty()) {
        }
        daemon->stop();
        EXPECT_EQ(log.take(),
                  "surface 1, /dev/hidraw7, Surface 7: running\n"
                  "surface 1, /dev/hidraw7, Surface 7: so far 1 gap, 1 frame lost\n" +
                      std::string(often ? "surface 1, /dev/hidraw7, Surface 7: so far 2 gaps, 10 "
                                          "frames lost\n"
                                        : "") +
                      "surface 1, /dev/hidraw7, Surface 7: unplugged\n" +
                      (often ? ""
                             : "surface 1, /dev/hidraw7, Surface 7: in all 2 gaps, 10 frames "
                               "lost\n"));
    }
}

/// A device that can be unplugged.
class LiveDevice final : public Tools::ForwardingDevice {
public:
    using ForwardingDevice::ForwardingDevice;

    Vexa::PropertyValue property(const Vexa::PropertyValue& key) noexcept override {
        return key.asString() == Tools::ObservedDevice::kReadsOnKey
                   ? PropertyValue(true)
                   : ForwardingDevice::property(key);
    }
};

/// A surface whose input thread is held once it has handled the first report.
class HeldInputThread {
public:
    HeldInputThread() {
        device->setHook([this, isFirst = true](std::string_view operation) mutable {
            if (operation == Vexa::ScriptedDevice::kReportHandled &&
                std::exchange(isFirst, false)) {
                held_.set_value();
                allowed_.get_future().get();
            }
        });
    }

    [[nodiscard]] Tools::Daemon::PluggedSurface surface() const {
        auto plugged = playedSurface("7", example("taps"));
        plugged.open = [device = device] { return std::make_shared<LiveDevice>(device); };
        return plugged;
    }
    void waitUntilHeld() { held_.get_future().get(); }
    void letGo() { allowed_.set_value(); }

    const std::shared_ptr<Vexa::ScriptedDevice> device = std::make_shared<Vexa::ScriptedDevice>();

private:
    std::promise<void> held_;
    std::promise<void> allowed_;
};

TEST_F(DaemonTest, WhatWasSentJustBeforeTheUnplugIsTaken) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    HeldInputThread held;
    const auto& device = held.device;
    daemon->source.plug(held.surface());
    waitForState(1, "running");
    constexpr std::uint64_t kReports = 60;
    for (std::uint64_t i = 0; i < kReports; ++i) {
        ASSERT_TRUE(device->sendReport(std::vector<std::uint8_t>{9}));
    }
    held.waitUntilHeld();
    device->unplug();
    daemon->source.unplug("7");
    while (!client->devices().empty()) {
    }
    held.letGo();
    EXPECT_TRUE(device->waitUntilHandled(kReports));
}

/// A device that tells on which thread it is closed for good.
class ClosedSomewhere final : public Tools::ForwardingDevice {
public:
    ClosedSomewhere(std::shared_ptr<Vexa::DeviceBackend> device,
                    std::promise<std::thread::id>& closed) noexcept
        : ForwardingDevice(std::move(device)), closed_(closed) {}
    ~ClosedSomewhere() override { closed_.set_value(std::this_thread::get_id()); }
    ClosedSomewhere(const ClosedSomewhere&) = delete;
    ClosedSomewhere(ClosedSomewhere&&) = delete;
    ClosedSomewhere& operator=(const ClosedSomewhere&) = delete;
    ClosedSomewhere& operator=(ClosedSomewhere&&) = delete;

private:
    std::promise<std::thread::id>& closed_;
};

/// The kernel lets nobody close a node while a feature request of any other is pending.
TEST_F(DaemonTest, TheLoopClosesNoDeviceItself) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    std::thread::id loop;
    daemon->call([&](Tools::Daemon::Daemon&) { loop = std::this_thread::get_id(); });
    for (const bool opens : {true, false}) {
        auto surface = playedSurface("7", example("taps"));
        std::promise<std::thread::id> closed;
        surface.open = [opens, &closed, open = surface.open] {
            auto device = std::make_shared<ClosedSomewhere>(open(), closed);
            if (!opens) {
                throw Failure("gone again");
            }
            return device;
        };
        daemon->source.plug(surface);
        waitForState(opens ? 1 : 2, opens ? "running" : "failed");
        daemon->source.unplug("7");
        EXPECT_NE(closed.get_future().get(), loop);
    }
}

/// Writes down what it is told.
class Witness final : public Tools::Daemon::EventListener {
public:
    struct Notes {
        std::promise<void> ending;
        std::promise<void> gone;
        std::atomic<int> events = 0;
        std::atomic<int> eventsAtEnding = 0;
    };

    explicit Witness(Notes& notes) : notes_(notes) {}

    void handle(const Vexa::HidEvent&) noexcept override { ++notes_.events; }
    void surfaceEnding() noexcept override {
        notes_.eventsAtEnding = notes_.events.load();
        notes_.ending.set_value();
    }
    void surfaceGone() noexcept override { notes_.gone.set_value(); }

private:
    Notes& notes_;
};

TEST_F(DaemonTest, TheUnplugIsToldBeforeTheLastReportsAndTheirGesturesComeAllTheSame) {
    Witness::Notes notes;
    daemon.emplace(bus->address(), DaemonUnderTest::rightsOfThisUser(),
                   [&] { return std::make_unique<Witness>(notes); });
    client.emplace(bus->address());
    HeldInputThread held;
    const auto& device = held.device;
    daemon->source.plug(held.surface());
    waitForState(1, "running");
    ASSERT_TRUE(device->sendReport(std::vector<std::uint8_t>{9}));
    held.waitUntilHeld();
    std::vector<std::uint8_t> reset(10);
    reset[0] = 2;
    ASSERT_TRUE(device->sendReport(reset));
    device->unplug();
    daemon->source.unplug("7");
    notes.ending.get_future().get();
    EXPECT_EQ(notes.eventsAtEnding, 0);
    held.letGo();
    notes.gone.get_future().get();
    EXPECT_EQ(notes.events, 1);
}

/// What is written and told on the daemon's thread, in its order.
class Sequence final : public std::stringbuf {
public:
    class Listener final : public Tools::Daemon::EventListener {
    public:
        explicit Listener(Sequence& sequence) : sequence_(sequence) {}
        void handle(const Vexa::HidEvent&) noexcept override {}
        void surfaceEnding() noexcept override { sequence_.add("let go"); }
        void surfaceGone() noexcept override { sequence_.add("gone"); }

    private:
        Sequence& sequence_;
    };

    void add(const std::string& what) { seen_.push_back(what); }
    [[nodiscard]] const std::vector<std::string>& seen() const { return seen_; }

protected:
    int sync() override {
        add(str());
        str("");
        return 0;
    }

private:
    std::vector<std::string> seen_;
};

/// Whoever does not read the log holds up no release.
TEST_F(DaemonTest, WhatIsHeldIsLetGoOfBeforeALineIsWritten) {
    Sequence sequence;
    std::ostream log(&sequence);
    daemon.emplace(bus->address(),
                   Tools::Daemon::DaemonOptions{
                       .rights = DaemonUnderTest::rightsOfThisUser(),
                       .listener = [&] { return std::make_unique<Sequence::Listener>(sequence); },
                   },
                   VEXATOUCH_PLUGIN_FILE, &log);
    client.emplace(bus->address());
    daemon->source.plug(playedSurface("7", example("taps")));
    waitForState(1, "running");
    daemon->source.unplug("7");
    while (!client->devices().empty()) {
    }
    auto broken = playedSurface("8", example("taps"));
    broken.open = []() -> std::shared_ptr<Vexa::DeviceBackend> { throw Failure("no permission"); };
    daemon->source.plug(broken);
    waitForState(2, "failed");
    daemon->source.plug(playedSurface("9", example("taps")));
    waitForState(3, "running");
    daemon->stop();
    std::vector<std::string> seen = sequence.seen();
    // Of the first one this may come at any time.
    const auto gone = std::ranges::find(seen, "gone");
    ASSERT_NE(gone, seen.end());
    seen.erase(gone);
    EXPECT_THAT(seen, ElementsAre("surface 1, /dev/hidraw7, Surface 7: running\n", "let go",
                                  "surface 1, /dev/hidraw7, Surface 7: unplugged\n", "let go",
                                  "surface 2, /dev/hidraw8, Surface 8: no permission\n",
                                  "surface 3, /dev/hidraw9, Surface 9: running\n", "let go",
                                  "let go", "gone", "gone"));
}

TEST_F(DaemonTest, ASurfaceThatCannotBeOpenedSaysWhy) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    auto broken = playedSurface("7", example("taps"));
    broken.open = []() -> std::shared_ptr<Vexa::DeviceBackend> {
        throw Failure("/dev/hidraw7: no permission");
    };
    daemon->source.plug(broken);
    waitForState(1, "failed");
    EXPECT_EQ(client->devices().front().properties.member("Reason"),
              PropertyValue("/dev/hidraw7: no permission"));
    for (const char* key : {kHoldTimeout, "Recording"}) {
        EXPECT_THAT(failureOf([&] { static_cast<void>(client->get(first, key)); }),
                    AllOf(HasSubstr("no permission"), HasSubstr("NotRunning")));
    }
    EXPECT_THAT(failureOf([&] { static_cast<void>(client->recordStream(first)); }),
                HasSubstr("NotRunning"));
    EXPECT_EQ(client->statistics(first).member("Reports"), PropertyValue(0U));
}

TEST_F(DaemonTest, ASurfaceWithoutAnInputThreadHasFailed) {
    daemon.emplace(bus->address(),
                   Tools::Daemon::DaemonOptions{
                       .rights = DaemonUnderTest::rightsOfThisUser(),
                       .times = {.patience = std::chrono::milliseconds(1)},
                   },
                   VEXATOUCH_SAMPLE_PLUGINS "/TakesNoReports.so");
    client.emplace(bus->address());
    daemon->source.plug(playedSurface("7", example("taps")));
    waitForState(1, "failed");
    EXPECT_THAT(client->devices().front().properties.member("Reason").asString().value_or(""),
                HasSubstr("input thread did not start"));
}

/// A device that can tell its input thread to end.
class EndedInputThread final : public Tools::ForwardingDevice {
public:
    using ForwardingDevice::ForwardingDevice;

    void scheduled(const Vexa::RunLoop& loop, const char* mode) noexcept override {
        ForwardingDevice::scheduled(loop, mode);
        if (loop && !std::exchange(isKnown_, true)) {
            loop_.set_value(loop);
        }
    }
    /// Once.
    void end() { loop_.get_future().get().stop(); }

private:
    bool isKnown_ = false;  // the input thread's
    std::promise<Vexa::RunLoop> loop_;
};

TEST_F(DaemonTest, ASurfaceWhoseInputThreadEndsHasFailedAndIsTakenDown) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    auto surface = playedSurface("7", example("taps"));
    const auto open = surface.open;
    const auto device = std::make_shared<EndedInputThread>(open());
    surface.open = [device] { return device; };
    daemon->source.plug(surface);
    waitForState(1, "running");
    waitForReports(1, kReportsOfTaps);
    device->end();
    waitForState(1, "failed");
    EXPECT_THAT(client->devices().front().properties.member("Reason").asString().value_or(""),
                HasSubstr("input thread did not start or has ended"));
    EXPECT_EQ(client->statistics(first).member("Reports"), PropertyValue(kReportsOfTaps));
    std::promise<void> answered;
    daemon->call([&](Tools::Daemon::Daemon& under) { under.ping([&] { answered.set_value(); }); });
    answered.get_future().get();
    // A device of its own, as a node that is opened anew: the first one may still be being closed.
    surface.open = open;
    daemon->source.touch(surface);
    waitForState(2, "running");
}

TEST_F(DaemonTest, ASurfaceThatFailedIsBegunAnewWhenThereIsNewsOfIt) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    std::atomic<bool> permitted = false;
    auto surface = playedSurface("7", example("taps"));
    surface.open = [&permitted, open = surface.open]() -> std::shared_ptr<Vexa::DeviceBackend> {
        if (!permitted) {
            throw Failure("/dev/hidraw7: no permission");
        }
        return open();
    };
    daemon->source.plug(surface);
    waitForState(1, "failed");
    daemon->source.touch(surface);
    waitForState(2, "failed");
    permitted = true;
    daemon->source.touch(surface);
    waitForState(3, "running");
    // One that runs is left alone.
    client->set(BusNames::devicePath(3), kHoldTimeout, 300);
    daemon->source.touch(surface);
    daemon->source.plug(playedSurface("8", example("taps")));
    waitForState(4, "running");
    EXPECT_THAT(client->devices(), SizeIs(2));
    EXPECT_EQ(client->get(BusNames::devicePath(3), kHoldTimeout), PropertyValue(300U));
    daemon->stop();
    EXPECT_EQ(daemon->log(),
              "surface 1, /dev/hidraw7, Surface 7: /dev/hidraw7: no permission\n"
              "surface 2, /dev/hidraw7, Surface 7: /dev/hidraw7: no permission\n"
              "surface 3, /dev/hidraw7, Surface 7: running\n"
              "surface 4, /dev/hidraw8, Surface 8: running\n");
}

TEST_F(DaemonTest, NewsOfASurfaceThatIsStartingCountsWhenItFails) {
    daemon.emplace(bus->address());
    client.emplace(bus->address());
    auto surface = playedSurface("7", example("taps"));
    std::promise<void> opening;
    std::promise<void> refused;
    int opens = 0;
    surface.open = [&, open = surface.open]() -> std::shared_ptr<Vexa::DeviceBackend> {
        if (++opens > 1) {
            return open();
        }
        opening.set_value();
        refused.get_future().get();
        throw Failure("/dev/hidraw7: no permission");
    };
    daemon->source.plug(surface);
    opening.get_future().get();
    daemon->source.touch(surface);
    // What came before it has been taken as well.
    daemon->source.plug(playedSurface("8", example("taps")));
    waitForState(2, "running");
    refused.set_value();
    waitForState(3, "running");
    daemon->stop();
    EXPECT_EQ(daemon->log(),
              "surface 2, /dev/hidraw8, Surface 8: running\n"
              "surface 1, /dev/hidraw7, Surface 7: /dev/hidraw7: no permission\n"
              "surface 3, /dev/hidraw7, Surface 7: running\n");
}

TEST_F(DaemonTest, AFloodOfCallsIsAnsweredOrToldThatItIsTooMuch) {
    start();
    Tools::Daemon::EventLoop loop;
    Bus flood(bus->address());
    constexpr std::size_t kCalls = 2000;
    std::size_t answers = 0;
    std::size_t busy = 0;
    std::vector<Tools::Daemon::BusSlot> slots;
    const auto count = [&] {
        if (++answers == kCalls) {
            loop.stop();
        }
    };
    for (std::size_t i = 0; i < kCalls; ++i) {
        BusMessage call = flood.call(BusNames::kService, first, BusNames::kDevice, "Get");
        call.string("ServicePluginDebug");
        slots.push_back(flood.askLater(
            call, [&](BusMessage) { count(); },
            [&](const BusError& error) {
                EXPECT_EQ(error.name(), Tools::Daemon::ErrorName::kBusy);
                ++busy;
                count();
            }));
    }
    flood.attach(loop, [&] { loop.stop(); });
    loop.run();
    EXPECT_EQ(answers, kCalls);
    EXPECT_GT(busy, 0U);
    EXPECT_EQ(client->get(first, kHoldTimeout), PropertyValue(500U));
}

TEST_F(DaemonTest, EveryInputThreadAnswersAPing) {
    start();
    daemon->source.plug(playedSurface("8", example("taps")));
    waitForState(2, "running");
    std::promise<void> answered;
    daemon->call([&](Tools::Daemon::Daemon& under) { under.ping([&] { answered.set_value(); }); });
    answered.get_future().get();
    // Nobody to ask is no reason to be silent.
    daemon->source.unplug("7");
    daemon->source.unplug("8");
    std::promise<void> again;
    daemon->call([&](Tools::Daemon::Daemon& under) { under.ping([&] { again.set_value(); }); });
    again.get_future().get();
}

TEST_F(DaemonTest, TheManagerTellsOfWhatComesAndGoes) {
    daemon.emplace(bus->address());
    Tools::Daemon::EventLoop loop;
    Bus watcher(bus->address());
    std::vector<std::string> seen;
    const auto slot =
        watcher.match(std::string("type='signal',interface='") + BusNames::kManager + '\'',
                      [&](BusMessage signal) {
                          seen.push_back(signal.member() + ' ' + signal.readObjectPath());
                          if (seen.size() == 1) {
                              daemon->source.unplug("7");
                          } else {
                              loop.stop();
                          }
                      });
    watcher.attach(loop, [&] { loop.stop(); });
    daemon->source.plug(playedSurface("7", example("taps")));
    loop.run();
    EXPECT_THAT(seen, ElementsAre("DeviceAdded " + first, "DeviceRemoved " + first));
}

TEST_F(DaemonTest, ListenersHearOfObjectsAndOfTheirStates) {
    daemon.emplace(bus->address());
    Tools::Daemon::EventLoop loop;
    Bus watcher(bus->address());
    std::vector<std::string> seen;
    const auto objects = watcher.match(
        "type='signal',interface='org.freedesktop.DBus.ObjectManager'", [&](BusMessage signal) {
            seen.push_back(signal.member() + ' ' + signal.readObjectPath());
            if (signal.member() == "InterfacesRemoved") {
                loop.stop();
            }
        });
    const auto states = watcher.match(
        "type='signal',interface='org.freedesktop.DBus.Properties',member='PropertiesChanged'",
        [&](BusMessage signal) {
            std::string text = signal.path() + ' ' + signal.readString();
            signal.enter('a', "{sv}");
            while (signal.enter('e', "sv")) {
                text += ' ' + signal.readString();
                text += '=' + Vexa::writeJson(signal.readAnyValue());
                signal.leave();
            }
            seen.push_back(text);
            if (seen.size() == 3) {
                daemon->source.unplug("7");
            }
        });
    watcher.attach(loop, [&] { loop.stop(); });
    auto broken = playedSurface("7", example("taps"));
    broken.open = []() -> std::shared_ptr<Vexa::DeviceBackend> { throw Failure("no permission"); };
    daemon->source.plug(broken);
    loop.run();
    const std::string changed = first + ' ' + BusNames::kDevice;
    EXPECT_THAT(seen,
                ElementsAre("InterfacesAdded " + first, changed + " State=\"failed\"",
                            changed + " Reason=\"no permission\"", "InterfacesRemoved " + first));
}

TEST_F(DaemonTest, TheNameIsThereOnce) {
    daemon.emplace(bus->address());
    Tools::Daemon::EventLoop loop;
    Bus second(bus->address());
    EXPECT_THAT(failureOf([&] { second.requestName(BusNames::kService); }),
                HasSubstr("another daemon runs on this bus"));
}

/// What stands between <interface name="NAME"> and its end.
std::string interfaceOf(const std::string& xml, const std::string& name) {
    const std::size_t begin = xml.find("<interface name=\"" + name + "\">");
    const std::size_t end = xml.find("</interface>", begin);
    return begin == std::string::npos ? "" : xml.substr(begin, end - begin);
}

TEST_F(DaemonTest, TheInstalledInterfacesAreThoseOfTheObjects) {
    start();
    const std::string installed = contentOf(VEXA_SOURCE_DIR "/data/dbus/org.vexatouch.Touch1.xml");
    const auto introspect = [&](const std::string& path) {
        return client->bus()
            .ask(client->bus().call(BusNames::kService, path, "org.freedesktop.DBus.Introspectable",
                                    "Introspect"))
            .readString();
    };
    for (const auto& [path, name] :
         {std::pair(std::string(BusNames::kManagerPath), std::string(BusNames::kManager)),
          std::pair(first, std::string(BusNames::kDevice))}) {
        const std::string real = interfaceOf(introspect(path), name);
        EXPECT_FALSE(real.empty());
        EXPECT_EQ(interfaceOf(installed, name), real);
    }
}

// ---- as other users, through the program ----

struct Ran {
    int exitCode = -1;
    std::string output;
};

/// Runs the program as this user with these supplementary groups.
Ran runAs(uid_t user, const std::vector<gid_t>& groups, std::vector<std::string> arguments) {
    int ends[2];
    if (pipe(ends) != 0) {
        return {};
    }
    std::vector<char*> pointers = {const_cast<char*>(vexatouchProgram())};
    for (std::string& argument : arguments) {
        pointers.push_back(argument.data());
    }
    pointers.push_back(nullptr);
    const pid_t child = fork();
    if (child == 0) {
        dup2(ends[1], STDOUT_FILENO);
        dup2(ends[1], STDERR_FILENO);
        if (setgroups(groups.size(), groups.data()) != 0 || setresgid(user, user, user) != 0 ||
            setresuid(user, user, user) != 0) {
            _exit(126);
        }
        execv(vexatouchProgram(), pointers.data());
        _exit(127);
    }
    close(ends[1]);
    Ran ran;
    ran.output = readToEnd(FileDescriptor(ends[0]));
    int status = 0;
    waitpid(child, &status, 0);
    ran.exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    return ran;
}

class DaemonAccessTest : public DaemonTest {
protected:
    static constexpr gid_t kGroup = 54321;

    void SetUp() override {
        DaemonTest::SetUp();
        if (geteuid() != 0) {
            GTEST_SKIP() << "only root can become another user";
        }
        auto rights = DaemonUnderTest::rightsOfThisUser();
        rights.group = kGroup;
        rights.isOnSeat = [this](uid_t) { return onSeat.load(); };
        if (bus) {
            start(example("taps"), rights);
        }
    }
    Ran run(std::vector<std::string> arguments, const std::vector<gid_t>& groups = {}) const {
        arguments.insert(arguments.end(), {"--bus", bus->address()});
        return runAs(kStranger, groups, std::move(arguments));
    }

    std::atomic<bool> onSeat = true;
};

TEST_F(DaemonAccessTest, WhoIsOnASeatMayWatchAndNothingElse) {
    EXPECT_EQ(run({"get", kHoldTimeout}).output, "500\n");
    EXPECT_EQ(run({"stats"}).exitCode, 0);
    const std::vector<std::vector<std::string>> refused = {
        {"set", kHoldTimeout, "300"},
        {"set", "Pipeline.Algs.ResetEventStats", "true"},
        {"get", "Recording"},
        {"get", "ServicePluginDebug"},
        {"get", "--all"},
        {"record", "/dev/null", "--force"},
    };
    for (const auto& arguments : refused) {
        const Ran ran = run(arguments);
        EXPECT_EQ(ran.exitCode, 1) << arguments[0];
        EXPECT_THAT(ran.output, HasSubstr("(org.freedesktop.DBus.Error.AccessDenied)"))
            << arguments[1];
        EXPECT_THAT(ran.output, HasSubstr("root or the group vexatouch"));
    }
    EXPECT_EQ(client->get(first, kHoldTimeout), PropertyValue(500U));
}

/// A connection whose other end takes it for this user's, in no group.
std::unique_ptr<Bus> connectAs(uid_t user, const std::string& address) {
    std::unique_ptr<Bus> bus;
    std::thread([&] {
        // The calls of the kernel, which unlike the library's are for this thread alone.
        if (::syscall(SYS_setgroups, 0, nullptr) == 0 &&
            ::syscall(SYS_setresuid, user, user, user) == 0) {
            bus = std::make_unique<Bus>(address);
        }
    }).join();
    return bus;
}

TEST_F(DaemonAccessTest, WhoMayOnlyWatchResetsNothing) {
    client->set(first, kHoldTimeout, 300);
    const auto stranger = connectAs(kStranger, bus->address());
    try {
        stranger->ask(stranger->call(BusNames::kService, first, BusNames::kDevice, "Reset"));
        ADD_FAILURE() << "was allowed";
    } catch (const BusError& error) {
        EXPECT_EQ(error.name(), Tools::Daemon::ErrorName::kAccessDenied);
    }
    EXPECT_EQ(client->get(first, kHoldTimeout), PropertyValue(300U));
}

TEST_F(DaemonAccessTest, WhoMayOnlyWatchTakesNeitherThePlacesNorTheTimeOfOthers) {
    auto surface = playedSurface("8", example("taps"));
    const auto gated = std::make_shared<GatedDevice>(surface.open());
    surface.open = [gated] { return gated; };
    daemon->source.plug(surface);
    waitForState(2, "running");
    const std::string second = BusNames::devicePath(2);
    Tools::Daemon::EventLoop loop;
    constexpr std::size_t kConnections = 4;
    constexpr std::size_t kCallsOfEach = 8;
    std::vector<std::unique_ptr<Bus>> strangers;
    std::vector<Tools::Daemon::BusSlot> slots;
    std::map<std::string, std::size_t> answers;
    const auto count = [&](const std::string& answer) {
        ++answers[answer];
        if (answers["answered"] + answers["busy"] == kConnections * kCallsOfEach) {
            loop.stop();
        }
    };
    const auto listDevices = [](Bus& from) {
        return from.ask(from.call(BusNames::kService, BusNames::kManagerPath, BusNames::kManager,
                                  "ListDevices"));
    };
    for (std::size_t i = 0; i < kConnections; ++i) {
        Bus& stranger = *strangers.emplace_back(connectAs(kStranger, bus->address()));
        for (std::size_t call = 0; call + 1 < kCallsOfEach; ++call) {
            BusMessage get = stranger.call(BusNames::kService, second, BusNames::kDevice, "Get");
            get.string("FirmwareVersion");
            slots.push_back(stranger.askLater(
                get, [&](const BusMessage&) { count("answered"); },
                [&](const BusError& error) {
                    EXPECT_EQ(error.name(), Tools::Daemon::ErrorName::kBusy) << error.what();
                    count("busy");
                }));
        }
        // All have been asked for when the one behind them is answered.
        static_cast<void>(listDevices(stranger));
        BusMessage statistics =
            stranger.call(BusNames::kService, second, BusNames::kDevice, "GetStatistics");
        slots.push_back(stranger.askLater(
            statistics, [&](const BusMessage&) { count("answered"); },
            [&](const BusError&) { count("busy"); }));
        static_cast<void>(listDevices(stranger));
    }
    gated->asked.acquire();

    // Root asks behind them and is next.
    Tools::Daemon::EventLoop rootLoop;
    Bus root(bus->address());
    std::string now;
    BusMessage set = root.call(BusNames::kService, second, BusNames::kDevice, "Set");
    set.string(kHoldTimeout).value(300);
    const auto slot = root.askLater(
        set,
        [&](BusMessage reply) {
            now = Vexa::writeJson(reply.readValue());
            rootLoop.stop();
        },
        [&](const BusError& error) {
            now = error.what();
            rootLoop.stop();
        });
    static_cast<void>(listDevices(root));
    gated->allowed.release();
    root.attach(rootLoop, [&] { rootLoop.stop(); });
    rootLoop.run();
    EXPECT_EQ(now, "300");
    EXPECT_LE(gated->requests, 2);

    gated->allowed.release(kAll);
    for (const auto& stranger : strangers) {
        stranger->attach(loop, [&] { loop.stop(); });
    }
    loop.run();
    EXPECT_EQ(answers["answered"], Tools::Daemon::SurfaceInstance::kMostOfWatchers);
    EXPECT_EQ(gated->requests, 4);
}

TEST_F(DaemonAccessTest, NobodyTakesAllPlacesOverManyConnections) {
    auto surface = playedSurface("8", example("taps"));
    const auto gated = std::make_shared<GatedDevice>(surface.open());
    surface.open = [gated] { return gated; };
    daemon->source.plug(surface);
    waitForState(2, "running");
    const std::string second = BusNames::devicePath(2);
    constexpr std::size_t kMost = Tools::Daemon::SurfaceInstance::kMostOfUser;
    constexpr std::size_t kConnections = 8;
    constexpr std::size_t kCallsOfEach = 4;
    static_assert(kConnections * kCallsOfEach > kMost);
    Tools::Daemon::EventLoop loop;
    std::vector<std::unique_ptr<Bus>> connections;
    std::vector<Tools::Daemon::BusSlot> slots;
    std::size_t answered = 0;
    std::size_t busy = 0;
    const auto count = [&](std::size_t& kind) {
        ++kind;
        if (answered + busy == kConnections * kCallsOfEach) {
            loop.stop();
        }
    };
    for (std::size_t i = 0; i < kConnections; ++i) {
        Bus& caller = *connections.emplace_back(std::make_unique<Bus>(bus->address()));
        for (std::size_t call = 0; call < kCallsOfEach; ++call) {
            BusMessage get = caller.call(BusNames::kService, second, BusNames::kDevice, "Get");
            get.string("FirmwareVersion");
            slots.push_back(caller.askLater(
                get, [&](const BusMessage&) { count(answered); },
                [&](const BusError& error) {
                    EXPECT_EQ(error.name(), Tools::Daemon::ErrorName::kBusy) << error.what();
                    count(busy);
                }));
        }
        static_cast<void>(caller.ask(caller.call(BusNames::kService, BusNames::kManagerPath,
                                                 BusNames::kManager, "ListDevices")));
    }
    gated->allowed.release(kAll);
    for (const auto& caller : connections) {
        caller->attach(loop, [&] { loop.stop(); });
    }
    loop.run();
    EXPECT_EQ(answered, kMost);
}

TEST_F(DaemonAccessTest, WhoIsOnNoSeatMayNotEvenWatch) {
    onSeat = false;
    for (const auto& arguments :
         std::vector<std::vector<std::string>>{{"stats"}, {"get", kHoldTimeout}, {"monitor"}}) {
        const Ran ran = run(arguments);
        EXPECT_EQ(ran.exitCode, 1);
        EXPECT_THAT(ran.output, HasSubstr("a user on a seat, root or the group vexatouch"));
    }
}

TEST_F(DaemonAccessTest, DevicesLooksItselfForWhomTheDaemonDoesNotLetWatch) {
    setenv("DBUS_SYSTEM_BUS_ADDRESS", bus->address().c_str(), 1);
    EXPECT_THAT(runAs(kStranger, {}, {"devices"}).output, HasSubstr("surface 1, running"));
    const Ran itself = runAs(kStranger, {}, {"devices", "--json", "--device", "hidraw"});
    onSeat = false;
    const Ran refused = runAs(kStranger, {}, {"devices", "--json"});
    unsetenv("DBUS_SYSTEM_BUS_ADDRESS");
    EXPECT_EQ(refused.exitCode, 0);
    EXPECT_EQ(refused.output,
              "the daemon lets only users on a seat, root and the group vexatouch watch; shown is "
              "what is plugged in, without what it serves\n" +
                  itself.output);
    // Who names a bus wants the daemon on it.
    const Ran named = run({"devices"});
    EXPECT_EQ(named.exitCode, 1);
    EXPECT_THAT(named.output, HasSubstr("a user on a seat, root or the group vexatouch"));
}

TEST_F(DaemonAccessTest, MembersOfTheGroupMayDoEverything) {
    onSeat = false;
    EXPECT_EQ(run({"set", kHoldTimeout, "300"}, {1, kGroup, 2}).output,
              std::string(kHoldTimeout) + ": 300\n");
    EXPECT_THAT(run({"get", "Recording"}, {kGroup}).output, HasSubstr("\"Frames\""));
    EXPECT_EQ(client->get(first, kHoldTimeout), PropertyValue(300U));
}

TEST_F(DaemonAccessTest, RootMayDoEverything) {
    const Ran ran = runAs(0, {}, {"set", kHoldTimeout, "300", "--bus", bus->address()});
    EXPECT_EQ(ran.output, std::string(kHoldTimeout) + ": 300\n");
}

}  // namespace
}  // namespace VexaTouch::Testing
