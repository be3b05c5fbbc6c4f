#include "Tools/WakeUp.h"

#include <gtest/gtest.h>

#include <chrono>
#include <optional>
#include <thread>

namespace VexaTouch::Tools {
namespace {

TEST(WakeUpTest, NoticeBeforeTheWaitingIsNotLost) {
    const WakeUp wake;
    wake.notify();
    wake.notify();
    wake.wait(std::nullopt);  // else the test never ends
}

TEST(WakeUpTest, NoticesAreUsedUpByOneWaiting) {
    const WakeUp wake;
    wake.notify();
    wake.notify();
    wake.wait(std::nullopt);
    const auto until = std::chrono::steady_clock::now() + std::chrono::milliseconds(5);
    wake.wait(until);
    EXPECT_GE(std::chrono::steady_clock::now(), until);
}

TEST(WakeUpTest, AnotherThreadEndsTheWaiting) {
    const WakeUp wake;
    std::thread other([&] { wake.notify(); });
    wake.wait(std::nullopt);
    other.join();
}

TEST(WakeUpTest, TimeThatIsOverDoesNotWait) {
    const WakeUp wake;
    wake.wait(std::chrono::steady_clock::now() - std::chrono::hours(1));
}

}  // namespace
}  // namespace VexaTouch::Tools
