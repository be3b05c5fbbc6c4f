// A process of its own, since /sys, /dev and system calls are replaced by made-up ones.

#include "Platform/HidDevice.h"
#include "Platform/Json.h"
#include "Platform/Log.h"
#include "Platform/TraceListener.h"
#include "Shared/InputReport.h"
#include "Tests/Platform/LoopThread.h"
#include "Tests/Support/LogCapture.h"
#include "Tests/Support/MockedDevices.h"
#include "Tests/Tools/CommandRun.h"
#include "Tools/HidrawSource.h"
#include "Tools/RecordingFile.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <vexa/trace.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <future>
#include <iostream>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::MatchesRegex;
using ::testing::Not;
using ::testing::StartsWith;
using Bytes = std::vector<std::uint8_t>;

const std::filesystem::path kExamples = VEXA_SOURCE_DIR "/Examples";

const Bytes kNoReports = {0x06, 0x60, 0xFF, 0x09, 0x01, 0xA1, 0x01, 0xC0};

std::string example(const std::string& name) {
    return kExamples / (name + ".json");
}

/// The reports of a recording in their order.
std::vector<Bytes> reportsIn(const std::string& file) {
    Tools::Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    std::vector<Bytes> reports;
    for (const auto& frame : Tools::readRecording(file, streams).frames) {
        if (frame.type == PipelineRecording::Frame::Type::InputReport) {
            reports.emplace_back(frame.report.begin(), frame.report.end());
        }
    }
    return reports;
}

std::vector<Bytes> reportsOf(const std::string& name) {
    return reportsIn(example(name));
}

/// What happened: each line from its frame number on.
std::vector<std::string> eventsIn(const std::string& lines) {
    std::vector<std::string> events;
    for (const std::string& line : linesOf(lines)) {
        const std::size_t from = line.find("\"frame\":");
        events.push_back(from == std::string::npos ? "no event: " + line : line.substr(from));
    }
    return events;
}

Bytes image(std::uint32_t number) {
    Bytes report(InputReport::Image::minimumLength);
    report[0] = InputReport::Image::reportId;
    for (std::size_t i = 0; i < 4; ++i) {
        report[1 + i] = static_cast<std::uint8_t>(number >> (8 * i));
    }
    return report;
}

class HidrawCommandsTest : public ::testing::Test {
protected:
    HidrawCommandsTest() {
        setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1);
        // Whatever daemon this machine has is none of these tests.
        setenv("DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nowhere", 1);
    }
    ~HidrawCommandsTest() override {
        unsetenv("VEXATOUCH_PLUGIN");
        unsetenv("DBUS_SYSTEM_BUS_ADDRESS");
    }

    /// Runs a command on a thread of its own.
    static std::future<CommandResult> start(std::vector<std::string> arguments) {
        return std::async(std::launch::async,
                          [arguments = std::move(arguments)] { return runCommand(arguments); });
    }
    /// Sends the reports one by one, each when the service has taken up the one before.
    void feed(const std::vector<Bytes>& reports, unsigned number = 0) {
        std::atomic<std::uint64_t> taken = 0;
        const Vexa::TraceListener listener([&](std::uint32_t code, auto) {
            if (code == VEXA_TRACE_REPORT) {
                taken.fetch_add(1);
                taken.notify_all();
            }
        });
        std::uint64_t sent = 0;
        for (const Bytes& report : reports) {
            devices_.send(number, report);
            ++sent;
            for (std::uint64_t now = taken; now < sent; now = taken) {
                taken.wait(now);
            }
        }
    }
    /// Runs on these reports until the plug is pulled.
    CommandResult runOn(const std::vector<Bytes>& reports, const std::string& device = "hidraw") {
        auto running = start({"run", "--device", device, "--json"});
        feed(reports);
        devices_.unplug(0);
        return running.get();
    }

    MockedDevices devices_;
};

