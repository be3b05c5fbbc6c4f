#include "Tools/ReportTap.h"

#include <gmock/gmock.h>

#include <cstdint>
#include <numeric>
#include <span>
#include <thread>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;

using Reports = std::vector<std::vector<std::uint8_t>>;

Reports drained(ReportTap& tap) {
    Reports reports;
    const std::size_t count = tap.drain([&](std::span<const std::uint8_t> report) {
        reports.emplace_back(report.begin(), report.end());
    });
    EXPECT_EQ(count, reports.size());
    return reports;
}

void putNumber(ReportTap& tap, std::uint32_t number) {
    const std::vector<std::uint8_t> report = {static_cast<std::uint8_t>(number),
                                              static_cast<std::uint8_t>(number >> 8U),
                                              static_cast<std::uint8_t>(number >> 16U)};
    tap.put(report);
}

TEST(ReportTapTest, GivesReportsOnceInTheirOrder) {
    ReportTap tap;
    EXPECT_THAT(drained(tap), IsEmpty());
    tap.put(std::vector<std::uint8_t>{1, 2});
    tap.put({});
    EXPECT_THAT(drained(tap), ElementsAre(ElementsAre(1, 2), IsEmpty()));
    tap.put(std::vector<std::uint8_t>{3});
    EXPECT_THAT(drained(tap), ElementsAre(ElementsAre(3)));
    EXPECT_THAT(drained(tap), IsEmpty());
}

TEST(ReportTapTest, KeepsTheBeginningOfALongReport) {
    ReportTap tap;
    std::vector<std::uint8_t> report(ReportTap::kLongestReport + 1);
    std::iota(report.begin(), report.end(), std::uint8_t{0});
    tap.put(report);
    report.pop_back();
    EXPECT_EQ(drained(tap), Reports{report});
}

TEST(ReportTapTest, LeavesOutAndCountsWhatFindsNoRoom) {
    ReportTap tap;
    for (std::uint32_t i = 0; i < ReportTap::kCapacity + 3; ++i) putNumber(tap, i);
    EXPECT_EQ(tap.lost(), 3U);
    const Reports reports = drained(tap);
    ASSERT_EQ(reports.size(), ReportTap::kCapacity);
    EXPECT_THAT(reports.front(), ElementsAre(0, 0, 0));
    EXPECT_THAT(reports.back(), ElementsAre(255, 0, 0));
    putNumber(tap, 7);
    EXPECT_THAT(drained(tap), ElementsAre(ElementsAre(7, 0, 0)));
    EXPECT_EQ(tap.lost(), 3U);
}

TEST(ReportTapTest, OneThreadPutsWhileAnotherTakes) {
    constexpr std::uint32_t kReports = 100'000;
    ReportTap tap;
    std::thread putting([&tap] {
        for (std::uint32_t i = 0; i < kReports; ++i) putNumber(tap, i);
    });
    std::uint64_t taken = 0;
    std::int64_t last = -1;
    while (taken + tap.lost() < kReports) {
        taken += tap.drain([&last](std::span<const std::uint8_t> report) {
            ASSERT_EQ(report.size(), 3U);
            const std::int64_t number = report[0] | report[1] << 8 | report[2] << 16;
            EXPECT_GT(number, last);
            last = number;
        });
    }
    putting.join();
}

}  // namespace
}  // namespace VexaTouch::Tools
