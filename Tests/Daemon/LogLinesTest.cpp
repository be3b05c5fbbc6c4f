#include "Tools/Daemon/LogLines.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <future>
#include <ostream>
#include <sstream>
#include <string>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

/// What nobody reads until it is allowed.
class Unread final : public std::stringbuf {
public:
    void allow() { allowed_.set_value(); }

protected:
    int sync() override {
        if (std::exchange(isFirst_, false)) {
            allowed_.get_future().get();
        }
        return 0;
    }

private:
    bool isFirst_ = true;
    std::promise<void> allowed_;
};

TEST(LogLinesTest, LinesArriveWholeAndInTheirOrder) {
    std::ostringstream to;
    {
        LogLines lines(to);
        std::ostream log(&lines);
        log << "surface " << 1 << ": running" << std::endl;
        log << "surface " << 1 << ": unplugged" << std::endl;
    }
    EXPECT_EQ(to.str(), "surface 1: running\nsurface 1: unplugged\n");
}

TEST(LogLinesTest, WhoeverWritesNeverWaitsAndWhatWasDroppedIsTold) {
    Unread unread;
    std::ostream to(&unread);
    std::string expected;
    {
        LogLines lines(to);
        std::ostream log(&lines);
        for (std::size_t i = 0; i < LogLines::kMostWaiting + 10; ++i) {
            const std::string line = "line " + std::to_string(i) + '\n';
            log << line << std::flush;
            expected += i < LogLines::kMostWaiting ? line : "";
        }
        unread.allow();
    }
    EXPECT_EQ(unread.str(),
              expected + "vexatouch daemon: lines dropped because nobody read those before: 10\n");
}

}  // namespace
}  // namespace VexaTouch::Tools::Daemon
