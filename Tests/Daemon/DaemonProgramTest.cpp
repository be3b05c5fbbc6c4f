// The program itself: the daemon as a service and the commands that talk to it.

#include "Platform/Json.h"
#include "Tests/Daemon/DaemonUnderTest.h"
#include "Tests/Daemon/ServiceManager.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/ProgramOnTerminal.h"
#include "Tests/Tools/ProgramRun.h"
#include "Tests/Tools/VexatouchProgram.h"
#include "Tools/Daemon/BusNames.h"
#include "Tools/EventRecord.h"
#include "Tools/Failure.h"
#include "Tools/FileDescriptor.h"
#include "Tools/RecordingFile.h"

#include <gmock/gmock.h>

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <iterator>
#include <optional>
#include <regex>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::AllOf;
using ::testing::Field;
using ::testing::HasSubstr;
using ::testing::MatchesRegex;
using ::testing::SizeIs;
using ::testing::StartsWith;
using Vexa::PropertyValue;

bool endedWith(int status, int exitCode) {
    return WIFEXITED(status) && WEXITSTATUS(status) == exitCode;
}

class DaemonProgramTest : public ::testing::Test {
protected:
    void SetUp() override {
        if (!PrivateBus::isThere()) {
            GTEST_SKIP() << PrivateBus::kProgram << " is missing: script/bootstrap installs it";
        }
        bus.emplace();
        setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1);
    }
    ~DaemonProgramTest() override { unsetenv("VEXATOUCH_PLUGIN"); }

    [[nodiscard]] std::vector<std::string> atBus(std::vector<std::string> arguments) const {
        arguments.insert(arguments.end(), {"--bus", bus->address()});
        return arguments;
    }
    [[nodiscard]] std::vector<std::string> daemonOn(const std::string& device) const {
        return atBus({"daemon", "--no-keys", "--device", device});
    }

    std::optional<PrivateBus> bus;
    TemporaryFolder folder;
};

TEST_F(DaemonProgramTest, TellsItsManagerWhatItServesAndThatItLives) {
    ServiceManager manager(folder.path("notify"), "20000");
    ProgramRun daemon(daemonOn("sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture"));
    EXPECT_THAT(manager.heardUntil("WATCHDOG=1"),
                AllOf(StartsWith("READY=1\n"), HasSubstr("STATUS=1 surface, ")));
    ASSERT_TRUE(
        daemon.readErrorUntil("surface 1, sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture: running"));
    daemon.signal(SIGTERM);
    manager.heardUntil("STOPPING=1");
    EXPECT_TRUE(endedWith(daemon.end(), 0));
}

TEST_F(DaemonProgramTest, TheStatusFollowsWhatComesWithoutAWatchdogAsWell) {
    ServiceManager manager(folder.path("notify"));
    ProgramRun daemon(daemonOn("sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture"));
    // At the start, when it runs, and with the first gesture.
    std::string heard;
    const std::regex status("STATUS=1 surface, ");
    while (std::distance(std::sregex_iterator(heard.begin(), heard.end(), status), {}) < 3) {
        heard += manager.heardUntil("STATUS=1 surface, ");
    }
    daemon.signal(SIGTERM);
    EXPECT_TRUE(endedWith(daemon.end(), 0));
}

TEST_F(DaemonProgramTest, TheStatusAndALineTellOfLostFrames) {
    ServiceManager manager(folder.path("notify"));
    ProgramRun daemon(daemonOn(example("mixed")));
    manager.heardUntil(" reports, 4 frames lost");
    daemon.signal(SIGTERM);
    EXPECT_TRUE(endedWith(daemon.end(), 0));
    EXPECT_THAT(daemon.error(), ::testing::ContainsRegex(
                                    "mixed.json@max: (so far|in all) [12] gaps?, 4 frames lost\n"));
}

