#include "Platform/Json.h"
#include "Tests/Tools/CommandRun.h"
#include "Tests/Tools/DeviceReader.h"
#include "Tests/Tools/RecordedSession.h"

#include <gmock/gmock.h>

#include <array>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::AnyOf;
using ::testing::EndsWith;
using ::testing::StartsWith;

constexpr std::array<std::string_view, 4> kStages = {"pipeline", "pipeline_done", "queue",
                                                     "callback"};
constexpr std::array<std::string_view, 5> kFigures = {"p50_ns", "p90_ns", "p99_ns", "p999_ns",
                                                      "max_ns"};

class LatencyCommandTest : public ::testing::Test {
protected:
    LatencyCommandTest() { setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1); }
    ~LatencyCommandTest() override { unsetenv("VEXATOUCH_PLUGIN"); }

    static CommandResult latency(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), "latency");
        return runCommand(arguments);
    }
    /// The measurements of a run that must succeed.
    static std::vector<Vexa::PropertyValue> measurements(std::vector<std::string> arguments) {
        arguments.emplace_back("--json");
        const CommandResult result = latency(std::move(arguments));
        EXPECT_EQ(result.exitCode, 0) << result;
        const Vexa::PropertyValue list = Vexa::readJson(result.out).member("measurements");
        const auto elements = list.asArray();
        EXPECT_TRUE(elements);
        return elements ? std::vector<Vexa::PropertyValue>(elements->begin(), elements->end())
                        : std::vector<Vexa::PropertyValue>();
    }
    static std::uint64_t number(const Vexa::PropertyValue& value, std::string_view stage,
                                std::string_view figure) {
        return value.member(stage).member(figure).toUnsigned64();
    }

    TemporaryFolder folder;
};

TEST_F(LatencyCommandTest, ServiceThatTakesNoReportsIsNotWaitedForForever) {
    setenv("VEXATOUCH_PLUGIN", VEXATOUCH_SAMPLE_PLUGINS "/TakesNoReports.so", 1);
    EXPECT_EQ(
        runCommand({"latency", "--count", "10"}, {}, Vexa::HostClock::system(),
                   std::chrono::milliseconds(10)),
        (CommandResult{1, "",
                       "measuring with real-time priority, about 1 s ...\n"
                       "vexatouch latency: the service takes no reports; its log says why\n"}));
}

TEST_F(LatencyCommandTest, ServiceThatStopsTakingReportsIsNotWaitedForForever) {
    setenv("VEXATOUCH_PLUGIN", VEXATOUCH_SAMPLE_PLUGINS "/TakesReportsOnce.so", 1);
    const CommandResult result =
        runCommand({"latency", "--count", "10"}, {}, Vexa::HostClock::system(),
                   std::chrono::milliseconds(500));
    EXPECT_EQ(result.exitCode, 1);
    EXPECT_THAT(result.error,
                EndsWith("vexatouch latency: the service takes no reports; its log says why\n"));
}

TEST_F(LatencyCommandTest, ARecordingIsMeasuredAsFarAsItGoes) {
    const std::string session = folder.file("session.json", mixedSession().text());
    const auto results = measurements(
        {"--device", "recording:" + session, "--rate", "5000", "--priority", "normal"});
    ASSERT_EQ(results.size(), 2U);
    // Half of its reports without the reader, half with it.
    EXPECT_EQ(number(results[0], "pipeline", "samples"), 62U);
    EXPECT_EQ(number(results[1], "pipeline", "samples"), 62U);
}

TEST_F(LatencyCommandTest, ARecordingWithoutReportsCannotBeMeasured) {
    const std::string empty = folder.file("empty.json", containerText({}));
    EXPECT_EQ(
        latency({"--device", "recording:" + empty}),
        (CommandResult{1, "",
                       "vexatouch latency: " + empty + ": holds 0 reports, too few to measure\n"}));
}

TEST_F(LatencyCommandTest, EachStageOfEachReportIsMeasured) {
    const auto results = measurements(
        {"--count", "100", "--rate", "5000", "--reader", "off", "--priority", "normal"});
    ASSERT_EQ(results.size(), 1U);
    const Vexa::PropertyValue& result = results.front();
    EXPECT_EQ(result.member("input_thread").member("real_time"), Vexa::PropertyValue(false));
    EXPECT_EQ(result.member("queue_thread").member("real_time"), Vexa::PropertyValue(false));
    EXPECT_EQ(result.member("reader"), Vexa::PropertyValue(false));
    EXPECT_EQ(result.member("recording_reads").toUnsigned64(), 0U);
    for (const std::string_view stage : kStages) {
        SCOPED_TRACE(stage);
        EXPECT_EQ(number(result, stage, "samples"), 100U);
        std::uint64_t last = 1;
        for (const std::string_view figure : kFigures) {
            EXPECT_GE(number(result, stage, figure), last);
            last = number(result, stage, figure);
        }
    }
    for (const std::string_view figure : kFigures) {
        SCOPED_TRACE(figure);
        EXPECT_LE(number(result, "pipeline", figure), number(result, "pipeline_done", figure));
        EXPECT_LE(number(result, "queue", figure), number(result, "callback", figure));
    }
}

