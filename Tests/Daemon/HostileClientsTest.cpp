// Callers who send too much, take nothing or never leave.

#include "Shared/InputReport.h"
#include "Tests/Daemon/DaemonUnderTest.h"
#include "Tests/Support/Sanitized.h"
#include "Tests/Tools/ProgramRun.h"
#include "Tests/Tools/RecordedSession.h"
#include "Tools/Daemon/BusNames.h"
#include "Tools/PlayedDevice.h"
#include "Tools/Replay.h"

#include <gmock/gmock.h>
#include <sys/eventfd.h>

#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <latch>
#include <limits>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::AnyOf;
using Tools::Daemon::Bus;
using Tools::Daemon::BusError;
using Tools::Daemon::BusMessage;
using Tools::Daemon::BusSlot;
using Tools::Daemon::DaemonClient;
using Vexa::PropertyValue;
namespace BusNames = Tools::Daemon::BusNames;
namespace ErrorName = Tools::Daemon::ErrorName;

/// So many taps, quickly one after the other.
RecordedSession tapping(int taps) {
    RecordedSession session;
    for (int i = 0; i < taps; ++i) {
        session.feel(touch("H").at(350).with("I", 150).forMs(50)).feel(nothing().forMs(100));
    }
    return session;
}

/// How many gestures the service makes of it.
std::uint64_t gesturesOf(const RecordedSession& session) {
    FrameList frames;
    for (const auto& frame : session.frames()) {
        frames.push_back(frame);
    }
    Tools::Replay replay(std::move(frames));
    while (replay.canContinue()) {
        replay.next();
    }
    return replay.counts().events;
}

class HostileClientsTest : public ::testing::Test {
protected:
    void SetUp() override {
        if (!PrivateBus::isThere()) {
            GTEST_SKIP() << PrivateBus::kProgram << " is missing: script/bootstrap installs it";
        }
        setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1);
    }
    ~HostileClientsTest() override { unsetenv("VEXATOUCH_PLUGIN"); }

    const std::string first = BusNames::devicePath(1);
};

TEST_F(HostileClientsTest, WhatDoesNotGoToTheBusIsCountedAndTold) {
    const PrivateBus bus;
    DaemonUnderTest daemon(bus.address());
    const RecordedSession session = tapping(3000);
    const std::uint64_t gestures = gesturesOf(session);
    ASSERT_GT(gestures, 2 * Tools::Daemon::SurfaceInstance::kMostGestures);
    std::uint64_t heard = 0;
    std::uint64_t lost = 0;
    std::uint64_t losses = 0;
    Tools::Daemon::EventLoop loop;
    Bus watcher(bus.address());
    const auto slot =
        watcher.match(std::string("type='signal',interface='") + BusNames::kDevice + '\'',
                      [&](BusMessage signal) {
                          if (signal.member() == "GesturesLost") {
                              EXPECT_EQ(signal.path(), first);
                              lost += signal.readNumber64();
                              ++losses;
                          } else {
                              heard += signal.member() == "Gesture" ? 1 : 0;
                          }
                          if (heard + lost == gestures) {
                              loop.stop();
                          }
                      });
    watcher.attach(loop, [&] { loop.stop(); });

    // It begins to play when the daemon's loop is held, and has come to its end when it goes on.
    auto gate = std::make_shared<std::latch>(1);
    auto surface = playedSurface("7", example("taps"));
    surface.open = [gate, frames = session.frames()] {
        return std::make_shared<Tools::PlayedDevice>(
            [gate, frames](const Tools::PlayedDevice::FrameSink& sink) {
                gate->wait();
                for (const auto& frame : frames) {
                    sink(frame);
                }
            },
            Tools::PlayedPace{.speed = std::numeric_limits<double>::infinity()},
            Tools::SurfaceIdentity{}, Vexa::HostClock::system());
    };
    daemon.source.plug(surface);
    DaemonClient client(bus.address());
    while (client.devices().empty() ||
           client.devices().front().properties.member("State") != PropertyValue("running")) {
    }
    daemon.call([&](Tools::Daemon::Daemon& under) {
        gate->count_down();
        while (under.reports() < session.frames().size()) {
            std::this_thread::yield();
        }
    });
    loop.run();
    EXPECT_GT(losses, 0U);
    EXPECT_GE(lost, gestures / 4);
    EXPECT_EQ(heard + lost, gestures);
    EXPECT_EQ(client.statistics(first).member("GesturesDropped"), PropertyValue(lost));
}

