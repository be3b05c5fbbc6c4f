#include "Tools/FaultKeeper.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <fstream>
#include <sstream>
#include <string>

namespace VexaTouch::Tools {
namespace {

TEST(FaultKeeperTest, LetsEverythingThrough) {
    std::ostringstream text;
    {
        FaultKeeper fault(text);
        text << "one " << 2 << std::string(3, '3') << std::flush;
        text.put('\n');
        EXPECT_EQ(fault.error(), 0);
    }
    text << "four";
    EXPECT_EQ(text.str(), "one 2333\nfour");
}

TEST(FaultKeeperTest, KeepsWhyTheFirstWriteFailed) {
    std::ofstream full("/dev/full");
    {
        FaultKeeper fault(full);
        full << "text" << std::flush;
        errno = EPERM;
        full << "more" << std::flush;
        EXPECT_EQ(fault.error(), ENOSPC);
    }
    EXPECT_FALSE(full.good());
}

TEST(FaultKeeperTest, LeavesAFailedStreamFailed) {
    std::ostringstream text;
    text.setstate(std::ios::badbit);
    {
        FaultKeeper fault(text);
        EXPECT_TRUE(text.bad());
    }
    EXPECT_TRUE(text.bad());
}

}  // namespace
}  // namespace VexaTouch::Tools
