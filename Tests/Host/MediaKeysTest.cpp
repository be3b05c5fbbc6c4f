#include "Host/MediaKeys.h"

#include "Algorithm/Algs.h"
#include "Tests/Support/FakeKeyboard.h"
#include "Tests/Support/SeededRandom.h"

#include <gtest/gtest.h>

#include <optional>
#include <random>
#include <string>
#include <thread>
#include <vector>

namespace VexaTouch::Host {
namespace {

using Testing::FakeKeyboard;
using Testing::SeededRandom;
using Testing::TypedKeys;

Vexa::HidEvent firmwareReset() {
    return Vexa::HidEvent::vendorDefined({.usagePage = 0xFF60, .usage = 2, .payload = {}});
}

class MediaKeysTest : public ::testing::Test {
protected:
    ~MediaKeysTest() override {
        EXPECT_EQ(typed.wrong, "");
        EXPECT_FALSE(typed.unseen);
    }

    /// What the event makes the surface type.
    std::string after(const Vexa::HidEvent& event) { return after(keys, event); }
    std::string after(MediaKeys& surface, const Vexa::HidEvent& event) {
        surface.handle(event);
        return typed.take();
    }
    static KeyMap mapWith(const std::vector<std::string>& changes) {
        KeyMap map;
        for (const std::string& change : changes) {
            map.assign(change);
        }
        return map;
    }