TEST_F(HidrawCommandsTest, DevicesListsTheSurfaces) {
    devices_.plug(0, {.name = "Keyboard", .descriptor = kNoReports});
    devices_.plug(2, {.name = "Left\x1b[2J", .serial = ""});
    devices_.plug(1, {.name = "Right", .physicalPath = ""});
    const CommandResult result = runCommand({"devices"});
    EXPECT_EQ(result, (CommandResult{0,
                                     "/dev/hidraw1  5658:5454  Right  serial 0001\n"
                                     "/dev/hidraw2  5658:5454  Left?[2J  at port-1\n",
                                     ""}));
}

TEST_F(HidrawCommandsTest, DevicesSaysThatThereIsNone) {
    EXPECT_EQ(
        runCommand({"devices"}),
        (CommandResult{0, "", "no touch surface is plugged in; of HID devices there are 0\n"}));
    devices_.plug(0, {.name = "Keyboard", .descriptor = kNoReports});
    EXPECT_EQ(runCommand({"devices"}),
              (CommandResult{0, "",
                             "no touch surface is plugged in; of HID devices there is 1 (--verbose "
                             "shows them)\n"}));
    EXPECT_EQ(runCommand({"devices", "--json"}), (CommandResult{0, "[]\n", ""}));
}

TEST_F(HidrawCommandsTest, DevicesTakesWhatIsNamed) {
    devices_.plug(0,
                  {.vendor = 0x46D, .product = 0xC077, .name = "Mouse", .descriptor = kNoReports});
    EXPECT_THAT(runCommand({"devices", "--match", "1:2", "--match", "46d:c077"}).out,
                StartsWith("/dev/hidraw0  046d:c077  Mouse"));
    const CommandResult wrong = runCommand({"devices", "--match", "mouse"});
    EXPECT_EQ(wrong.exitCode, 2);
    EXPECT_THAT(wrong.error, HasSubstr("--match: expected a vendor and a product id"));
}

TEST_F(HidrawCommandsTest, DevicesVerboselyShowsWhyAndTheDescriptor) {
    const std::string surface = devices_.plug(0);
    const std::string other = devices_.plug(1, {.name = "Keyboard", .descriptor = kNoReports});
    const CommandResult result = runCommand({"devices", "--verbose"});
    EXPECT_THAT(result.out,
                AllOf(StartsWith("/dev/hidraw0  5658:5454  Vexa Touch  serial 0001  at port-1\n"
                                 "  a surface: its reports are a surface's\n  " +
                                 surface +
                                 "\n"
                                 "  input     1    72 bytes  FF60:10 FF60:11 FF60:12 FF60:13 "
                                 "FF60:14\n"
                                 "  input     2     9 bytes  FF60:20\n"
                                 "  feature   4     2 bytes  FF60:30\n"
                                 "  feature  31     4 bytes  FF60:31\n"
                                 "  feature  63     4 bytes  FF60:32\n"
                                 "      0  06 60 ff          Usage Page (0xFF60)\n"
                                 "      3  09 01             Usage (0x01)\n"
                                 "      5  a1 01             Collection (Application)\n"
                                 "      7  15 00               Logical Minimum (0)\n"),
                      EndsWith("/dev/hidraw1  5658:5454  Keyboard  serial 0001  at port-1\n"
                               "  no surface: no input report 1; no input report 2; no feature "
                               "report 4; no feature report 31; no feature report 63\n  " +
                               other +
                               "\n"
                               "      0  06 60 ff          Usage Page (0xFF60)\n"
                               "      3  09 01             Usage (0x01)\n"
                               "      5  a1 01             Collection (Application)\n"
                               "      7  c0                End Collection\n")));
}

