#include "Tools/Daemon/Watchdog.h"

#include "Tests/Daemon/DaemonUnderTest.h"
#include "Tests/Daemon/ServiceManager.h"
#include "Tools/ForwardingDevice.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdlib>
#include <future>
#include <memory>
#include <optional>
#include <string>
#include <utility>

namespace VexaTouch::Testing {
namespace {

using ::testing::HasSubstr;

/// A device in whose reports the input thread can be held.
class HeldDevice final : public Tools::ForwardingDevice {
public:
    using ForwardingDevice::ForwardingDevice;

    /// Returns when the input thread is held.
    void hold() {
        wanted_ = true;
        held_.get_future().get();
    }
    void release() { released_.set_value(); }

    void reportHandled() noexcept override {
        ForwardingDevice::reportHandled();
        if (wanted_.exchange(false)) {
            held_.set_value();
            released_.get_future().get();
        }
    }

private:
    std::atomic<bool> wanted_ = false;
    std::promise<void> held_;
    std::promise<void> released_;
};

class WatchdogTest : public ::testing::Test {
protected:
    static constexpr auto kPing = std::chrono::milliseconds(2);

    void SetUp() override {
        if (!PrivateBus::isThere()) {
            GTEST_SKIP() << PrivateBus::kProgram << " is missing: script/bootstrap installs it";
        }
        bus.emplace();
        setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1);
        manager.emplace(folder.path("notify"), "4000");
        daemon.emplace(bus->address());
    }
    ~WatchdogTest() override { unsetenv("VEXATOUCH_PLUGIN"); }

    /// Plugs a surface whose reports come for ever and waits until its input thread is held.
    std::shared_ptr<HeldDevice> plugAndHold(const std::string& id) {
        auto surface = playedSurface(id, "sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture", true);
        auto opened = std::make_shared<std::promise<std::shared_ptr<HeldDevice>>>();
        surface.open = [open = surface.open, opened] {
            auto device = std::make_shared<HeldDevice>(open());
            opened->set_value(device);
            return device;
        };
        daemon->source.plug(std::move(surface));
        auto device = opened->get_future().get();
        // One that has not begun is not asked yet.
        Tools::Daemon::DaemonClient client(bus->address());
        const auto isRunning = [&] {
            const auto all = client.devices();
            return std::ranges::any_of(all, [&](const auto& each) {
                return each.properties.member("Serial") == Vexa::PropertyValue("serial " + id) &&
                       each.properties.member("State") == Vexa::PropertyValue("running");
            });
        };
        while (!isRunning()) {
        }
        device->hold();
        return device;
    }
    /// What the manager hears while ten pings would have been due.
    std::string heardInTenPings() {
        // What was answered before is told before.
        daemon->call([](Tools::Daemon::Daemon&) {});
        static_cast<void>(manager->heard());
        daemon->waitForTicks(10, kPing);
        return manager->heard();
    }

    TemporaryFolder folder;
    std::optional<PrivateBus> bus;
    std::optional<ServiceManager> manager;
    std::optional<DaemonUnderTest> daemon;
};

TEST_F(WatchdogTest, IsSilentWhileAnInputThreadIsStuckAndGoesOnWhenItAnswers) {
    manager->heardUntil("WATCHDOG=1");
    const auto device = plugAndHold("7");
    EXPECT_EQ(heardInTenPings(), "");
    device->release();
    manager->heardUntil("WATCHDOG=1");
    EXPECT_THAT(heardInTenPings(), HasSubstr("WATCHDOG=1"));
}

TEST_F(WatchdogTest, ASurfaceThatAnswersDoesNotSpeakForOneThatIsStuck) {
    daemon->source.plug(playedSurface("8", "sim:" VEXA_SOURCE_DIR "/Examples/taps.gesture", true));
    const auto device = plugAndHold("7");
    // The round that was under way may still end; no other one does.
    static_cast<void>(heardInTenPings());
    EXPECT_EQ(heardInTenPings(), "");
    // Unplugged, it is taken down and waited for, and nobody says that all is well meanwhile.
    daemon->source.unplug("7");
    EXPECT_EQ(heardInTenPings(), "");
    device->release();
    manager->heardUntil("WATCHDOG=1");
}

TEST_F(WatchdogTest, AnUnplugBetweenTwoPingsHidesNoThreadThatIsStuck) {
    daemon.reset();
    // The surface is unplugged before anybody is asked for the first time.
    manager.emplace(folder.path("late"), "600000000");
    daemon.emplace(bus->address());
    const auto device = plugAndHold("7");
    daemon->source.unplug("7");
    Tools::Daemon::DaemonClient client(bus->address());
    while (!client.devices().empty()) {
    }
    std::promise<void> answered;
    auto answer = answered.get_future();
    daemon->call([&](Tools::Daemon::Daemon& under) { under.ping([&] { answered.set_value(); }); });
    // What was posted by then has been taken.
    daemon->call([](Tools::Daemon::Daemon&) {});
    EXPECT_EQ(answer.wait_for(std::chrono::seconds(0)), std::future_status::timeout);
    device->release();
    answer.get();
}

TEST_F(WatchdogTest, WithoutAManagerThatWantsItNothingWakes) {
    daemon.reset();
    manager.reset();
    manager.emplace(folder.path("other"));
    daemon.emplace(bus->address());
    EXPECT_EQ(heardInTenPings(), "");
}

}  // namespace
}  // namespace VexaTouch::Testing
