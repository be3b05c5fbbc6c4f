#include "Host/KeyName.h"

#include <gtest/gtest.h>
#include <linux/input-event-codes.h>

#include <string>

namespace VexaTouch::Host {
namespace {

TEST(KeyNameTest, NamesAreTheKernels) {
    EXPECT_EQ(keyFromName("KEY_PLAYPAUSE"), KEY_PLAYPAUSE);
    EXPECT_EQ(keyFromName("KEY_ESC"), 1);
    EXPECT_EQ(keyFromName("KEY_ASSISTANT"), KEY_ASSISTANT);
    EXPECT_EQ(keyName(KEY_NEXTSONG), "KEY_NEXTSONG");
}

TEST(KeyNameTest, EveryKeyWithANameIsFoundByIt) {
    int named = 0;
    for (KeyCode key = 1; key <= kHighestKey; ++key) {
        const std::string_view name = keyName(key);
        if (name.starts_with("KEY_")) {
            ++named;
            EXPECT_EQ(keyFromName(name), key) << name;
        } else {
            EXPECT_TRUE(name.empty() || name.starts_with("BTN_")) << name;
            EXPECT_EQ(keyFromName(name), std::nullopt) << name;
        }
    }
    EXPECT_GT(named, 400);
}

TEST(KeyNameTest, WhatIsNoKeyHasNoNumber) {
    for (const std::string text :
         {"", "KEY_", "KEY_RESERVED", "KEY_MAX", "KEY_CNT", "BTN_LEFT", "REL_X", "PLAYPAUSE",
          "key_playpause", "KEY_PLAYPAUSE ", " KEY_PLAYPAUSE", "KEY_PLAYPAUSEX", "164", "none"}) {
        EXPECT_EQ(keyFromName(text), std::nullopt) << '"' << text << '"';
    }
    EXPECT_EQ(keyFromName(std::string_view("KEY_PLAYPAUSE\0", 14)), std::nullopt);
    EXPECT_EQ(keyFromName(std::string_view("KEY_PLAYPAUSE").substr(0, 8)), KEY_PLAY);
    EXPECT_EQ(keyFromName(std::string(100'000, 'K')), std::nullopt);
}

TEST(KeyNameTest, NumbersWithoutANameHaveNone) {
    EXPECT_EQ(keyName(0x2FE), "");
    EXPECT_EQ(keyName(0xFFFF), "");
}

}  // namespace
}  // namespace VexaTouch::Host