TEST_F(DaemonProgramTest, WithoutUinputItSaysWhatToDoAndServesAllTheSame) {
    setenv("VEXATOUCH_UINPUT", folder.path("uinput").c_str(), 1);
    const std::vector<std::string> served = {"daemon", "--device", example("taps")};
    std::vector<std::string> noKeyIsLeft = served;
    for (const char* gesture : {"tap:1", "tap:2", "tap:3", "hold:1", "hold:2", "hold:3"}) {
        noKeyIsLeft.insert(noKeyIsLeft.end(), {"--key", std::string(gesture) + "=none"});
    }
    for (const auto& [arguments, wantsKeys] :
         {std::pair(served, true), std::pair(noKeyIsLeft, false)}) {
        ProgramRun daemon(atBus(arguments));
        ASSERT_TRUE(daemon.readErrorUntil(": running")) << daemon.error();
        daemon.signal(SIGTERM);
        EXPECT_TRUE(endedWith(daemon.end(), 0)) << daemon.error();
        EXPECT_EQ(daemon.error().find(folder.path("uinput")) != std::string::npos, wantsKeys)
            << daemon.error();
        EXPECT_EQ(daemon.error().find("; going on without keys\n") != std::string::npos, wantsKeys);
    }
    unsetenv("VEXATOUCH_UINPUT");
}

TEST_F(DaemonProgramTest, AWrongCommandLineStartsNothing) {
    for (const auto& [wrong, reason] :
         std::vector<std::pair<std::vector<std::string>, std::string>>{
             {{"--key", "tap:1=KEY_OF_NOTHING"}, "--key tap:1=KEY_OF_NOTHING: "},
             {{"--no-keys", "--key", "tap:1=none"}, "--no-keys and --key contradict each other"},
             {{"--match", "nothing"}, "--match: expected a vendor and a product id"},
             {{"--match", "1:2", "--device", "sim"}, "--match is for surfaces that are plugged in"},
             {{"--device", "hidraw"}, "--device hidraw: surfaces that are plugged in are found"}}) {
        std::vector<std::string> arguments = {"daemon"};
        arguments.insert(arguments.end(), wrong.begin(), wrong.end());
        const CommandResult result = runCommand(atBus(arguments));
        EXPECT_EQ(result.exitCode, 2) << reason;
        EXPECT_THAT(result.error, HasSubstr(reason));
        EXPECT_EQ(result.error.find(": running"), std::string::npos);
    }
}

TEST_F(DaemonProgramTest, ASecondSignalEndsATakeDownThatDoesNotEnd) {
    setenv("VEXATOUCH_PLUGIN", VEXATOUCH_SAMPLE_PLUGINS "/NeverEnds.so", 1);
    for (const int second : {SIGTERM, SIGINT}) {
        ProgramRun daemon(daemonOn(example("taps")));
        ASSERT_TRUE(daemon.readErrorUntil(": running"));
        daemon.signal(SIGTERM);
        ASSERT_TRUE(daemon.readErrorUntil("the input thread does not end"));
        daemon.signal(second);
        const int status = daemon.wait();
        EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == second) << status;
    }
}

TEST_F(DaemonProgramTest, ASecondSignalEndsAStartThatDoesNotEnd) {
    // A pipe that nobody writes.
    const std::string pipe = folder.path("pipe.json");
    ASSERT_EQ(mkfifo(pipe.c_str(), 0600), 0);
    ProgramRun daemon(daemonOn("recording:" + pipe));
    const Tools::FileDescriptor writer(::open(pipe.c_str(), O_WRONLY | O_CLOEXEC));
    daemon.signal(SIGTERM);
    daemon.signal(SIGINT);
    const int status = daemon.wait();
    EXPECT_TRUE(WIFSIGNALED(status)) << status;
}

