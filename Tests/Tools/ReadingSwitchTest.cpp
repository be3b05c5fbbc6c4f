#include "Tools/ReadingSwitch.h"

#include <gtest/gtest.h>

namespace VexaTouch::Tools {
namespace {

TEST(ReadingSwitchTest, IsOnUntilItIsFinished) {
    ReadingSwitch reading;
    reading.turn(true);
    EXPECT_TRUE(reading.waitUntilOn());
    reading.turn(false);
    reading.turn(true);
    EXPECT_TRUE(reading.waitUntilOn());
    reading.finish();
    EXPECT_FALSE(reading.waitUntilOn());
}

// A device may go on sending, and its reader's turns with it, while the reader is being ended.
TEST(ReadingSwitchTest, FinishedIsFinal) {
    ReadingSwitch reading;
    reading.turn(true);
    reading.finish();
    reading.turn(true);
    ASSERT_FALSE(reading.waitUntilOn());
    reading.turn(false);
    EXPECT_FALSE(reading.waitUntilOn());
}

}  // namespace
}  // namespace VexaTouch::Tools