    TypedKeys typed;
    std::unique_ptr<SharedKeyboard> keyboard = FakeKeyboard::shared(typed);
    MediaKeys keys{KeyMap(), *keyboard};
};

TEST_F(MediaKeysTest, TapPressesAndReleases) {
    EXPECT_EQ(after(Algs::createMayBeginEvent(1)), "");
    EXPECT_EQ(after(Algs::createTapEvent(1)), "+KEY_PLAYPAUSE | -KEY_PLAYPAUSE |");
    EXPECT_EQ(after(Algs::createTapEvent(2)), "+KEY_VOLUMEDOWN | -KEY_VOLUMEDOWN |");
    EXPECT_EQ(after(Algs::createTapEvent(3)), "+KEY_VOLUMEUP | -KEY_VOLUMEUP |");
}

TEST_F(MediaKeysTest, HoldKeepsItsKeyDownUntilItEnds) {
    const std::vector<std::string> names = {"KEY_ASSISTANT", "KEY_VOLUMEDOWN", "KEY_VOLUMEUP"};
    for (PixelRegion region = 1; region <= 3; ++region) {
        EXPECT_EQ(after(Algs::createMayBeginEvent(region)), "");
        EXPECT_EQ(after(Algs::createHoldStartEvent(region)), '+' + names[region - 1] + " |");
        EXPECT_EQ(after(Algs::createHoldEndEvent(region)), '-' + names[region - 1] + " |");
    }
}

TEST_F(MediaKeysTest, HoldEndReleasesWhateverIsHeld) {
    // Where the finger is when it lifts does not matter.
    after(Algs::createHoldStartEvent(2));
    EXPECT_EQ(after(Algs::createHoldEndEvent(0)), "-KEY_VOLUMEDOWN |");
    after(Algs::createHoldStartEvent(2));
    EXPECT_EQ(after(Algs::createHoldEndEvent(3)), "-KEY_VOLUMEDOWN |");
}

TEST_F(MediaKeysTest, HoldChangeReleasesOneAndPressesTheOther) {
    after(Algs::createHoldStartEvent(1));
    EXPECT_EQ(after(Algs::createHoldChangeEvent(3)), "-KEY_ASSISTANT +KEY_VOLUMEUP |");
    EXPECT_EQ(after(Algs::createHoldChangeEvent(2)), "-KEY_VOLUMEUP +KEY_VOLUMEDOWN |");
    EXPECT_EQ(after(Algs::createHoldChangeEvent(0)), "-KEY_VOLUMEDOWN |");
    EXPECT_EQ(after(Algs::createHoldChangeEvent(1)), "+KEY_ASSISTANT |");
    EXPECT_EQ(after(Algs::createHoldEndEvent(1)), "-KEY_ASSISTANT |");
}

TEST_F(MediaKeysTest, HoldThatMovesBetweenRegionsOfOneKeyKeepsItDown) {
    MediaKeys surface(mapWith({"hold:2=KEY_MUTE", "hold:3=KEY_MUTE"}), *keyboard);
    EXPECT_EQ(after(surface, Algs::createHoldStartEvent(2)), "+KEY_MUTE |");
    EXPECT_EQ(after(surface, Algs::createHoldChangeEvent(3)), "");
    EXPECT_EQ(after(surface, Algs::createHoldEndEvent(3)), "-KEY_MUTE |");
}

TEST_F(MediaKeysTest, CancelAndFirmwareResetAndAnotherTouchRelease) {
    for (const Vexa::HidEvent& event :
         {Algs::createCancelEvent(), firmwareReset(), Algs::createMayBeginEvent(1)}) {
        after(Algs::createHoldStartEvent(3));
        EXPECT_EQ(after(event), "-KEY_VOLUMEUP |");
        EXPECT_EQ(after(event), "");
    }
}

TEST_F(MediaKeysTest, TapAndHoldStartAfterAHoldWhoseEndWasLostReleaseIt) {
    after(Algs::createHoldStartEvent(2));
    EXPECT_EQ(after(Algs::createTapEvent(1)),
              "-KEY_VOLUMEDOWN | +KEY_PLAYPAUSE | -KEY_PLAYPAUSE |");
    after(Algs::createHoldStartEvent(2));
    EXPECT_EQ(after(Algs::createHoldStartEvent(1)), "-KEY_VOLUMEDOWN +KEY_ASSISTANT |");
    keys.releaseAll();
    typed.take();
}

TEST_F(MediaKeysTest, GesturesWithoutAKeyOrARegionSendNothing) {
    MediaKeys surface(mapWith({"tap:1=none", "hold:1=none"}), *keyboard);
    for (const Vexa::HidEvent& event :
         {Algs::createTapEvent(1), Algs::createHoldStartEvent(1), Algs::createHoldEndEvent(1),
          Algs::createTapEvent(0), Algs::createHoldStartEvent(0), Algs::createHoldEndEvent(0),
          Vexa::HidEvent::digitizer({.y = 4}), Vexa::HidEvent::digitizer({.y = -1})}) {
        EXPECT_EQ(after(surface, event), "");
    }
    EXPECT_EQ(after(surface, Algs::createHoldStartEvent(1)), "");
    EXPECT_EQ(after(surface, Algs::createHoldChangeEvent(2)), "+KEY_VOLUMEDOWN |");
    EXPECT_EQ(after(surface, Algs::createHoldChangeEvent(1)), "-KEY_VOLUMEDOWN |");
}

TEST_F(MediaKeysTest, ChangedMapIsUsed) {
    MediaKeys surface(mapWith({"tap:1=KEY_NEXTSONG", "hold:2=KEY_REWIND"}), *keyboard);
    EXPECT_EQ(after(surface, Algs::createTapEvent(1)), "+KEY_NEXTSONG | -KEY_NEXTSONG |");
    EXPECT_EQ(after(surface, Algs::createHoldStartEvent(2)), "+KEY_REWIND |");
    surface.releaseAll();
    EXPECT_EQ(typed.take(), "-KEY_REWIND |");
}

TEST_F(MediaKeysTest, ReleaseAllAndTheEndLeaveNothingDown) {
    after(Algs::createHoldStartEvent(1));
    keys.releaseAll();
    EXPECT_EQ(typed.take(), "-KEY_ASSISTANT |");
    keys.releaseAll();
    EXPECT_EQ(typed.take(), "");
    {
        MediaKeys other(KeyMap(), *keyboard);
        other.handle(Algs::createHoldStartEvent(3));
        EXPECT_EQ(typed.take(), "+KEY_VOLUMEUP |");
    }
    EXPECT_EQ(typed.take(), "-KEY_VOLUMEUP |");
}

TEST_F(MediaKeysTest, SurfacesDoNotReleaseEachOthersKeys) {
    MediaKeys other(KeyMap(), *keyboard);
    EXPECT_EQ(after(keys, Algs::createHoldStartEvent(3)), "+KEY_VOLUMEUP |");
    EXPECT_EQ(after(other, Algs::createHoldStartEvent(3)), "");
    EXPECT_EQ(after(other, Algs::createHoldEndEvent(3)), "");
    EXPECT_EQ(after(other, Algs::createTapEvent(3)), "");
    EXPECT_EQ(after(other, Algs::createTapEvent(2)), "+KEY_VOLUMEDOWN | -KEY_VOLUMEDOWN |");
    EXPECT_EQ(after(other, firmwareReset()), "");
    other.releaseAll();
    EXPECT_EQ(typed.take(), "");
    EXPECT_EQ(after(keys, Algs::createHoldEndEvent(3)), "-KEY_VOLUMEUP |");
}

TEST_F(MediaKeysTest, KeyboardThatFailsInAHoldLeavesNothingDown) {
    for (std::size_t good = 0; good < 4; ++good) {
        TypedKeys lost;
        lost.good = good;
        const auto failing = FakeKeyboard::shared(lost);
        MediaKeys surface(KeyMap(), *failing);
        surface.handle(Algs::createHoldStartEvent(2));
        surface.handle(Algs::createHoldEndEvent(2));
        surface.handle(Algs::createTapEvent(1));
        EXPECT_TRUE(lost.gone);
        EXPECT_EQ(lost.writes, good + 1);
        EXPECT_NE(failing->takeFailure(), std::nullopt);
    }
}

TEST_F(MediaKeysTest, SurfacesOnThreadsOfTheirOwnShareTheKeyboard) {
    const std::uint64_t seed = std::random_device()();
    SCOPED_TRACE("seed " + std::to_string(seed));
    {
        std::vector<std::jthread> surfaces;
        for (std::uint64_t number = 0; number < 3; ++number) {
            surfaces.emplace_back([&, number] {
                SeededRandom random(seed + number);
                MediaKeys surface(KeyMap(), *keyboard);
                for (int i = 0; i < 2000; ++i) {
                    const auto region = static_cast<PixelRegion>(random.between(1, 3));
                    surface.handle(random.oneIn(2)   ? Algs::createHoldStartEvent(region)
                                   : random.oneIn(2) ? Algs::createHoldEndEvent(region)
                                                     : Algs::createTapEvent(region));
                }
            });
        }
        // Of a surface that stays, from another thread than its own.
        for (int i = 0; i < 2000; ++i) {
            keys.releaseAll();
        }
    }
    EXPECT_TRUE(typed.down.empty());
}

}  // namespace
}  // namespace VexaTouch::Host