TEST_F(DaemonProgramTest, AHangUpIsLeftAloneUnderNohup) {
    std::signal(SIGHUP, SIG_IGN);
    ProgramRun daemon(daemonOn(example("taps")));
    std::signal(SIGHUP, SIG_DFL);
    ASSERT_TRUE(daemon.readErrorUntil(": running"));
    daemon.signal(SIGHUP);
    EXPECT_EQ(runCommand(atBus({"get", "Version"})).exitCode, 0);
    daemon.signal(SIGTERM);
    EXPECT_TRUE(endedWith(daemon.end(), 0));
}

TEST_F(DaemonProgramTest, EndsWhenTheBusGoes) {
    ProgramRun daemon(daemonOn(example("taps")));
    ASSERT_TRUE(daemon.readErrorUntil(": running"));
    bus->stop();
    EXPECT_TRUE(endedWith(daemon.end(), 1));
    EXPECT_THAT(daemon.error(), HasSubstr("the connection to the bus was lost"));
}

TEST_F(DaemonProgramTest, ASecondDaemonSaysThatThereIsOne) {
    const DaemonUnderTest first(bus->address());
    ProgramRun second(daemonOn(example("taps")));
    EXPECT_TRUE(endedWith(second.end(), 1));
    EXPECT_THAT(second.error(), HasSubstr("another daemon runs on this bus"));
}

TEST_F(DaemonProgramTest, WithoutADaemonTheCommandsSayWhatToDo) {
    for (const auto& arguments : std::vector<std::vector<std::string>>{
             {"get", "Version"},
             {"set", "Pipeline.Algs.HoldTimeoutMilliseconds", "300"},
             {"stats"},
             {"monitor"},
             {"record", folder.path("none.json")}}) {
        const CommandResult result = runCommand(atBus(arguments));
        EXPECT_EQ(result.exitCode, 1) << arguments[0];
        EXPECT_THAT(result.error,
                    AllOf(HasSubstr("no daemon runs on the bus"), HasSubstr("--device sim")));
        EXPECT_EQ(result.out, "");
    }
    EXPECT_EQ(folder.names(), std::vector<std::string>());
    const CommandResult none = runCommand({"get", "Version", "--bus", "unix:path=/nowhere"});
    EXPECT_EQ(none.exitCode, 1);
    EXPECT_EQ(none.error,
              "vexatouch get: no daemon: the bus unix:path=/nowhere does not answer: No such file "
              "or directory; start the bus, or give the command a device of its own with --device "
              "sim\n");
    // The well-known ones are named by their sockets.
    setenv("DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nowhere/system", 1);
    EXPECT_THAT(runCommand({"get", "Version"}).error,
                HasSubstr("the system bus (unix:path=/nowhere/system) does not answer: No such "));
    unsetenv("DBUS_SYSTEM_BUS_ADDRESS");
    setenv("DBUS_SESSION_BUS_ADDRESS", "unix:path=/nowhere/session", 1);
    EXPECT_THAT(runCommand({"get", "Version", "--bus", "session"}).error,
                HasSubstr("the session's bus (unix:path=/nowhere/session) does not answer"));
    unsetenv("DBUS_SESSION_BUS_ADDRESS");
}

/// What a JSON array of objects says under this key of its first element.
PropertyValue firstOf(const std::string& json, const char* key) {
    const PropertyValue all = Vexa::readJson(json);
    const auto elements = all.asArray();
    return elements && !elements->empty() ? (*elements)[0].member(key) : PropertyValue();
}

TEST_F(DaemonProgramTest, StatsOfAnOwnDeviceAreThoseOfTheDaemon) {
    const std::string device = example("disjoint-frames");
    DaemonUnderTest daemon(bus->address());
    daemon.source.plug(playedSurface("7", device));
    const CommandResult own = runCommand({"stats", "--json", "--device", device});
    EXPECT_EQ(own.exitCode, 0) << own.error;
    EXPECT_EQ(own.error, "");
    const PropertyValue expected = firstOf(own.out, "Statistics");
    EXPECT_EQ(
        expected.member("Gestures"),
        PropertyValue(
            Tools::readExpectedEvents(VEXA_SOURCE_DIR "/Examples/disjoint-frames.events").size()));
    EXPECT_EQ(firstOf(own.out, "Surface"), PropertyValue(1U));
    EXPECT_EQ(firstOf(own.out, "State"), PropertyValue("running"));
    const auto members = expected.asDictionary();
    ASSERT_TRUE(members);
    EXPECT_THAT(*members, SizeIs(9));
    for (const auto& [key, value] : *members) {
        // Of the daemon's the gestures come last.
        while (firstOf(runCommand(atBus({"stats", "--json"})).out, "Statistics").member(key) !=
               value) {
        }
    }
}

