#include "Host/StatusText.h"

#include <gtest/gtest.h>

namespace VexaTouch::Host {
namespace {

TEST(StatusTextTest, KnownStatusHasItsNumberAndItsName) {
    EXPECT_EQ(statusText(VEXA_STATUS_SUCCESS), "0x00000000 (success)");
    EXPECT_EQ(statusText(VEXA_STATUS_NO_RESOURCES), "0xE00002BE (no resources)");
    EXPECT_EQ(statusText(VEXA_STATUS_GONE), "0xA7510003 (unplugged)");
}

TEST(StatusTextTest, UnknownStatusIsItsNumber) {
    EXPECT_EQ(statusText(0xDEADBEEF), "0xDEADBEEF");
}

}  // namespace
}  // namespace VexaTouch::Host