TEST_F(HidrawCommandsTest, DevicesForPrograms) {
    const std::string path = devices_.plug(0, {.bus = 3});
    EXPECT_EQ(runCommand({"devices", "--json"}).out,
              R"([
  {
    "node": "/dev/hidraw0",
    "sys_path": ")" +
                  path +
                  R"(",
    "bus": 3,
    "vendor_id": 22104,
    "product_id": 21588,
    "name": "Vexa Touch",
    "physical_path": "port-1",
    "serial_number": "0001",
    "surface": true,
    "reason": "its reports are a surface's"
  }
]
)");
    const auto verbose = Vexa::readJson(runCommand({"devices", "--json", "--verbose"}).out);
    ASSERT_TRUE(verbose);
    const Vexa::PropertyValue device = *verbose.asArray()->begin();
    const Vexa::PropertyValue reports = device.asDictionary()->at("reports");
    EXPECT_EQ(reports.asArray()->size(), 5U);
    EXPECT_EQ(*reports.asArray()->begin(),
              Vexa::PropertyValue(Vexa::PropertyValue::Dictionary{
                  {"kind", "input"}, {"id", 1}, {"bits", 576}, {"vendor", true}}));
    const Vexa::PropertyValue descriptor = device.asDictionary()->at("report_descriptor");
    EXPECT_THAT(std::string(*descriptor.asString()),
                AllOf(StartsWith("06 60 ff 09 01 "), EndsWith(" b1 02 c0 ")));
}

TEST_F(HidrawCommandsTest, LiveEventsEqualThoseOfTheReplay) {
    for (const std::string name : {"taps", "holds", "disjoint-frames"}) {
        SCOPED_TRACE(name);
        devices_.plug(0);
        const CommandResult result = runOn(reportsOf(name));
        const CommandResult replay = runCommand({"replay", "--json", example(name)});
        EXPECT_EQ(eventsIn(result.out), eventsIn(replay.out));
        EXPECT_THAT(eventsIn(result.out), Not(IsEmpty()));
        EXPECT_EQ(result.exitCode, 1);
        EXPECT_THAT(result.error, AllOf(HasSubstr(" reports read, "),
                                        EndsWith("vexatouch run: the device was unplugged\n")));
    }
}

TEST_F(HidrawCommandsTest, RunTakesWhatWasSentJustBeforeTheUnplug) {
    for (int round = 0; round < 20; ++round) {
        devices_.plug(0);
        auto running = start({"run", "--device", "hidraw", "--json"});
        feed({image(1)});
        std::vector<Bytes> last;
        for (std::uint32_t number = 2; number < 62; ++number) last.push_back(image(number));
        devices_.sendAndUnplug(0, last);
        const CommandResult result = running.get();
        EXPECT_EQ(result, (CommandResult{1, "",
                                         "61 reports read, 0 events\nvexatouch run: the device was "
                                         "unplugged\n"}));
    }
}

TEST_F(HidrawCommandsTest, RecordTakesWhatWasSentJustBeforeTheUnplug) {
    const TemporaryFolder folder;
    for (int round = 0; round < 20; ++round) {
        devices_.plug(0);
        const std::string file = folder.path("session" + std::to_string(round) + ".json");
        auto running = start({"record", file, "--device", "hidraw"});
        std::vector<Bytes> sent = {image(1)};
        feed(sent);
        std::vector<Bytes> last;
        for (std::uint32_t number = 2; number < 62; ++number) last.push_back(image(number));
        sent.insert(sent.end(), last.begin(), last.end());
        devices_.sendAndUnplug(0, std::move(last));
        const CommandResult result = running.get();
        EXPECT_EQ(reportsIn(file), sent);
        EXPECT_EQ(result, (CommandResult{1, "",
                                         file + ": 61 reports and 27 settings, " +
                                             std::to_string(contentOf(file).size()) +
                                             " bytes\nvexatouch record: the device was "
                                             "unplugged\n"}));
    }
}

TEST_F(HidrawCommandsTest, RunTellsOfFramesThatWereLost) {
    devices_.plug(0);
    const CommandResult result =
        runOn({image(1), image(2), image(5), image(6), image(16), image(3)}, "hidraw:/dev/hidraw0");
    // Lines in between come when the run gets to it, at most one a second.
    EXPECT_THAT(result.error, HasSubstr("vexatouch run: so far "));
    EXPECT_THAT(linesOf(result.error),
                ::testing::Contains(MatchesRegex("6 reports read, .*; 3 gaps, 11 frames lost")));
}