TEST_F(DaemonProgramTest, ASeedIsRefusedForWhatDrawsNoNumbers) {
    for (const char* command : {"stats", "monitor"}) {
        const CommandResult result =
            runCommand({command, "--seed", "1", "--device", example("taps")});
        EXPECT_EQ(result.exitCode, 2) << command;
        EXPECT_THAT(result.error, HasSubstr("--seed is for a simulated surface"));
    }
}

TEST_F(DaemonProgramTest, StatsOfAnOwnDeviceEndAfterATimeOrAtASignal) {
    const CommandResult timed = runCommand({"stats", "--device", "sim", "--duration", "50ms"});
    EXPECT_EQ(timed.exitCode, 0) << timed.error;
    EXPECT_THAT(timed.out, AllOf(StartsWith("surface 1, sim, running\n"), HasSubstr("  Reports: "),
                                 HasSubstr("  EventStats: {")));
    ProgramRun interrupted({"stats", "--device", "sim"});
    ASSERT_TRUE(interrupted.readErrorUntil("random gestures"));
    interrupted.signal(SIGINT);
    EXPECT_TRUE(endedWith(interrupted.end(), 0));
    EXPECT_THAT(interrupted.out(), StartsWith("surface 1, sim, running\n"));
    setenv("VEXATOUCH_PLUGIN", "/nowhere.so", 1);
    EXPECT_EQ(runCommand({"stats", "--device", "sim"}).exitCode, 1);
    EXPECT_EQ(runCommand(atBus({"stats", "--duration", "1s"})).exitCode, 2);
}

TEST_F(DaemonProgramTest, DevicesAreThoseThatTheDaemonServes) {
    DaemonUnderTest daemon(bus->address());
    EXPECT_THAT(runCommand(atBus({"devices"})),
                AllOf(Field(&CommandResult::exitCode, 0), Field(&CommandResult::out, ""),
                      Field(&CommandResult::error, StartsWith("the daemon serves no touch "))));
    auto surface = playedSurface("7", example("taps"));
    surface.name = "Left\x1b[2J";
    const auto open = surface.open;
    surface.open = [open] {
        auto device = open();
        device->setProperty("Bus", 3U);
        // Usage page 0xFF60, and one input report of 8 bits.
        device->setProperty("ReportDescriptor",
                            PropertyValue::Bytes{0x06, 0x60, 0xFF, 0x09, 0x01, 0xA1, 0x01, 0x85,
                                                 0x01, 0x75, 0x08, 0x95, 0x01, 0x81, 0x02, 0xC0});
        return device;
    };
    daemon.source.plug(surface);
    auto broken = playedSurface("8", example("taps"));
    broken.open = []() -> std::shared_ptr<Vexa::DeviceBackend> {
        throw Tools::Failure("/dev/hidraw8: no permission");
    };
    daemon.source.plug(broken);
    CommandResult listed;
    do {
        listed = runCommand(atBus({"devices"}));
    } while (listed.out.find(", running") == std::string::npos ||
             listed.out.find(", failed") == std::string::npos);
    EXPECT_EQ(listed,
              (CommandResult{0,
                             "/dev/hidraw7  5658:5454  Left?[2J  serial serial 7  at usb-7  "
                             "surface 1, running\n"
                             "/dev/hidraw8  5658:5454  Surface 8  serial serial 8  at usb-8  "
                             "surface 2, failed: /dev/hidraw8: no permission\n",
                             ""}));
    const CommandResult json = runCommand(atBus({"devices", "--json", "--verbose"}));
    EXPECT_EQ(json.exitCode, 0);
    const auto first = [&](const char* key) { return firstOf(json.out, key); };
    EXPECT_EQ(first("node"), PropertyValue("/dev/hidraw7"));
    EXPECT_EQ(first("vendor_id"), PropertyValue(0x5658));
    EXPECT_EQ(first("bus"), PropertyValue(3));
    EXPECT_EQ(first("number"), PropertyValue(1));
    EXPECT_EQ(first("state"), PropertyValue("running"));
    EXPECT_EQ(first("surface"), PropertyValue(true));
    EXPECT_EQ(first("reason"), PropertyValue("the daemon serves it"));
    EXPECT_EQ(first("report_descriptor"),
              PropertyValue("06 60 ff 09 01 a1 01 85 01 75 08 95 01 81 02 c0 "));
    EXPECT_THAT(runCommand(atBus({"devices", "--verbose"})).out,
                AllOf(HasSubstr("surface 1, running\n  a surface: the daemon serves it\n"),
                      HasSubstr("      3  09 01             Usage (0x01)\n")));
}