TEST_F(LatencyCommandTest, WithAndWithoutAReaderSideBySide) {
    const auto results = measurements({"--count", "600", "--priority", "normal"});
    ASSERT_EQ(results.size(), 2U);
    EXPECT_EQ(results[0].member("reader"), Vexa::PropertyValue(false));
    EXPECT_EQ(results[1].member("reader"), Vexa::PropertyValue(true));
    EXPECT_GT(results[1].member("recording_reads").toUnsigned64(), 0U);
    EXPECT_GT(results[1].member("recording_read_ns").toUnsigned64(), 0U);
    // As much as is written of a full one.
    EXPECT_GT(results[1].member("recording_bytes").toUnsigned64(), 1350U * 3 * 73);
    EXPECT_EQ(number(results[0], "callback", "samples"), 600U);
    EXPECT_EQ(number(results[1], "callback", "samples"), 600U);
}

TEST_F(LatencyCommandTest, SaysWhichPriorityItGot) {
    const CommandResult result = latency({"--count", "10", "--reader", "off"});
    EXPECT_EQ(result.exitCode, 0) << result;
    const std::string begun = "measuring with real-time priority, about 1 s ...\n";
    const std::string normal =
        "measured with the input thread at normal priority, queue at normal priority\n";
    EXPECT_THAT(result.error,
                AnyOf(begun +
                          "measured with the input thread at real-time priority 63, queue at "
                          "real-time priority 62\n"
                          "measuring at normal priority, about 1 s ...\n" +
                          normal,
                      begun + normal + "real-time priority was not granted\n"));
}

TEST_F(LatencyCommandTest, TheTableHasARowForEachStageAndReader) {
    const CommandResult result = latency({"--count", "20", "--priority", "normal"});
    const std::vector<std::string> lines = linesOf(result.out);
    ASSERT_EQ(lines.size(), 14U) << result;
    EXPECT_EQ(lines[0],
              "20 reports, 1000 a second; the recording was full when each measurement began");
    EXPECT_EQ(lines[2], "input thread at normal priority, queue at normal priority");
    EXPECT_EQ(lines[3],
              "  microseconds                    samples        p50        p90        p99      "
              "p99.9        max");
    EXPECT_THAT(lines[4], StartsWith("report to pipeline      -              20 "));
    EXPECT_THAT(lines[5], StartsWith("report to pipeline      reader         20 "));
    EXPECT_THAT(lines[10], StartsWith("report to callback      -              20 "));
    EXPECT_THAT(lines[12], StartsWith("the reader read the recording "));
    EXPECT_THAT(lines[13], StartsWith("p99.9 of report to callback with the reader is "));
}

TEST_F(LatencyCommandTest, ReportsWithoutEventsHaveNoSampleAtTheQueue) {
    const std::string script = folder.file("a.gesture", "idle 50ms\ntap play 60ms\n");
    const auto results = measurements({"--count", "64", "--rate", "10000", "--reader", "off",
                                       "--priority", "normal", "--device", "sim:" + script});
    ASSERT_EQ(results.size(), 1U);
    EXPECT_EQ(number(results[0], "pipeline_done", "samples"), 64U);
    const std::uint64_t events = number(results[0], "callback", "samples");
    EXPECT_GT(events, 2U);
    EXPECT_LT(events, 20U);
    EXPECT_EQ(number(results[0], "queue", "samples"), events);
}

TEST_F(LatencyCommandTest, ARecordingIsSentOnceWithItsStates) {
    const std::string file = folder.file("session.json", mixedSession().text());
    const auto results = measurements({"--count", "1000", "--rate", "10000", "--reader", "off",
                                       "--priority", "normal", "--device", "recording:" + file});
    ASSERT_EQ(results.size(), 1U);
    EXPECT_EQ(number(results[0], "pipeline_done", "samples"), 124U);
}

TEST_F(LatencyCommandTest, ACommandLineThatMakesNoSenseIsRefused) {
    const auto exitCode = [](std::vector<std::string> arguments) {
        return latency(std::move(arguments)).exitCode;
    };
    EXPECT_EQ(exitCode({"--rate", "0"}), 2);
    EXPECT_EQ(exitCode({"--rate", "nan"}), 2);
    EXPECT_EQ(exitCode({"--rate", "200000"}), 2);
    EXPECT_EQ(exitCode({"--count", "0"}), 2);
    EXPECT_EQ(exitCode({"--count", "10", "--duration", "1s"}), 2);
    EXPECT_EQ(exitCode({"--duration", "1d"}), 2);
    EXPECT_EQ(exitCode({"--duration", "1h"}), 2);  // too many reports
    EXPECT_EQ(exitCode({"--reader", "maybe"}), 2);
    EXPECT_EQ(exitCode({"--priority", "high"}), 2);
    EXPECT_EQ(exitCode({"--device", "mouse"}), 2);
    EXPECT_EQ(exitCode({"--device", "sim:" + std::string("/nowhere")}), 1);
}

}  // namespace
}  // namespace VexaTouch::Testing