TEST_F(HidrawCommandsTest, AFloodOfInvalidReportsIsNotToldOneByOne) {
    std::atomic<int> logged = 0;
    Vexa::Log::setSink([&](Vexa::LogCategory, Vexa::LogLevel, std::string_view message) {
        if (!message.starts_with("pthread_setschedparam")) {
            logged.fetch_add(1);
        }
    });
    devices_.plug(0);
    const CommandResult result = runOn(std::vector<Bytes>(2000, Bytes(40, 0x77)));
    Vexa::Log::setSink({});
    EXPECT_EQ(logged, 0);
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(result.error,
              "2000 reports read, 0 events\nvexatouch run: the device was unplugged\n");
}

TEST_F(HidrawCommandsTest, AServiceThatNeverReadsTheSurfaceEndsTheCommand) {
    setenv("VEXATOUCH_PLUGIN", VEXATOUCH_SAMPLE_PLUGINS "/TakesNoReports.so", 1);
    devices_.plug(0);
    const TemporaryFolder folder;
    const std::string file = folder.path("session.json");
    for (const std::vector<std::string>& arguments :
         {std::vector<std::string>{"run"}, {"record", file}, {"latency", "--reader", "off"}}) {
        std::vector<std::string> onSurface = arguments;
        onSurface.insert(onSurface.end(), {"--device", "hidraw"});
        const CommandResult result =
            runCommand(onSurface, {}, Vexa::HostClock::system(), std::chrono::milliseconds(10));
        EXPECT_EQ(result.exitCode, 1) << result;
        EXPECT_THAT(result.error, HasSubstr("vexatouch " + arguments.front() +
                                            ": the service takes no reports; its log says why"));
    }
}

TEST_F(HidrawCommandsTest, ASurfaceKnowsWhetherItIsRead) {
    devices_.plug(0);
    const auto source = std::make_shared<Tools::HidrawSource>("/dev/hidraw0");
    EXPECT_FALSE(source->isServed());
    const Vexa::DeviceRegistration registration(source);
    const Vexa::HidDevice device = Vexa::HidDevice::create(registration.service());
    Vexa::LoopThread thread;
    thread.call([&] { device.schedule(thread.loop(), Vexa::LoopThread::kMode); });
    EXPECT_TRUE(source->isServed());
    thread.call([&] { device.unschedule(thread.loop(), Vexa::LoopThread::kMode); });
    EXPECT_FALSE(source->isServed());
}

TEST_F(HidrawCommandsTest, NoSurfaceIsAClearFailure) {
    devices_.plug(0, {.name = "Keyboard", .descriptor = kNoReports});
    for (const char* command : {"run", "get", "set", "latency"}) {
        std::vector<std::string> arguments = {command, "--device", "hidraw"};
        if (command == std::string("get")) arguments.emplace_back("Product");
        if (command == std::string("set")) arguments.insert(arguments.end(), {"Product", "1"});
        const CommandResult result = runCommand(arguments);
        EXPECT_EQ(result.exitCode, 1) << result;
        EXPECT_THAT(result.error, HasSubstr("no touch surface is plugged in"));
    }
    const CommandResult result = runCommand({"run", "--device", "hidraw:/dev/hidraw5"});
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_EQ(
        result.error,
        "vexatouch run: /dev/hidraw5: No such file or directory (vexatouch devices lists what "
        "is plugged in)\n");
}

TEST_F(HidrawCommandsTest, ANamedDeviceIsTakenAndSeveralAreAnnounced) {
    devices_.plug(0, {.vendor = 1, .product = 2, .name = "Named", .descriptor = kNoReports});
    devices_.plug(1, {.name = "Ours"});
    EXPECT_EQ(runCommand({"get", "Product", "--device", "hidraw"}),
              (CommandResult{0, "Ours\n", ""}));
    EXPECT_EQ(runCommand({"get", "Product", "--device", "hidraw", "--match", "1:2"}),
              (CommandResult{0, "Named\n",
                             "2 surfaces; this is /dev/hidraw0 (--device hidraw:NODE for "
                             "another)\n"}));
    EXPECT_EQ(runCommand({"get", "Product", "--match", "1:2"}).exitCode, 2);
    EXPECT_EQ(runCommand({"get", "Product", "--device", "hidraw:/dev/hidraw1", "--match", "1:2"})
                  .exitCode,
              2);
}