TEST_F(DaemonProgramTest, WhatADeviceSaysOfItselfReachesNoTerminalAsItIs) {
    DaemonUnderTest daemon(bus->address());
    auto surface = playedSurface("7", example("taps"));
    surface.name = "Left\x1b[2J\nsurface 2: running";
    surface.open = []() -> std::shared_ptr<Vexa::DeviceBackend> {
        throw Tools::Failure("no\x1b[2Jpermission");
    };
    daemon.source.plug(surface);
    std::string shown;
    do {
        shown = runCommand(atBus({"stats"})).out;
    } while (shown.find(", failed") == std::string::npos);
    EXPECT_THAT(shown, StartsWith("surface 1, /dev/hidraw7, Left?[2J?surface 2: running, failed, "
                                  "no?[2Jpermission\n  "));
    daemon.stop();
    EXPECT_EQ(daemon.log(),
              "surface 1, /dev/hidraw7, Left?[2J?surface 2: running: no?[2Jpermission\n");
}

TEST_F(DaemonProgramTest, WithoutADaemonDevicesLooksItself) {
    const CommandResult itself = runCommand({"devices", "--json", "--device", "hidraw"});
    EXPECT_EQ(itself.exitCode, 0) << itself.error;
    setenv("DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nowhere", 1);
    EXPECT_EQ(runCommand({"devices", "--json"}), itself);
    setenv("DBUS_SYSTEM_BUS_ADDRESS", bus->address().c_str(), 1);
    EXPECT_EQ(runCommand({"devices", "--json"}), itself);
    {
        // And with one it does not.
        DaemonUnderTest daemon(bus->address());
        daemon.source.plug(playedSurface("7", example("taps")));
        while (runCommand({"devices", "--json"}).out.find("/dev/hidraw7") == std::string::npos) {
        }
        EXPECT_EQ(runCommand({"devices", "--json", "--device", "hidraw"}), itself);
    }
    unsetenv("DBUS_SYSTEM_BUS_ADDRESS");
    // Who names a bus wants the daemon on it.
    const CommandResult none = runCommand(atBus({"devices"}));
    EXPECT_EQ(none.exitCode, 1);
    EXPECT_THAT(none.error,
                AllOf(HasSubstr("no daemon runs on the bus"),
                      HasSubstr("look at this machine's devices with --device hidraw")));
    for (const auto& wrong : std::vector<std::vector<std::string>>{
             {"devices", "--device", "sim"}, {"devices", "--match", "1:2", "--bus", "system"}}) {
        EXPECT_EQ(runCommand(wrong).exitCode, 2);
    }
}

