#include "Tools/Daemon/RecordStreams.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/epoll.h>
#include <systemd/sd-event.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <utility>
#include <vector>

namespace VexaTouch::Tools::Daemon {
namespace {

constexpr const char* kOwner = "/surface/1";
constexpr std::uint64_t kBatch = 1000;  // less than a feed has room for

/// A stream whose reader stands still until it is told to read.
class RecordStreamsTest : public ::testing::Test {
protected:
    RecordStreamsTest()
        : decoder({.onFrame = [this](const RecordedFrame&) { ++frames; },
                   .onGap =
                       [this](const FrameGap& gap) {
                           lost += gap.reports;
                           framesBeforeGap = frames;
                       }}) {
        RecordStreams::Opened opened = streams.open(kOwner);
        feed = std::move(opened.feed);
        reader = std::move(opened.reader);
        EXPECT_EQ(::fcntl(reader.get(), F_SETFL, O_NONBLOCK), 0);
        streams.started(feed, tap);
    }

    void put(std::uint64_t count) {
        const std::vector<std::uint8_t> report(100, 1);
        for (std::uint64_t i = 0; i < count; ++i) {
            feed->putReport(report, ++sent);
        }
    }
    /// Returns when the loop has served whatever is ready.
    void serve() {
        while (sd_event_run(loop.get(), 0) > 0) {
        }
    }
    void runUntilDone(std::chrono::nanoseconds patience) {
        int done = 0;
        streams.end(patience, [&] { ++done; });
        while (done == 0) {
            sd_event_run(loop.get(), UINT64_MAX);
        }
        serve();
        EXPECT_EQ(done, 1);
    }
    /// Returns when the socket takes no more.
    void fill() {
        do {
            put(kBatch);
            serve();
        } while (feed->waiting() == 0);
        ASSERT_EQ(feed->lost(), FrameGap{});
    }
    /// Reads until there is reason to end.
    void readUntil(const std::function<bool()>& isEnough) {
        const auto readWatch = loop.watch(reader.get(), EPOLLIN, [&](std::uint32_t) {
            std::array<std::uint8_t, 4096> bytes{};
            const ssize_t got = ::read(reader.get(), bytes.data(), bytes.size());
            isFarEndGone = got == 0;
            if (got > 0) {
                decoder.write(std::span(bytes).first(static_cast<std::size_t>(got)));
            }
        });
        while (!isFarEndGone && !isEnough()) {
            constexpr std::uint64_t kLong = 10'000'000;  // in microseconds
            ASSERT_GT(sd_event_run(loop.get(), kLong), 0)
                << "nothing comes any more after " << frames << " frames";
        }
    }

    EventLoop loop;
    RecordStreams streams{loop};
    const std::shared_ptr<InputTap> tap = std::make_shared<InputTap>();
    std::shared_ptr<FrameFeed> feed;
    FileDescriptor reader;
    FrameDecoder decoder;
    std::uint64_t sent = 0;
    std::uint64_t frames = 0;
    std::uint64_t lost = 0;
    std::uint64_t framesBeforeGap = 0;
    bool isFarEndGone = false;
};

TEST_F(RecordStreamsTest, AReaderThatStoodStillGetsAllThatHadRoom) {
    fill();
    readUntil([&] { return frames == sent; });
    EXPECT_EQ(frames, sent);
    EXPECT_EQ(streams.lost(kOwner), 0U);
}

TEST_F(RecordStreamsTest, WhatFindsNoRoomIsCountedAndToldAtItsPlace) {
    fill();
    while (feed->lost().reports == 0) {
        put(kBatch);
    }
    const std::uint64_t left = feed->lost().reports;
    EXPECT_EQ(streams.lost(kOwner), left);
    EXPECT_EQ(streams.lost("/surface/2"), 0U);
    const std::uint64_t before = sent - left;
    readUntil([&] { return frames == before; });
    EXPECT_EQ(lost, 0U);
    put(1);
    readUntil([&] { return frames == before + 1; });
    EXPECT_EQ(lost, left);
    EXPECT_EQ(framesBeforeGap, before);
}

TEST_F(RecordStreamsTest, TheEndWaitsForASlowReader) {
    fill();
    feed->close();
    bool isDone = false;
    streams.end(std::chrono::hours(1), [&] { isDone = true; });
    serve();
    EXPECT_FALSE(isDone);
    readUntil([] { return false; });
    EXPECT_TRUE(isFarEndGone);
    EXPECT_EQ(frames, sent);
    EXPECT_TRUE(decoder.isAtEnd());
    serve();
    EXPECT_TRUE(isDone);
    EXPECT_EQ(streams.count(kOwner), 0U);
}

TEST_F(RecordStreamsTest, TheEndDoesNotWaitForeverAndTheReaderSeesThatItWasCut) {
    fill();
    feed->close();
    runUntilDone(std::chrono::milliseconds(1));
    EXPECT_EQ(streams.count(kOwner), 0U);
    readUntil([] { return false; });
    EXPECT_TRUE(isFarEndGone);
    EXPECT_LT(frames, sent);
    EXPECT_FALSE(decoder.isAtEnd());
}

TEST_F(RecordStreamsTest, WithoutAStreamTheEndIsThereAtOnce) {
    streams.abandon(feed);
    runUntilDone(std::chrono::hours(1));
    EXPECT_EQ(streams.count(kOwner), 0U);
}

}  // namespace
}  // namespace VexaTouch::Tools::Daemon
