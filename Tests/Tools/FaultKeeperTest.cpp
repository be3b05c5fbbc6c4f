#include "Tools/FaultKeeper.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <fstream>
#include <ostream>
#include <sstream>
#include <streambuf>
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

/// Every write fails, for the reason that it has now.
class Failing final : public std::streambuf {
public:
    int reason = 0;

protected:
    std::streamsize xsputn(const char* /*text*/, std::streamsize /*length*/) override {
        errno = reason;
        return 0;
    }
};

TEST(FaultKeeperTest, KeepsWhyTheFirstWriteFailed) {
    Failing buffer;
    std::ostream stream(&buffer);
    const FaultKeeper fault(stream);
    buffer.reason = ENOSPC;
    stream << "text";
    EXPECT_FALSE(stream.good());
    stream.clear();
    buffer.reason = EPERM;
    stream << "more";
    EXPECT_EQ(fault.error(), ENOSPC);
}

TEST(FaultKeeperTest, KnowsWhyAFileIsNotWritten) {
    std::ofstream full("/dev/full");
    const FaultKeeper fault(full);
    full << "text" << std::flush;
    EXPECT_EQ(fault.error(), ENOSPC);
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
