// The program itself: the daemon as a service and the commands that talk to it.

#include "Tests/Daemon/DaemonUnderTest.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/ProgramRun.h"
#include "Tools/Daemon/BusNames.h"
#include "Tools/EventRecord.h"
#include "Tools/RecordingFile.h"

#include <gmock/gmock.h>

#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::StartsWith;

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

/// The socket of a service manager.
class Manager {
public:
    explicit Manager(const std::string& path) : socket_(::socket(AF_UNIX, SOCK_DGRAM, 0)) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
        if (::bind(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) !=
            0) {
            throw std::runtime_error("no socket");
        }
    }
    /// Reads what it is told until it is told this.
    std::string heardUntil(const std::string& wanted) const {
        std::string all;
        while (all.find(wanted) == std::string::npos) {
            std::array<char, 512> text{};
            const ssize_t got = ::recv(socket_.get(), text.data(), text.size(), 0);
            all.append(text.data(), got > 0 ? static_cast<std::size_t>(got) : 0).append("\n");
        }
        return all;
    }

private:
    Tools::FileDescriptor socket_;
};

TEST_F(DaemonProgramTest, TellsItsManagerWhatItServesAndThatItLives) {
    const std::string path = folder.path("notify");
    const Manager manager(path);
    setenv("NOTIFY_SOCKET", path.c_str(), 1);
    setenv("WATCHDOG_USEC", "20000", 1);
    ProgramRun daemon(daemonOn("sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture"));
    unsetenv("NOTIFY_SOCKET");
    unsetenv("WATCHDOG_USEC");
    EXPECT_THAT(manager.heardUntil("WATCHDOG=1"),
                AllOf(StartsWith("READY=1\n"), HasSubstr("STATUS=1 surface, ")));
    ASSERT_TRUE(
        daemon.readErrorUntil("surface 1, sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture: running"));
    daemon.signal(SIGTERM);
    manager.heardUntil("STOPPING=1");
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
    EXPECT_THAT(none.error, HasSubstr("no daemon: the bus unix:path=/nowhere does not answer"));
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
    while (runCommand(atBus({"stats"})).out.find("RecordStreams: 1") == std::string::npos) {
    }
    daemon.source.unplug("7");
    EXPECT_TRUE(endedWith(cut.end(), 1));
    EXPECT_THAT(cut.error(), HasSubstr("the surface was unplugged, or the daemon has ended"));
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
