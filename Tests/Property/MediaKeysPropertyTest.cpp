// Keys of random events of several surfaces, held to what a key is: down while anybody holds it.
//
// VEXA_PROPERTY_SEED repeats a run.

#include "Algorithm/Algs.h"
#include "Host/GestureEvent.h"
#include "Host/KeyMap.h"
#include "Host/MediaKeys.h"
#include "Tests/Support/FakeKeyboard.h"
#include "Tests/Support/SeededRandom.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <iostream>
#include <memory>
#include <optional>
#include <random>
#include <set>
#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using Host::EventKind;
using Host::GestureEvent;
using Host::KeyCode;
using Host::KeyGesture;
using Host::KeyMap;
using Host::MediaKeys;

std::uint64_t seedOfThisRun() {
    const char* text = std::getenv("VEXA_PROPERTY_SEED");
    const std::uint64_t seed =
        text != nullptr ? std::strtoull(text, nullptr, 10) : std::random_device{}();
    std::cout << "VEXA_PROPERTY_SEED=" << seed << '\n';
    return seed;
}

/// Any event that a plug-in may give, in any order, sensible or not.
Vexa::HidEvent anyEvent(SeededRandom& random) {
    const auto region = static_cast<PixelRegion>(random.between(0, 4));
    switch (random.between(0, 7)) {
        case 0:
            return Algs::createMayBeginEvent(region);
        case 1:
        case 2:
            return Algs::createHoldStartEvent(region);
        case 3:
            return Algs::createHoldChangeEvent(region);
        case 4:
            return Algs::createHoldEndEvent(region);
        case 5:
            return Algs::createTapEvent(region);
        case 6:
            return Algs::createCancelEvent();
        default:
            return Vexa::HidEvent::vendorDefined({.usagePage = 0xFF60, .usage = 2, .payload = {}});
    }
}

KeyMap anyMap(SeededRandom& random) {
    const std::vector<std::string> keys = {"KEY_MUTE", "KEY_VOLUMEUP", "KEY_NEXTSONG", "none"};
    KeyMap map;
    for (const Host::DefaultKey& each : Host::kDefaultKeys) {
        if (random.oneIn(2)) {
            map.assign(std::string(each.trigger) + '=' + random.oneOf(keys));
        }
    }
    return map;
}

/// A surface and the key that it should hold.
struct Surface {
    KeyMap map;
    std::unique_ptr<MediaKeys> keys;
    std::optional<KeyCode> held = {};
};

std::set<KeyCode> heldBy(const std::vector<Surface>& surfaces) {
    std::set<KeyCode> held;
    for (const Surface& surface : surfaces) {
        if (surface.held) {
            held.insert(*surface.held);
        }
    }
    return held;
}

/// How often a key was pressed.
std::size_t pressesIn(const std::string& text) {
    std::size_t presses = 0;
    for (const char c : text) {
        presses += c == '+' ? 1 : 0;
    }
    return presses;
}

void takeStep(SeededRandom& random, Surface& surface, const std::vector<Surface>& surfaces,
              TypedKeys& typed) {
    if (random.oneIn(10)) {
        surface.keys->releaseAll();
        surface.held.reset();
        ASSERT_EQ(pressesIn(typed.take()), 0U);
        return;
    }
    const Vexa::HidEvent event = anyEvent(random);
    const GestureEvent gesture = GestureEvent::of(event);
    const std::set<KeyCode> before = heldBy(surfaces);
    const bool holds =
        gesture.kind == EventKind::HoldStart || gesture.kind == EventKind::HoldChange;
    surface.held = holds ? surface.map.key(KeyGesture::Hold, gesture.region) : std::nullopt;
    surface.keys->handle(event);
    std::size_t presses = surface.held && !before.contains(*surface.held) ? 1 : 0;
    if (gesture.kind == EventKind::Tap) {
        const auto key = surface.map.key(KeyGesture::Tap, gesture.region);
        presses += key && !heldBy(surfaces).contains(*key) ? 1 : 0;
    }
    ASSERT_EQ(pressesIn(typed.take()), presses) << event.description();
}

TEST(MediaKeysPropertyTest, KeysAreDownWhileAnySurfaceHoldsThemAndNeverAfterReleaseAll) {
    SeededRandom random(seedOfThisRun());
    std::size_t mostDown = 0;
    for (int round = 0; round < 300; ++round) {
        TypedKeys typed;
        const auto keyboard = FakeKeyboard::shared(typed);
        std::vector<Surface> surfaces(static_cast<std::size_t>(random.between(1, 3)));
        for (Surface& surface : surfaces) {
            surface.map = anyMap(random);
            surface.keys = std::make_unique<MediaKeys>(surface.map, *keyboard);
        }
        for (int step = 0; step < 200; ++step) {
            takeStep(random, surfaces[random.next() % surfaces.size()], surfaces, typed);
            if (HasFatalFailure()) {
                return;
            }
            ASSERT_EQ(typed.wrong, "");
            ASSERT_FALSE(typed.unseen);
            ASSERT_EQ(typed.down, heldBy(surfaces));
            mostDown = std::max(mostDown, typed.down.size());
        }
        for (Surface& surface : surfaces) {
            surface.keys->releaseAll();
        }
        ASSERT_TRUE(typed.down.empty());
        ASSERT_EQ(typed.wrong, "");
    }
    EXPECT_EQ(mostDown, 3U);
}

TEST(MediaKeysPropertyTest, KeyboardThatFailsAtAnyWriteLeavesNothingDown) {
    SeededRandom random(seedOfThisRun());
    for (int round = 0; round < 300; ++round) {
        TypedKeys typed;
        typed.good = static_cast<std::size_t>(random.between(0, 40));
        const auto keyboard = FakeKeyboard::shared(typed);
        MediaKeys surface(anyMap(random), *keyboard);
        for (int step = 0; step < 100; ++step) {
            surface.handle(anyEvent(random));
        }
        surface.releaseAll();
        ASSERT_TRUE(typed.down.empty());
        ASSERT_EQ(typed.wrong, "");
        ASSERT_LE(typed.writes, *typed.good + 1);
        ASSERT_EQ(keyboard->takeFailure().has_value(), typed.writes > *typed.good);
    }
}

}  // namespace
}  // namespace VexaTouch::Testing
