#include "Tools/ReportWatch.h"

#include "Tools/RecordedDevice.h"

#include <gtest/gtest.h>

#include <chrono>
#include <list>
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

}  // namespace
}  // namespace VexaTouch::Tools