TEST_F(HidrawCommandsTest, GetAsksTheDevice) {
    devices_.plug(0);
    devices_.setFeature(0, 4, {.bytes = {4, 1, 2}});
    devices_.setFeature(0, 31, {.bytes = {31, 0x10}});
    devices_.setFeature(0, 63, {.bytes = {}, .error = EIO});
    const auto get = [](const char* key) {
        return runCommand({"get", key, "--device", "hidraw:/dev/hidraw0"});
    };
    EXPECT_EQ(get("PhysicalPath"), (CommandResult{0, "port-1\n", ""}));
    EXPECT_EQ(get("FirmwareVersion").exitCode, 0);
    // Too short and refused: no value, and the service goes on.
    LogCapture log;
    for (const std::string key : {"FactoryResetHoldDuration", "CriticalErrors"}) {
        EXPECT_EQ(get(key.c_str()),
                  (CommandResult{1, "",
                                 "vexatouch get: " + key +
                                     ": the device gives no value: it refuses, does not answer in "
                                     "time or answers with too few bytes; the log says which\n"}));
    }
    std::vector<LogLine> errors = log.take();
    std::erase_if(errors, [](const LogLine& line) { return line.level != Vexa::LogLevel::Error; });
    EXPECT_THAT(
        errors,
        ElementsAre(error("/dev/hidraw0: feature report 31 is too short: 2 of 5 bytes"),
                    error("/dev/hidraw0: feature report 63 is not given: Input/output error")));
    EXPECT_EQ(
        get("Colour"),
        (CommandResult{1, "",
                       "vexatouch get: Colour: there is no such property, or it has no value\n"}));
}

TEST_F(HidrawCommandsTest, SetIsReadBack) {
    devices_.plug(0);
    EXPECT_EQ(runCommand({"set", "Product", "\"Mine\"", "--device", "hidraw"}),
              (CommandResult{0, "Product: \"Mine\"\n", ""}));
    EXPECT_EQ(runCommand({"get", "Product", "--device", "hidraw"}).out, "Vexa Touch\n");
}

TEST_F(HidrawCommandsTest, LatencyOfALiveSurfaceCountsItsReports) {
    devices_.plug(0);
    auto running = start({"latency", "--device", "hidraw", "--reader", "off", "--priority",
                          "normal", "--count", "50", "--json"});
    // More than are measured, since reports that come together are read as one.
    Vexa::Log::setSink([](Vexa::LogCategory, Vexa::LogLevel, std::string_view) {});
    std::uint32_t number = 0;
    while (running.wait_for(std::chrono::milliseconds(1)) != std::future_status::ready) {
        devices_.send(0, image(++number));
    }
    Vexa::Log::setSink({});
    const CommandResult result = running.get();
    EXPECT_EQ(result.exitCode, 0) << result;
    EXPECT_THAT(result.out, AllOf(HasSubstr("\"live\": true"),
                                  HasSubstr("\"pipeline\": {\n        \"samples\": 50,")));
    EXPECT_EQ(runCommand({"latency", "--device", "hidraw", "--rate", "100"}).exitCode, 2);
}

TEST_F(HidrawCommandsTest, LatencyEndsWhenThePlugIsPulled) {
    devices_.plug(0);
    // A frame that is missing is logged: then the measurement is on.
    std::atomic<bool> isOn = false;
    Vexa::Log::setSink([&](Vexa::LogCategory, Vexa::LogLevel, std::string_view message) {
        isOn = isOn || message.starts_with("Disjoint image");
    });
    auto running = start({"latency", "--device", "hidraw", "--count", "1000000"});
    for (std::uint32_t number = 0; !isOn; number += 2) {
        devices_.send(0, image(number));
    }
    Vexa::Log::setSink({});
    devices_.unplug(0);
    const CommandResult result = running.get();
    EXPECT_EQ(result.exitCode, 1) << result;
    EXPECT_THAT(result.error, EndsWith("vexatouch latency: the device was unplugged\n"));
}

}  // namespace
}  // namespace VexaTouch::Testing
