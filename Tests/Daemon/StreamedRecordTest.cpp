#include "Tools/Daemon/StreamedRecord.h"

#include "Tests/Tools/CommandRun.h"
#include "Tools/AppendTarget.h"
#include "Tools/Failure.h"
#include "Tools/FrameFeed.h"

#include <gmock/gmock.h>

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <sstream>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {
namespace {

using Testing::TemporaryFolder;

/// What a feed without room for all of the reports gives to a far end that ends then.
class StreamedRecordTest : public ::testing::Test {
protected:
    StreamedRecordTest() : feed([] {}, FrameFeed::kFewestBytes) {
        std::array<int, 2> ends{};
        EXPECT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
        frames = FileDescriptor(ends[0]);
        farEnd = FileDescriptor(ends[1]);
    }
    void send() {
        std::size_t sent = 0;
        for (const auto& bytes : feed.readable()) {
            EXPECT_EQ(::write(farEnd.get(), bytes.data(), bytes.size()),
                      static_cast<ssize_t>(bytes.size()));
            sent += bytes.size();
        }
        feed.consume(sent);
    }
    std::string record(const std::string& path) {
        RecordingStream stream(openAppendTarget(path, true, streams), "session.json");
        try {
            recordStreamed(frames, {}, stream, summary, signals, wake, streams);
        } catch (const Failure& failure) {
            return failure.what();
        }
        return {};
    }

    TemporaryFolder folder;
    std::istringstream in;
    std::ostringstream out;
    std::ostringstream error;
    Streams streams{.in = in, .out = out, .error = error};
    FrameFeed feed;
    FileDescriptor frames;
    FileDescriptor farEnd;
    RecordSummary summary;
    WakeUp wake;
    SignalWatch signals{wake};
};

TEST_F(StreamedRecordTest, FarEndThatGoesLeavesTheSummaryWithWhatWasLost) {
    constexpr std::uint64_t kReports = 1000;
    const std::vector<std::uint8_t> report(20, 1);
    for (std::uint64_t i = 0; i < kReports; ++i) {
        feed.putReport(report, i);
    }
    const std::uint64_t lost = feed.lost().reports;
    ASSERT_GT(lost, 0U);
    send();
    feed.putReport(report, kReports);  // the gap goes before it
    feed.close();
    send();
    farEnd = FileDescriptor();
    EXPECT_EQ(record(folder.path("session.json")),
              "the surface was unplugged, or the daemon has ended");
    EXPECT_EQ(summary.lost.reports, lost);
    EXPECT_EQ(summary.reports, kReports + 1 - lost);
    EXPECT_THAT(folder.names(), ::testing::ElementsAre("session.json"));
}

// The daemon was killed, or could not wait for a slow reader.
TEST_F(StreamedRecordTest, FarEndThatGoesWithoutAnEndIsSaidToBeCut) {
    feed.putReport(std::vector<std::uint8_t>(20, 1), 1);
    send();
    farEnd = FileDescriptor();
    EXPECT_EQ(record(folder.path("session.json")),
              "the surface was unplugged, or the daemon has ended, and what came last is missing");
    EXPECT_EQ(summary.reports, 1U);
}

TEST_F(StreamedRecordTest, FailureWithoutAReportLeavesWhatWasThere) {
    const std::string old = folder.file("old.json", "precious");
    feed.putState("Algs.ActivationThreshold", "250.0", 1);
    send();
    const std::vector<std::uint8_t> garbage(64, 0xFF);
    EXPECT_EQ(::write(farEnd.get(), garbage.data(), garbage.size()), 64);
    EXPECT_THAT(record(old),
                ::testing::EndsWith("no report was recorded, session.json is as it was"));
    EXPECT_EQ(Testing::contentOf(old), "precious");
    // And where it is gone.
    farEnd = FileDescriptor();
    EXPECT_EQ(
        record(old),
        "the surface was unplugged, or the daemon has ended, and what came last is missing; no "
        "report was recorded, session.json is as it was");
    EXPECT_EQ(Testing::contentOf(old), "precious");
    EXPECT_THAT(folder.names(), ::testing::ElementsAre("old.json"));
}

}  // namespace
}  // namespace VexaTouch::Tools::Daemon
