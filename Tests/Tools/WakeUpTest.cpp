#include "Tools/WakeUp.h"

#include "Tools/FileDescriptor.h"

#include <gtest/gtest.h>

#include <unistd.h>
#include <array>
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

TEST(WakeUpTest, AHangUpEndsTheWaiting) {
    const WakeUp wake;
    std::array<int, 2> ends{};
    ASSERT_EQ(pipe(ends.data()), 0);
    const FileDescriptor reader(ends[0]);
    FileDescriptor writer(ends[1]);
    wake.notify();
    EXPECT_FALSE(wake.wait(std::nullopt, reader.get()));
    // What can be read is no hang-up.
    ASSERT_EQ(write(writer.get(), "x", 1), 1);
    EXPECT_FALSE(wake.wait(std::chrono::steady_clock::now(), reader.get()));
    writer = FileDescriptor();
    EXPECT_TRUE(wake.wait(std::nullopt, reader.get()));
}

TEST(WakeUpTest, TimeThatIsOverDoesNotWait) {
    const WakeUp wake;
    wake.wait(std::chrono::steady_clock::now() - std::chrono::hours(1));
}

}  // namespace
}  // namespace VexaTouch::Tools