/// The daemon as a program of its own, whose memory can be looked at.
class HostileProgramTest : public HostileClientsTest {
protected:
    void serve(const std::string& device, const std::string& busLimits = {}) {
        bus.emplace(std::string(PrivateBus::kNoPolicy) + busLimits);
        daemon.emplace(std::vector<std::string>{"daemon", "--no-keys", "--device", device, "--bus",
                                                bus->address()});
        ASSERT_TRUE(daemon->readErrorUntil(": running"));
        client.emplace(bus->address());
    }
    [[nodiscard]] std::uint64_t reports() {
        return client->statistics(first).member("Reports").toUnsigned64();
    }
    /// "VmRSS", "VmHWM" or "VmData" of the daemon, in KiB.
    [[nodiscard]] std::size_t memory(const std::string& name) const {
        std::ifstream status("/proc/" + std::to_string(daemon->process()) + "/status");
        for (std::string line; std::getline(status, line);) {
            if (line.starts_with(name + ':')) {
                return std::stoul(line.substr(name.size() + 1));
            }
        }
        ADD_FAILURE() << "no " << name;
        return 0;
    }
    /// That somebody else is served, that reports go on being taken, and that what was taken from
    /// the system meanwhile was given back, at no time having been more than this.
    void expectNoHarm(std::size_t mostMiB) {
        EXPECT_EQ(client->get(first, "Pipeline.Algs.HoldTimeoutMilliseconds"), PropertyValue(500U));
        const std::uint64_t before = reports();
        while (reports() == before) {
        }
        if (!kSanitized) {
            EXPECT_LT(memory("VmHWM"), mostMiB * 1024);
            EXPECT_LT(memory("VmRSS"), kMostAtRestKiB);
        }
    }
    [[nodiscard]] BusMessage call(const Bus& from, const char* member) const {
        return from.call(BusNames::kService, first, BusNames::kDevice, member);
    }

    /// What the daemon may have with one surface, and some slack for what its threads keep.
    static constexpr std::size_t kMostAtRestKiB = 16 * 1024;
    static constexpr const char* kEndless = "sim";

    std::optional<PrivateBus> bus;
    std::optional<ProgramRun> daemon;
    std::optional<DaemonClient> client;
};

TEST_F(HostileProgramTest, HugeKeysValuesAndMessagesAreRefusedOneByOne) {
    serve(kEndless);
    // Nearly as much as the bus takes; each takes long where every byte is checked.
    constexpr std::size_t kHuge = std::size_t{kSanitized ? 2 : 30} << 20U;
    Bus hostile(bus->address());
    Tools::Daemon::EventLoop loop;
    std::vector<BusSlot> slots;
    std::vector<std::string> answers;
    const auto send = [&](const BusMessage& message) {
        slots.push_back(hostile.askLater(
            message, [&](const BusMessage&) { ADD_FAILURE() << "taken"; },
            [&](const BusError& error) {
                answers.push_back(error.name());
                if (answers.size() == slots.size()) {
                    loop.stop();
                }
            }));
    };
    for (int i = 0; i < 2; ++i) {
        BusMessage key = call(hostile, "Get");
        key.string(std::string(kHuge, 'k'));
        send(key);
        BusMessage text = call(hostile, "Set");
        text.string("Product").value(std::string(kHuge, 'x'));
        send(text);
        BusMessage bytes = call(hostile, "Set");
        bytes.string("Product").value(PropertyValue::Bytes(kHuge));
        send(bytes);
        // Four bytes each in the message.
        BusMessage nothing = call(hostile, "Set");
        nothing.string("Product").value(PropertyValue::Array(kHuge / 32, PropertyValue::null()));
        send(nothing);
    }
    hostile.attach(loop, [&] { loop.stop(); });
    loop.run();
    EXPECT_EQ(answers.size(), 8U);
    for (const std::string& answer : answers) {
        EXPECT_THAT(answer, AnyOf(ErrorName::kUnknownKey, ErrorName::kInvalidValue));
    }
    expectNoHarm(3 * 32 + 16);
}