TEST_F(DaemonProgramTest, ARecordingFromTheDaemonShowsHowFarItIs) {
    DaemonUnderTest daemon(bus->address());
    daemon.source.plug(playedSurface("7", "sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture", true));
    while (runCommand(atBus({"stats"})).out.find("running") == std::string::npos) {
    }
    ProgramOnTerminal record(atBus({"record", folder.path("session.json")}));
    EXPECT_TRUE(record.readUntil(" frames, 0.0 MB, "));
    record.type("\x03");
    EXPECT_TRUE(endedWith(record.end(), 0)) << record.output();
}

TEST_F(DaemonProgramTest, ARecordingFromTheDaemonAnswersTheUserSignalAndGoesOn) {
    DaemonUnderTest daemon(bus->address());
    daemon.source.plug(playedSurface("7", "sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture", true));
    while (runCommand(atBus({"stats"})).out.find("running") == std::string::npos) {
    }
    const std::string file = folder.path("session.json");
    ProgramRun record(atBus({"record", file}));
    std::error_code none;
    while (!std::filesystem::exists(file, none) ||
           contentOf(file).find("InputReport") == std::string::npos) {
    }
    record.signal(SIGUSR1);
    ASSERT_TRUE(record.readErrorUntil("is whole without SIGUSR1\n")) << record.error();
    record.signal(SIGTERM);
    EXPECT_TRUE(endedWith(record.end(), 0)) << record.error();
}

TEST_F(DaemonProgramTest, ARecordingFromTheDaemonEndsAfterATimeAndIsSafeSoOften) {
    DaemonUnderTest daemon(bus->address());
    daemon.source.plug(playedSurface("7", "sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture", true));
    while (runCommand(atBus({"stats"})).out.find("running") == std::string::npos) {
    }
    const std::string file = folder.path("session.json");
    const CommandResult result =
        runCommand(atBus({"record", file, "--duration", "300ms", "--sync", "10ms"}));
    EXPECT_EQ(result.exitCode, 0) << result;
    EXPECT_THAT(result.error, MatchesRegex(".*/session.json: [0-9]+ reports? and [0-9]+ settings, "
                                           "[0-9]+ bytes\n"));
    EXPECT_EQ(runCommand({"info", file}).exitCode, 0);
}

TEST_F(DaemonProgramTest, AFullDiskEndsARecordingFromTheDaemonWithAWholeFile) {
    DaemonUnderTest daemon(bus->address());
    daemon.source.plug(playedSurface("7", "sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture", true));
    while (runCommand(atBus({"stats"})).out.find("running") == std::string::npos) {
    }
    const std::string file = folder.path("session.json");
    const std::string errors = folder.path("errors");
    // No file may be longer than 20 blocks of 1024 bytes.
    const std::string line = "ulimit -f 20; exec '" + std::string(vexatouchProgram()) +
                             "' record '" + file + "' --bus '" + bus->address() + "' 2> '" +
                             errors + "'";
    const int status = std::system(("bash -c \"" + line + "\"").c_str());
    EXPECT_TRUE(endedWith(status, 1)) << status;
    EXPECT_THAT(contentOf(errors), MatchesRegex("vexatouch record: .*/session.json: cannot write: "
                                                "File too large; [0-9]+ frames are safe in it\n"));
    EXPECT_EQ(runCommand({"info", file}).exitCode, 0);
}

TEST_F(DaemonProgramTest, MonitorEndsAfterATime) {
    const DaemonUnderTest daemon(bus->address());
    EXPECT_EQ(runCommand(atBus({"monitor", "--json", "--duration", "20ms"})),
              (CommandResult{0, "", "watching 0 surfaces\n"}));
}

