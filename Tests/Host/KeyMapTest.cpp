#include "Host/KeyMap.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Host {
namespace {

using ::testing::ElementsAre;

/// What is said about the text, which must be refused and change nothing.
std::string refusal(const std::string& text) {
    KeyMap map;
    try {
        map.assign(text);
    } catch (const std::invalid_argument& error) {
        EXPECT_EQ(map, KeyMap()) << text;
        return error.what();
    }
    return "taken";
}

TEST(KeyMapTest, DefaultsAreTheTableAndItsNamesFit) {
    const KeyMap map;
    std::set<std::string_view> triggers;
    for (const DefaultKey& each : kDefaultKeys) {
        EXPECT_EQ(keyName(each.key), each.name);
        EXPECT_EQ(map.key(each.gesture, each.region), each.key);
        EXPECT_EQ(each.trigger,
                  std::string(keyGestureName(each.gesture)) + ':' + std::to_string(each.region));
        EXPECT_TRUE(triggers.insert(each.trigger).second);
    }
    EXPECT_THAT(map.keys(),
                ElementsAre(KEY_VOLUMEDOWN, KEY_VOLUMEUP, KEY_PLAYPAUSE, KEY_ASSISTANT));
}

TEST(KeyMapTest, HoldsTheKeysThatGesturesAreKnownBy) {
    const KeyMap map;
    EXPECT_EQ(map.key(KeyGesture::Tap, 1), KEY_PLAYPAUSE);
    EXPECT_EQ(map.key(KeyGesture::Tap, 2), KEY_VOLUMEDOWN);
    EXPECT_EQ(map.key(KeyGesture::Tap, 3), KEY_VOLUMEUP);
    EXPECT_EQ(map.key(KeyGesture::Hold, 1), KEY_ASSISTANT);
    EXPECT_EQ(map.key(KeyGesture::Hold, 2), KEY_VOLUMEDOWN);
    EXPECT_EQ(map.key(KeyGesture::Hold, 3), KEY_VOLUMEUP);
}

TEST(KeyMapTest, OtherRegionsSendNothing) {
    for (const std::uint32_t region : {0U, 4U, 4294967295U}) {
        EXPECT_EQ(KeyMap().key(KeyGesture::Tap, region), std::nullopt);
        EXPECT_EQ(KeyMap().key(KeyGesture::Hold, region), std::nullopt);
    }
}

TEST(KeyMapTest, AssigningChangesThatGestureAlone) {
    KeyMap map;
    map.assign("tap:1=KEY_NEXTSONG");
    map.assign("hold:3=none");
    EXPECT_EQ(map.key(KeyGesture::Tap, 1), KEY_NEXTSONG);
    EXPECT_EQ(map.key(KeyGesture::Hold, 3), std::nullopt);
    EXPECT_EQ(map.key(KeyGesture::Tap, 2), KEY_VOLUMEDOWN);
    EXPECT_EQ(map.key(KeyGesture::Tap, 3), KEY_VOLUMEUP);
    EXPECT_EQ(map.key(KeyGesture::Hold, 1), KEY_ASSISTANT);
    EXPECT_EQ(map.key(KeyGesture::Hold, 2), KEY_VOLUMEDOWN);
    EXPECT_THAT(map.keys(), ElementsAre(KEY_VOLUMEDOWN, KEY_VOLUMEUP, KEY_NEXTSONG, KEY_ASSISTANT));
    map.assign("tap:1=KEY_MUTE");
    EXPECT_EQ(map.key(KeyGesture::Tap, 1), KEY_MUTE);
}

TEST(KeyMapTest, MapWithoutAnyKeyHasNone) {
    KeyMap map;
    for (const DefaultKey& each : kDefaultKeys) {
        map.assign(std::string(each.trigger) + "=none");
    }
    EXPECT_THAT(map.keys(), ElementsAre());
}

TEST(KeyMapTest, RefusalSaysWhichPartIsWrong) {
    const std::string noGesture = ", only tap and hold";
    const std::string noRegion = ", only 1 (play), 2 (volume down) and 3 (volume up)";
    const std::string names =
        "; keys have the kernel's names, such as KEY_NEXTSONG (linux/input-event-codes.h), and "
        "none sends no key";
    const std::string form =
        "GESTURE:REGION=KEY is needed, such as tap:1=KEY_NEXTSONG or hold:1=none";
    const std::vector<std::pair<std::string, std::string>> cases = {
        {"", form},
        {"tap:1", form},
        {"=KEY_A", "there is no gesture \"\"" + noGesture},
        {"swipe:1=KEY_A", "there is no gesture \"swipe\"" + noGesture},
        {"Tap:1=KEY_A", "there is no gesture \"Tap\"" + noGesture},
        {" tap:1=KEY_A", "there is no gesture \" tap\"" + noGesture},
        {"tap=KEY_A", "the region is missing: tap:1, tap:2 or tap:3"},
        {"hold=KEY_A", "the region is missing: hold:1, hold:2 or hold:3"},
        {"tap:=KEY_A", "there is no region \"\"" + noRegion},
        {"tap:0=KEY_A", "there is no region \"0\"" + noRegion},
        {"hold:4=KEY_A", "there is no region \"4\"" + noRegion},
        {"tap:01=KEY_A", "there is no region \"01\"" + noRegion},
        {"tap:1 =KEY_A", "there is no region \"1 \"" + noRegion},
        {"tap:1=", "there is no key \"\"" + names},
        {"tap:1=KEY_NOTHING", "there is no key \"KEY_NOTHING\"" + names},
        {"tap:1=BTN_LEFT", "there is no key \"BTN_LEFT\"" + names},
        {"tap:1=KEY_MAX", "there is no key \"KEY_MAX\"" + names},
        {"tap:1=164", "there is no key \"164\"" + names},
        {"tap:1=KEY_A=KEY_B", "there is no key \"KEY_A=KEY_B\"" + names},
        {"tap:1=nextsong", "there is no key \"nextsong\"; KEY_NEXTSONG is meant?"},
        {"tap:1=Key_NextSong", "there is no key \"Key_NextSong\"; KEY_NEXTSONG is meant?"},
    };
    for (const auto& [text, expected] : cases) {
        EXPECT_EQ(refusal(text), expected);
    }
}

}  // namespace
}  // namespace VexaTouch::Host
