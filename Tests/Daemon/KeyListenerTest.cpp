#include "Tools/Daemon/KeyListener.h"

#include "Algorithm/Algs.h"
#include "Tests/Daemon/DaemonUnderTest.h"
#include "Tests/Support/FakeKeyboard.h"
#include "Tools/Daemon/DaemonClient.h"

#include <gmock/gmock.h>

#include <memory>
#include <optional>
#include <string>

namespace VexaTouch::Testing {
namespace {

using Tools::Daemon::KeyListener;

class KeyListenerTest : public ::testing::Test {
protected:
    ~KeyListenerTest() override { EXPECT_EQ(typed.wrong, ""); }

    /// The begin of a hold in region 1.
    static Vexa::HidEvent hold() { return Algs::createHoldStartEvent(1); }

    TypedKeys typed;
    std::unique_ptr<Host::SharedKeyboard> keyboard = FakeKeyboard::shared(typed);
};

TEST_F(KeyListenerTest, AKeyThatIsHeldIsLetGoOfWhenTheSurfaceEnds) {
    KeyListener listener(Host::KeyMap(), *keyboard);
    listener.handle(hold());
    EXPECT_EQ(typed.take(), "+KEY_ASSISTANT |");
    listener.surfaceEnding();
    EXPECT_EQ(typed.take(), "-KEY_ASSISTANT |");
    // What was on its way still comes, and goes with the surface.
    listener.handle(hold());
    EXPECT_EQ(typed.take(), "+KEY_ASSISTANT |");
    listener.surfaceGone();
    EXPECT_EQ(typed.take(), "-KEY_ASSISTANT |");
}

TEST_F(KeyListenerTest, AKeyboardThatFailsIsToldOfOnce) {
    KeyListener one(Host::KeyMap(), *keyboard);
    KeyListener other(Host::KeyMap(), *keyboard);
    typed.good = 0;
    EXPECT_EQ(one.takeFailure(), std::nullopt);
    one.handle(hold());
    EXPECT_THAT(other.takeFailure().value_or(""),
                ::testing::StartsWith("the keyboard is gone, no more keys are sent: "));
    EXPECT_EQ(one.takeFailure(), std::nullopt);
}

TEST_F(KeyListenerTest, TheDaemonTellsOfAKeyboardThatFailsAsSoonAsItDoes) {
    if (!PrivateBus::isThere()) {
        GTEST_SKIP() << PrivateBus::kProgram << " is missing: script/bootstrap installs it";
    }
    typed.good = 0;
    const PrivateBus bus;
    LogOfLines log;
    std::ostream stream(&log);
    DaemonUnderTest daemon(
        bus.address(),
        Tools::Daemon::DaemonOptions{
            .rights = DaemonUnderTest::rightsOfThisUser(),
            .listener = [&] { return std::make_unique<KeyListener>(Host::KeyMap(), *keyboard); }},
        VEXATOUCH_PLUGIN_FILE, &stream);
    daemon.source.plug(playedSurface("7", "recording:" VEXA_SOURCE_DIR "/Examples/taps.json@max"));
    log.waitFor("vexatouch daemon: the keyboard is gone, no more keys are sent: ");
    // While the surface is still served.
    daemon.call([](const Tools::Daemon::Daemon& under) { EXPECT_EQ(under.surfaces(), 1U); });
    daemon.stop();
    EXPECT_EQ(log.count("the keyboard is gone"), 1U);
}

}  // namespace
}  // namespace VexaTouch::Testing