TEST_F(HostileProgramTest, WhoTakesNoAnswersCostsNoMemory) {
    serve(kEndless);
    while (reports() < 100) {
    }
    // Everything that gives much, and never read.
    Bus hostile(bus->address());
    for (int i = 0; i < 3000; ++i) {
        BusMessage get = call(hostile, "Get");
        get.string("ServicePluginDebug");
        static_cast<void>(hostile.send(get));
        static_cast<void>(hostile.send(call(hostile, "GetRecording")));
        static_cast<void>(hostile.send(call(hostile, "RecordStream")));
        static_cast<void>(hostile.send(call(hostile, "GetStatistics")));
    }
    expectNoHarm(64);
}

TEST_F(HostileProgramTest, StreamsThatAreOverTakeNoMemory) {
    serve(kEndless);
    const auto streams = [this] {
        return client->statistics(first).member("RecordStreams").toUnsigned64();
    };
    // Whatever the first one of all takes. A ring that is not used yet is mapped and not resident.
    static_cast<void>(client->recordStream(first));
    while (streams() > 0) {
    }
    const std::size_t before = memory("VmData");
    {
        std::vector<Tools::FileDescriptor> readers;
        for (std::size_t i = 0; i < Tools::Daemon::RecordStreams::kMost; ++i) {
            readers.push_back(client->recordStream(first));
        }
        if (!kSanitized) {
            EXPECT_GT(memory("VmData"), before + 1024);
        }
    }
    while (streams() > 0) {
    }
    if (!kSanitized) {
        EXPECT_LT(memory("VmData"), before + 1024);
    }
}

TEST_F(HostileProgramTest, WhoNeverReadsTheirSignalsIsTheBusesAffair) {
    const TemporaryFolder folder;
    const RecordedSession session = tapping(2000);
    const std::string file = folder.file("taps.json", session.text());
    // Less than what comes.
    bus.emplace(std::string(PrivateBus::kNoPolicy) +
                "<limit name=\"max_outgoing_bytes\">65536</limit>");
    Bus deaf(bus->address());
    const auto slot =
        deaf.match("type='signal',interface='org.vexatouch.Touch1.Device'", [](BusMessage) {});
    daemon.emplace(std::vector<std::string>{"daemon", "--no-keys", "--device",
                                            "recording:" + file + "@max", "--bus", bus->address()});
    ASSERT_TRUE(daemon->readErrorUntil(": running"));
    client.emplace(bus->address());
    while (reports() < session.frames().size()) {
    }
    while (client->statistics(first).member("Gestures").toUnsigned64() +
               client->statistics(first).member("GesturesDropped").toUnsigned64() <
           gesturesOf(session)) {
    }
    EXPECT_EQ(client->get(first, "Pipeline.Algs.HoldTimeoutMilliseconds"), PropertyValue(500U));
    if (!kSanitized) {
        EXPECT_LT(memory("VmHWM"), 64U * 1024);
    }
}

/// They would be kept as long as the call waits, and there are not many to be had.
TEST_F(HostileClientsTest, TheInstalledPolicyLetsNoDescriptorsThrough) {
    std::string policy = contentOf(VEXA_SOURCE_DIR "/data/dbus/org.vexatouch.Touch1.conf");
    policy = policy.substr(policy.find("<busconfig>") + std::string("<busconfig>").size());
    policy = policy.substr(0, policy.find("</busconfig>"));
    if (geteuid() != 0) {
        GTEST_SKIP() << "the policy lets root own the name";
    }
    const PrivateBus bus(std::string(PrivateBus::kNoPolicy) + policy);
    const DaemonUnderTest daemon(bus.address());
    Bus hostile(bus.address());
    BusMessage call =
        hostile.call(BusNames::kService, BusNames::kManagerPath, BusNames::kManager, "ListDevices");
    EXPECT_NO_THROW(hostile.ask(call));
    BusMessage loaded =
        hostile.call(BusNames::kService, BusNames::kManagerPath, BusNames::kManager, "ListDevices");
    loaded.descriptor(Tools::FileDescriptor(eventfd(0, EFD_CLOEXEC)));
    try {
        hostile.ask(loaded);
        ADD_FAILURE() << "taken";
    } catch (const BusError& error) {
        EXPECT_EQ(error.name(), ErrorName::kAccessDenied);
    }
}

}  // namespace
}  // namespace VexaTouch::Testing
