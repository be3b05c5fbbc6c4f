#include "Host/SharedKeyboard.h"

#include "Tests/Support/FakeKeyboard.h"

#include <gtest/gtest.h>
#include <linux/input-event-codes.h>

#include <optional>
#include <string>

namespace VexaTouch::Host {
namespace {

using Testing::FakeKeyboard;
using Testing::TypedKeys;

class SharedKeyboardTest : public ::testing::Test {
protected:
    TypedKeys typed;
    std::unique_ptr<SharedKeyboard> keyboard = FakeKeyboard::shared(typed);
};

TEST_F(SharedKeyboardTest, TapIsSeenAsAPressAndThenARelease) {
    keyboard->tap(KEY_A);
    EXPECT_EQ(typed.take(), "+KEY_A | -KEY_A |");
    EXPECT_EQ(keyboard->takeFailure(), std::nullopt);
}

TEST_F(SharedKeyboardTest, ExchangeReleasesBeforeItPressesAndIsSeenAsOne) {
    keyboard->exchange(std::nullopt, KEY_A);
    EXPECT_EQ(typed.take(), "+KEY_A |");
    keyboard->exchange(KEY_A, KEY_B);
    EXPECT_EQ(typed.take(), "-KEY_A +KEY_B |");
    keyboard->exchange(KEY_B, std::nullopt);
    EXPECT_EQ(typed.take(), "-KEY_B |");
}

TEST_F(SharedKeyboardTest, ExchangeForTheSameLeavesItAlone) {
    keyboard->exchange(std::nullopt, std::nullopt);
    EXPECT_EQ(typed.take(), "");
    keyboard->exchange(std::nullopt, KEY_A);
    typed.take();
    keyboard->exchange(KEY_A, KEY_A);
    EXPECT_EQ(typed.take(), "");
    keyboard->exchange(KEY_A, std::nullopt);
    EXPECT_EQ(typed.take(), "-KEY_A |");
}

TEST_F(SharedKeyboardTest, KeyIsDownWhileAnybodyHoldsIt) {
    keyboard->exchange(std::nullopt, KEY_A);
    keyboard->exchange(std::nullopt, KEY_A);
    EXPECT_EQ(typed.take(), "+KEY_A |");
    keyboard->exchange(KEY_A, KEY_B);
    EXPECT_EQ(typed.take(), "+KEY_B |");
    keyboard->exchange(KEY_A, std::nullopt);
    EXPECT_EQ(typed.take(), "-KEY_A |");
}

TEST_F(SharedKeyboardTest, TapOfAHeldKeyDoesNotReleaseIt) {
    keyboard->exchange(std::nullopt, KEY_A);
    typed.take();
    keyboard->tap(KEY_A);
    EXPECT_EQ(typed.take(), "");
    keyboard->exchange(KEY_A, std::nullopt);
    EXPECT_EQ(typed.take(), "-KEY_A |");
}

TEST_F(SharedKeyboardTest, EveryKeyCanBeHeld) {
    keyboard->tap(1);
    keyboard->exchange(std::nullopt, kHighestKey);
    EXPECT_EQ(typed.down, std::set<KeyCode>{kHighestKey});
    keyboard->exchange(kHighestKey, std::nullopt);
    EXPECT_TRUE(typed.down.empty());
}

TEST_F(SharedKeyboardTest, FailedKeyboardIsToldOfOnceAndNeverWrittenToAgain) {
    // It would be written to nine times, each of which may be the first to fail.
    for (std::size_t good = 0; good < 9; ++good) {
        SCOPED_TRACE(good);
        TypedKeys lost;
        lost.good = good;
        const auto failing = FakeKeyboard::shared(lost);
        failing->tap(KEY_A);
        failing->exchange(std::nullopt, KEY_B);
        failing->exchange(KEY_B, KEY_C);
        EXPECT_TRUE(lost.gone) << "its owner keeps keys down";
        EXPECT_EQ(lost.writes, good + 1);
        failing->exchange(KEY_C, std::nullopt);
        failing->tap(KEY_A);
        EXPECT_EQ(lost.writes, good + 1);
        EXPECT_EQ(failing->takeFailure(),
                  "the keyboard is gone, no more keys are sent: No such device");
        EXPECT_EQ(failing->takeFailure(), std::nullopt);
        EXPECT_TRUE(lost.down.empty());
        EXPECT_EQ(lost.wrong, "");
    }
}

}  // namespace
}  // namespace VexaTouch::Host
