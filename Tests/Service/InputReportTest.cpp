// The road of a report, from the device to the pipeline and its probes.

#include "Platform/HostClock.h"
#include "Tests/Support/EventMatchers.h"
#include "Tests/Support/LeakCheck.h"
#include "Tests/Support/LogCapture.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"
#include "Tests/Support/TraceCapture.h"

#include "Pipeline/PipelineRecording.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using Vexa::PropertyValue;

using Reports = std::vector<std::vector<std::uint8_t>>;

class InputReportTest : public testing::Test {
protected:
    InputReportTest() { stand.startUp(); }
    ~InputReportTest() override { stand.tearDown(); }

    static Reports images(const std::vector<std::uint32_t>& frames) {
        Reports reports;
        for (const std::uint32_t frame : frames) {
            reports.push_back(imageReport(nothing(), frame, 10'000 + 10 * frame));
        }
        return reports;
    }
    [[nodiscard]] std::uint64_t disjointImages() const {
        return stand.service.get("DisjointImageCount").toUnsigned64();
    }
    /// The lines, without the one that tells of a report's arrival: its time is the host's.
    static std::vector<LogLine> withoutArrivals(std::vector<LogLine> lines) {
        std::erase_if(lines, [](const LogLine& line) {
            return line.text.starts_with("Received input report (");
        });
        return lines;
    }

    ServiceStand stand{VEXATOUCH_PLUGIN_FILE};
};

TEST_F(InputReportTest, AMissingFrameIsCounted) {
    ASSERT_TRUE(stand.feed(images({5, 6, 8, 9})));
    EXPECT_EQ(disjointImages(), 1U);
}

TEST_F(InputReportTest, FrameNumbersWrap) {
    ASSERT_TRUE(stand.feed(images({0xFFFFFFFE, 0xFFFFFFFF, 0, 1})));
    EXPECT_EQ(disjointImages(), 0U);
}

TEST_F(InputReportTest, RepeatedAndReturningFramesAreCounted) {
    ASSERT_TRUE(stand.feed(images({0, 0, 1, 0xFFFFFFFF, 1, 2})));
    EXPECT_EQ(disjointImages(), 3U);
}

TEST_F(InputReportTest, TheFirstImageOfARunIsNeverDisjoint) {
    ASSERT_TRUE(stand.feed(images({77})));
    stand.service.unschedule(stand.queue);
    stand.service.schedule(stand.queue);
    ASSERT_TRUE(stand.feed(images({5, 6})));
    EXPECT_EQ(disjointImages(), 0U);
    ASSERT_TRUE(stand.feed(images({9})));
    EXPECT_EQ(disjointImages(), 1U);
    stand.service.unschedule(stand.queue);
    stand.service.schedule(stand.queue);
    // Counted for as long as the service lives.
    EXPECT_EQ(disjointImages(), 1U);
    EXPECT_TRUE(stand.service.set("DisjointImageCount", 0));
    EXPECT_EQ(disjointImages(), 1U);
    stand.tearDown();
    stand.startUp();
    EXPECT_EQ(disjointImages(), 1U);
}

TEST_F(InputReportTest, OnlyImagesHaveAPlaceInTheSequence) {
    ASSERT_TRUE(stand.feed(images({5})));
    ASSERT_TRUE(stand.feed({{}, {9}, firmwareReport(1), firmwareReport(0), {1, 2, 3}}));
    ASSERT_TRUE(stand.feed(images({6})));
    EXPECT_EQ(disjointImages(), 0U);
}

TEST_F(InputReportTest, ADisjointImageIsLoggedAsAnError) {
    LogCapture log;
    ASSERT_TRUE(stand.feed(images({0xFFFFFFFF, 3})));
    EXPECT_THAT(withoutArrivals(log.take()),
                ElementsAre(debug("Input report probe"), debug("Input report probe"),
                            error("Disjoint image (frame number: 4294967295 -> 3) ***\n\n")));
}

TEST_F(InputReportTest, EachArrivalIsLoggedWithItsTime) {
    LogCapture log;
    const std::uint64_t before = Vexa::HostClock::system().now();
    ASSERT_TRUE(stand.feed({{0xC8, 1, 2}, {}}));
    const std::uint64_t after = Vexa::HostClock::system().now();
    const std::vector<LogLine> lines = log.take();
    const std::vector<std::string> beginnings = {
        "Received input report (type 0, reportID 200, reportLength 3, timestampMach ",
        "Received input report (type 0, reportID 0, reportLength 0, timestampMach "};
    std::size_t arrivals = 0;
    for (const LogLine& line : lines) {
        if (!line.text.starts_with("Received")) continue;
        ASSERT_LT(arrivals, beginnings.size());
        const std::string& beginning = beginnings[arrivals++];
        ASSERT_TRUE(line.text.starts_with(beginning)) << line;
        EXPECT_EQ(line.level, Vexa::LogLevel::Debug);
        EXPECT_TRUE(line.text.ends_with(")"));
        const std::uint64_t time = std::stoull(line.text.substr(beginning.size()));
        EXPECT_GE(time, before);
        EXPECT_LE(time, after);
    }
    EXPECT_EQ(arrivals, 2U);
}

TEST_F(InputReportTest, AnArrivalIsLoggedBeforeItsProbes) {
    LogCapture log;
    ASSERT_TRUE(stand.feed({{9}, firmwareReport(1)}));
    std::vector<LogLine> lines = log.take();
    for (LogLine& line : lines) line.text = line.text.substr(0, line.text.find(", timestampMach"));
    EXPECT_THAT(lines,
                ElementsAre(debug("Received input report (type 0, reportID 9, reportLength 1"),
                            debug("Input report probe"), debug("Invalid input report with ID 9"),
                            debug("Received input report (type 0, reportID 2, reportLength 10"),
                            debug("Input report probe"),
                            info("Firmware event probe; event: 1, context: 0")));
}

TEST_F(InputReportTest, InvalidReportsAreLogged) {
    LogCapture log;
    ASSERT_TRUE(stand.feed({{}, {7}, {1, 2}, {2, 0}}));
    EXPECT_THAT(withoutArrivals(log.take()),
                ElementsAre(debug("Input report probe"), debug("Invalid input report len==0"),
                            debug("Input report probe"), debug("Invalid input report with ID 7"),
                            debug("Input report probe"), debug("Invalid input report with ID 1"),
                            debug("Input report probe"), debug("Invalid input report with ID 2")));
}

TEST_F(InputReportTest, AFirmwareEventIsLoggedAsOneBigEndianNumber) {
    LogCapture log;
    TraceCapture trace;
    ASSERT_TRUE(stand.feed({firmwareReport(0xAB, {0x01, 0x23, 0x45, 0x67, 0x89, 0xAB, 0xCD, 0xEF}),
                            firmwareReport(1, {0xFF, 0, 0, 0, 0, 0, 0, 1})}));
    EXPECT_THAT(withoutArrivals(log.take()),
                ElementsAre(debug("Input report probe"),
                            info("Firmware event probe; event: ab, context: 123456789abcdef"),
                            debug("Input report probe"),
                            info("Firmware event probe; event: 1, context: ff00000000000001")));
    EXPECT_THAT(trace.take(), ElementsAre(TracePoint{0x2B150180, {2, 0xAB, 0x01, 0x23}},
                                          TracePoint{0x2B15018C, {0xAB, 0x0123456789ABCDEF, 0, 0}},
                                          TracePoint{0x2B150180, {2, 1, 0xFF, 0}},
                                          TracePoint{0x2B15018C, {1, 0xFF00000000000001, 0, 0}}));
    EXPECT_THAT(stand.events.take(), IsEmpty());
}

TEST_F(InputReportTest, ShortReportsAreTracedWithZeroBytes) {
    TraceCapture trace;
    ASSERT_TRUE(stand.feed({{1, 2, 3, 4}, {}, {9}, {9, 8}, {9, 8, 7}, {9, 8, 7, 6, 5}}));
    EXPECT_THAT(
        trace.take(),
        ElementsAre(TracePoint{0x2B150180, {1, 2, 3, 4}}, TracePoint{0x2B150180, {0, 0, 0, 0}},
                    TracePoint{0x2B150180, {9, 0, 0, 0}}, TracePoint{0x2B150180, {9, 8, 0, 0}},
                    TracePoint{0x2B150180, {9, 8, 7, 0}}, TracePoint{0x2B150180, {9, 8, 7, 6}}));
}

TEST_F(InputReportTest, ReportsOfEveryLengthAreRecordedUpToTheBuffersSize) {
    Reports reports;
    for (const std::size_t length : {0U, 1U, 72U, 73U, 74U, 511U, 512U}) {
        reports.emplace_back(length, static_cast<std::uint8_t>(200));
    }
    const std::vector<std::uint8_t> whole = reports.back();
    reports.emplace_back(600, static_cast<std::uint8_t>(200));
    ASSERT_TRUE(stand.feed(reports));
    reports.back() = whole;
    const PropertyValue text = stand.service.get("Recording");
    const PipelineRecording recording{std::string_view(*text.asString())};
    Reports recorded;
    for (const auto& frame : recording.frames()) {
        recorded.emplace_back(frame.report.begin(), frame.report.end());
    }
    EXPECT_EQ(recorded, reports);
}

TEST_F(InputReportTest, ReportsThatWaitedAreHandledInTheirOrder) {
    stand.service.unschedule(stand.queue);
    for (const auto& report : images({1, 2, 3, 4})) ASSERT_TRUE(stand.device->sendReport(report));
    EXPECT_EQ(stand.device->handled(), 0U);
    stand.service.schedule(stand.queue);
    ASSERT_TRUE(stand.device->waitUntilHandled(4));
    EXPECT_EQ(disjointImages(), 0U);
}

/// Loses the device of a service in the middle of its life.
void loseDevice() {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    const ServiceUnderTest& service = stand.service;
    stand.device->setPropertyValue("Product", "surface");
    stand.device->setWrites(Vexa::ScriptedDevice::Writes::Accepted);
    stand.device->setFeatureReport(4, {4, 1, 2});
    stand.startUp();
    ASSERT_TRUE(stand.feed({imageReport(nothing(), 1, 10), imageReport(nothing(), 3, 30)}));
    ASSERT_TRUE(stand.feed({firmwareReport(0)}));
    ASSERT_EQ(service.get("Product"), PropertyValue("surface"));
    ASSERT_TRUE(service.set("Product", 1));
    ASSERT_EQ(service.get("FirmwareVersion"), PropertyValue(PropertyValue::Array{1, 2}));
    ASSERT_EQ(service.get("DisjointImageCount"), PropertyValue(1U));
    const PropertyValue recording = service.get("Recording");
    const std::uint32_t references = service.references();

    stand.device->unplug();
    EXPECT_EQ(service.get("Product"), PropertyValue());
    EXPECT_FALSE(service.set("Product", 1));
    EXPECT_EQ(service.get("FirmwareVersion"), PropertyValue());
    EXPECT_FALSE(service.open());
    // What does not come from the device is there as before, the input thread included.
    EXPECT_EQ(service.get("DisjointImageCount"), PropertyValue(1U));
    EXPECT_EQ(service.get("Recording"), recording);
    EXPECT_EQ(service.references(), references);
    EXPECT_EQ(stand.device->handled(), 3U);
    stand.queue.drain();
    EXPECT_THAT(stand.events.take(), ElementsAre(FirmwareReset()));
    service.unschedule(stand.queue);
    EXPECT_EQ(service.references(), 2U);
    EXPECT_EQ(service.stop(), 0U);
}

TEST(LostDeviceTest, ALostDeviceOnlyFallsSilentAndLeavesNothing) {
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    const LeakCheck leaks;
    loseDevice();
    leaks.expectNothingLeft();
}

}  // namespace
}  // namespace VexaTouch::Testing
