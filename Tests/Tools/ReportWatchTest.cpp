#include "Tools/ReportWatch.h"

#include "Tools/RecordedDevice.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <list>
#include <optional>
#include <string>
#include <thread>

namespace VexaTouch::Tools {
namespace {

constexpr int kReports = 30;
constexpr int kLooks = 10;

/// A device that has sent its reports to somebody who has not read any.
class ReportWatchTest : public ::testing::Test {
protected:
    void SetUp() override {
        int descriptor = -1;
        ASSERT_EQ(device.open(0, descriptor), VEXA_STATUS_SUCCESS);
        reader = FileDescriptor(descriptor);
        while (device.sent() < kReports) {
            std::this_thread::yield();
        }
    }
    void handle(int reports) {
        for (int report = 0; report < reports; ++report) {
            device.reportHandled();
        }
    }

    RecordedDevice device{std::list<RecordedFrame>(kReports), RecordedDevice::kAsFastAsTaken};
    FileDescriptor reader;
    ReportWatch watch{device, std::chrono::seconds(5)};
};

TEST_F(ReportWatchTest, LooksAreSpreadOverThePatience) {
    EXPECT_EQ(watch.interval(), std::chrono::milliseconds(500));
}

TEST_F(ReportWatchTest, ReportsThatNobodyTakesEndThePatience) {
    for (int look = 1; look < kLooks; ++look) {
        EXPECT_FALSE(watch.look()) << look;
    }
    EXPECT_TRUE(watch.look());
    EXPECT_TRUE(watch.look());
}

// The process was stopped: the service has had no time either.
TEST_F(ReportWatchTest, ALateLookIsFollowedByAWholeInterval) {
    const auto start = ReportWatch::Time() + std::chrono::hours(1);
    EXPECT_FALSE(watch.lookIfDue(start));
    EXPECT_EQ(watch.nextLook(), start + watch.interval());
    const auto late = start + std::chrono::minutes(10);
    for (int look = 0; look < 2 * kLooks; ++look) {
        EXPECT_FALSE(watch.lookIfDue(late)) << look;
        EXPECT_EQ(watch.nextLook(), late + watch.interval());
    }
    for (int look = 2; look < kLooks; ++look) {
        EXPECT_FALSE(watch.lookIfDue(watch.nextLook())) << look;
    }
    EXPECT_TRUE(watch.lookIfDue(watch.nextLook()));
}

TEST_F(ReportWatchTest, AServiceThatTakesOneInTimeHasAllTheTimeForTheNext) {
    for (int report = 1; report < kReports; ++report) {
        for (int look = 1; look < kLooks; ++look) {
            EXPECT_FALSE(watch.look()) << look << " after " << report;
        }
        handle(1);
        EXPECT_FALSE(watch.look());
    }
    for (int look = 1; look < kLooks; ++look) {
        EXPECT_FALSE(watch.look()) << look;
    }
    EXPECT_TRUE(watch.look());
}

TEST_F(ReportWatchTest, AServiceThatHasTakenAllIsNotWaitedFor) {
    handle(kReports);
    for (int look = 0; look < 10 * kLooks; ++look) {
        EXPECT_FALSE(watch.look());
    }
}

/// A live device: of what it has nothing is known but what was read.
class LiveDevice final : public ObservedDevice {
public:
    void setHooks(DeviceHooks) override {}
    [[nodiscard]] std::uint64_t sent() const noexcept override { return read; }
    [[nodiscard]] std::uint64_t handled() const noexcept override { return done; }
    [[nodiscard]] bool isServed() const noexcept override { return served; }
    [[nodiscard]] std::string tally() const override { return {}; }
    vexa_status open(std::uint32_t, int&) noexcept override { return VEXA_STATUS_UNSUPPORTED; }

    std::uint64_t read = 0;
    std::uint64_t done = 0;
    bool served = false;
};

/// How many looks it takes to give up; none: more than any patience.
std::optional<int> looksInVain(ReportWatch& watch) {
    for (int look = 1; look <= 10 * kLooks; ++look) {
        if (watch.look()) {
            return look;
        }
    }
    return std::nullopt;
}

TEST(ReportWatchOfALiveDeviceTest, OneThatNobodyReadsEndsThePatience) {
    LiveDevice device;
    ReportWatch watch(device, std::chrono::seconds(5));
    EXPECT_EQ(looksInVain(watch), kLooks);
}

TEST(ReportWatchOfALiveDeviceTest, OneThatSendsNothingIsWaitedFor) {
    LiveDevice device;
    device.served = true;
    ReportWatch watch(device, std::chrono::seconds(5));
    EXPECT_EQ(looksInVain(watch), std::nullopt);
    device.read = 7;
    device.done = 7;
    EXPECT_EQ(looksInVain(watch), std::nullopt);
}

TEST(ReportWatchOfALiveDeviceTest, AReaderThatStartsInTimeOrEndsLaterIsSeen) {
    LiveDevice device;
    ReportWatch watch(device, std::chrono::seconds(5));
    for (int look = 1; look < kLooks; ++look) {
        EXPECT_FALSE(watch.look());
    }
    device.served = true;
    EXPECT_EQ(looksInVain(watch), std::nullopt);
    device.read = 3;
    device.done = 3;
    EXPECT_FALSE(watch.look());
    device.served = false;
    EXPECT_EQ(looksInVain(watch), kLooks);
}

TEST(ReportWatchOfALiveDeviceTest, AReportThatIsNotDoneWithEndsThePatience) {
    LiveDevice device;
    device.served = true;
    device.read = 4;
    device.done = 3;
    ReportWatch watch(device, std::chrono::seconds(5));
    EXPECT_FALSE(watch.look());  // three of them were handled before it
    EXPECT_EQ(looksInVain(watch), kLooks);
}

}  // namespace
}  // namespace VexaTouch::Tools