// Whoever asks how much there is does not end it, and Ctrl-C does.
TEST_F(DaemonProgramTest, ARecordingThatWaitsForTheBusOutlivesTheUserSignalAlone) {
    const std::string path = folder.path("silent");
    const Tools::FileDescriptor listening(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_un address{.sun_family = AF_UNIX, .sun_path = {}};
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    ASSERT_EQ(::bind(listening.get(), reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    ASSERT_EQ(::listen(listening.get(), 1), 0);
    ProgramRun record({"record", folder.path("session.json"), "--bus", "unix:path=" + path});
    const Tools::FileDescriptor silent(::accept(listening.get(), nullptr, nullptr));
    record.signal(SIGUSR1);
    record.signal(SIGTERM);
    const int status = record.end();
    EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGTERM) << status;
    EXPECT_THAT(folder.names(), ::testing::Not(::testing::Contains("session.json")));
}

TEST_F(DaemonProgramTest, MonitorPrintsTheEventsOfTheService) {
    DaemonUnderTest daemon(bus->address());
    const auto expected = Tools::readExpectedEvents(VEXA_SOURCE_DIR "/Examples/taps.events");
    ProgramRun monitor(atBus({"monitor", "--json", "--count", std::to_string(expected.size())}));
    ASSERT_TRUE(monitor.readErrorUntil("watching 0 surfaces"));
    daemon.source.plug(playedSurface("7", example("taps")));
    EXPECT_TRUE(endedWith(monitor.end(), 0));
    const std::vector<std::string> lines = linesOf(monitor.out());
    ASSERT_EQ(lines.size(), expected.size());
    for (std::size_t i = 0; i < lines.size(); ++i) {
        std::string members;
        Tools::appendEventMembers(members, expected[i]);
        EXPECT_THAT(lines[i], HasSubstr(members));
    }
}

TEST_F(DaemonProgramTest, MonitorEndsInOrderAtASignalAndWithTheDaemon) {
    DaemonUnderTest daemon(bus->address());
    ProgramRun interrupted(atBus({"monitor"}));
    ProgramRun left(atBus({"monitor"}));
    ASSERT_TRUE(interrupted.readErrorUntil("watching"));
    ASSERT_TRUE(left.readErrorUntil("watching"));
    interrupted.signal(SIGINT);
    EXPECT_TRUE(endedWith(interrupted.end(), 0));
    daemon.stop();
    EXPECT_TRUE(endedWith(left.end(), 1));
    EXPECT_THAT(left.error(), HasSubstr("the daemon has ended"));
}

TEST_F(DaemonProgramTest, CommandsReachTheOneSurfaceOrTheOneThatIsNamed) {
    DaemonUnderTest daemon(bus->address());
    const std::string key = "Pipeline.Algs.HoldTimeoutMilliseconds";
    EXPECT_THAT(runCommand(atBus({"get", key})).error, HasSubstr("no surface is plugged in"));
    daemon.source.plug(playedSurface("7", example("taps")));
    daemon.source.plug(playedSurface("8", example("taps")));
    while (linesOf(runCommand(atBus({"stats"})).out).size() < 2 ||
           runCommand(atBus({"stats"})).out.find("starting") != std::string::npos) {
    }
    EXPECT_THAT(runCommand(atBus({"get", key})).error, HasSubstr("name one with --surface: 1 2"));
    EXPECT_EQ(runCommand(atBus({"set", key, "300", "--surface", "2"})),
              (CommandResult{0, key + ": 300\n", ""}));
    EXPECT_EQ(runCommand(atBus({"get", key, "--surface", "2"})), (CommandResult{0, "300\n", ""}));
    EXPECT_EQ(runCommand(atBus({"get", key, "--surface", "1"})), (CommandResult{0, "500\n", ""}));
    EXPECT_EQ(runCommand(atBus({"get", key, "--surface", "3"})).exitCode, 1);
    EXPECT_EQ(runCommand(atBus({"monitor", "--surface", "2", "--duration", "1ms"})).error,
              "watching 1 surface\n");
    EXPECT_EQ(runCommand(atBus({"monitor", "--duration", "1ms"})).error, "watching 2 surfaces\n");
    const CommandResult stats = runCommand(atBus({"stats", "--json", "--surface", "1"}));
    EXPECT_EQ(stats.exitCode, 0);
    EXPECT_THAT(stats.out,
                AllOf(HasSubstr("\"Serial\": \"serial 7\""), HasSubstr("\"State\": \"running\"")));
}

TEST_F(DaemonProgramTest, ARecordingFromTheDaemonCanBeReplayed) {
    DaemonUnderTest daemon(bus->address());
    daemon.source.plug(playedSurface("7", "sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture", true));
    while (runCommand(atBus({"stats"})).out.find("running") == std::string::npos) {
    }
    const std::string file = folder.path("session.json");
    ProgramRun record(atBus({"record", file, "--count", "20"}));
    EXPECT_TRUE(endedWith(record.end(), 0)) << record.error();
    Tools::Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    std::size_t settings = 0;
    std::size_t reports = 0;
    for (const RecordedFrame& frame : Tools::readRecording(file, streams).frames) {
        ++(frame.type == RecordedFrame::Type::State ? settings : reports);
    }
    EXPECT_EQ(settings, 27U);
    EXPECT_EQ(reports, 20U);
    EXPECT_EQ(runCommand({"replay", file}).exitCode, 0);

    // The surface goes meanwhile: what came before is kept, and it is said.
    ProgramRun cut(atBus({"record", folder.path("cut.json")}));
    std::error_code none;
    while (!std::filesystem::exists(folder.path("cut.json"), none) ||
           contentOf(folder.path("cut.json")).find("InputReport") == std::string::npos) {
    }
    daemon.source.unplug("7");
    EXPECT_TRUE(endedWith(cut.end(), 1));
    EXPECT_THAT(cut.error(),
                ::testing::MatchesRegex(
                    ".*/cut.json: [0-9]+ reports? and 27 settings, [0-9]+ bytes\n"
                    "vexatouch record: the surface was unplugged, or the daemon has ended\n"));
    EXPECT_EQ(runCommand({"replay", folder.path("cut.json")}).exitCode, 0);
}

/// The policy as it is installed, for the users of this machine.
TEST_F(DaemonProgramTest, TheInstalledPolicyLetsNobodyIn) {
    if (geteuid() != 0) {
        GTEST_SKIP() << "only root can become another user";
    }
    // The accounts of the policy need not exist here.
    std::string policy = contentOf(VEXA_SOURCE_DIR "/data/dbus/org.vexatouch.Touch1.conf");
    policy = policy.substr(policy.find("<busconfig>") + std::strlen("<busconfig>"));
    policy = policy.substr(0, policy.find("</busconfig>"));
    const PrivateBus strict(std::string(PrivateBus::kNoPolicy) + policy);
    auto rights = DaemonUnderTest::rightsOfThisUser();
    rights.isOnSeat = [](uid_t) { return true; };
    const DaemonUnderTest daemon(strict.address(), rights);
    EXPECT_EQ(runCommand({"stats", "--bus", strict.address()}).exitCode, 0);
    const pid_t child = fork();
    if (child == 0) {
        constexpr uid_t kNobody = 65534;
        if (setresgid(kNobody, kNobody, kNobody) != 0 ||
            setresuid(kNobody, kNobody, kNobody) != 0) {
            _exit(126);
        }
        const CommandResult result = runCommand({"stats", "--bus", strict.address()});
        // Refused by the bus, before the daemon is asked, which would have let it in.
        _exit(result.exitCode == 1 &&
                      result.error.find("(org.freedesktop.DBus.Error.AccessDenied)") !=
                          std::string::npos &&
                      result.error.find("on a seat") == std::string::npos
                  ? 0
                  : 1);
    }
    int status = 0;
    waitpid(child, &status, 0);
    EXPECT_TRUE(endedWith(status, 0));
}

}  // namespace
}  // namespace VexaTouch::Testing
