#include "Tools/FrameFeed.h"

#include "Platform/Json.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/SeededRandom.h"

#include <gmock/gmock.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <random>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <variant>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Testing::SeededRandom;
using ::testing::SizeIs;

RecordedFrame report(std::uint64_t timestampNs, std::vector<std::uint8_t> bytes) {
    RecordedFrame frame;
    frame.timestamp = timestampNs;
    frame.report = std::move(bytes);
    return frame;
}

RecordedFrame state(std::uint64_t timestampNs, std::string key, Vexa::PropertyValue value) {
    RecordedFrame frame;
    frame.type = RecordedFrame::Type::State;
    frame.timestamp = timestampNs;
    frame.key = std::move(key);
    frame.value = std::move(value);
    return frame;
}

void put(FrameFeed& feed, const RecordedFrame& frame) {
    if (frame.type == RecordedFrame::Type::State) {
        feed.putState(frame.key, settingText(frame.value), frame.timestamp);
    } else {
        feed.putReport(frame.report, frame.timestamp);
    }
}

using Item = std::variant<RecordedFrame, FrameGap>;

/// Takes everything, in its order.
class Taker {
public:
    std::vector<Item> items;
    FrameDecoder decoder{{.onFrame = [this](const RecordedFrame& frame) { items.push_back(frame); },
                          .onGap = [this](const FrameGap& gap) { items.push_back(gap); }}};

    [[nodiscard]] std::vector<RecordedFrame> frames() const {
        std::vector<RecordedFrame> all;
        for (const Item& item : items) {
            if (const auto* frame = std::get_if<RecordedFrame>(&item)) {
                all.push_back(*frame);
            }
        }
        return all;
    }
};

RecordedFrame randomFrame(SeededRandom& random, std::uint64_t timestampNs) {
    if (random.oneIn(5)) {
        static const std::vector<Vexa::PropertyValue> values = {
            200.0,  300,
            true,   Vexa::PropertyValue::null(),
            "text", Vexa::PropertyValue::Array{1, 2.5, false}};
        return state(timestampNs, "Algs.Key" + std::to_string(random.between(0, 99)),
                     random.oneOf(values));
    }
    std::vector<std::uint8_t> bytes(static_cast<std::size_t>(random.between(0, 512)));
    for (std::uint8_t& byte : bytes) {
        byte = static_cast<std::uint8_t>(random.next());
    }
    return report(timestampNs, std::move(bytes));
}

std::uint64_t newSeed() {
    const std::uint64_t seed = std::random_device()();
    ::testing::Test::RecordProperty("seed", std::to_string(seed));
    return seed;
}

TEST(FrameFeedTest, WhatIsPutComesOutManyTimesAroundTheRing) {
    const std::uint64_t seed = newSeed();
    SCOPED_TRACE("seed " + std::to_string(seed));
    SeededRandom random(seed);
    FrameFeed feed([] {}, FrameFeed::kFewestBytes);
    Taker taker;
    std::vector<RecordedFrame> frames;
    for (std::uint64_t i = 0; i < 5000; ++i) {
        frames.push_back(randomFrame(random, i));
        put(feed, frames.back());
        if (feed.waiting() > feed.size() / 2 || random.oneIn(3)) {
            EXPECT_TRUE(drain(feed, taker.decoder));
            EXPECT_FALSE(drain(feed, taker.decoder));
        }
    }
    drain(feed, taker.decoder);
    EXPECT_EQ(taker.frames(), frames);
    EXPECT_EQ(feed.lost(), FrameGap{});
    EXPECT_THAT(taker.items, SizeIs(frames.size()));
}

TEST(FrameFeedTest, BytesMayComeToTheDecoderInPiecesOfAnySize) {
    const std::uint64_t seed = newSeed();
    SCOPED_TRACE("seed " + std::to_string(seed));
    SeededRandom random(seed);
    FrameFeed feed([] {}, std::size_t{1} << 16U);
    std::vector<RecordedFrame> frames;
    for (std::uint64_t i = 0; i < 60; ++i) {
        frames.push_back(randomFrame(random, i));
        put(feed, frames.back());
    }
    std::vector<std::uint8_t> bytes;
    for (const auto part : feed.readable()) {
        bytes.insert(bytes.end(), part.begin(), part.end());
    }
    for (int round = 0; round < 100; ++round) {
        Taker taker;
        EXPECT_FALSE(taker.decoder.isBetweenFrames());
        for (std::span<const std::uint8_t> left = bytes; !left.empty();) {
            const auto piece = std::min<std::size_t>(
                left.size(), static_cast<std::size_t>(random.between(1, round == 0 ? 1 : 900)));
            taker.decoder.write(left.first(piece));
            left = left.subspan(piece);
        }
        EXPECT_EQ(taker.frames(), frames);
        EXPECT_TRUE(taker.decoder.isBetweenFrames());
    }
    Taker cut;
    cut.decoder.write(std::span(bytes).first(bytes.size() - 1));
    EXPECT_FALSE(cut.decoder.isBetweenFrames());
    EXPECT_THAT(cut.items, SizeIs(frames.size() - 1));
}

TEST(FrameFeedTest, WakesOnlyWhoMayBeWaiting) {
    int wakes = 0;
    FrameFeed feed([&wakes] { ++wakes; });
    Taker taker;
    drain(feed, taker.decoder);
    put(feed, report(1, {1}));
    EXPECT_EQ(wakes, 1);
    put(feed, report(2, {2}));
    EXPECT_EQ(wakes, 1);
    drain(feed, taker.decoder);
    put(feed, report(3, {3}));
    EXPECT_EQ(wakes, 2);
    feed.close();
    EXPECT_EQ(wakes, 3);
    EXPECT_TRUE(feed.isClosed());
}

TEST(FrameFeedTest, WhatFindsNoRoomIsToldAtItsPlace) {
    FrameFeed feed([] {}, FrameFeed::kFewestBytes);
    const std::vector<std::uint8_t> bytes(500, 7);
    std::uint64_t kept = 0;
    while (feed.lost().reports == 0) {
        put(feed, report(++kept, bytes));
    }
    --kept;
    put(feed, report(100, bytes));
    Taker taker;
    drain(feed, taker.decoder);
    EXPECT_THAT(taker.items, SizeIs(kept));
    put(feed, report(101, {1}));
    put(feed, report(102, {2}));
    drain(feed, taker.decoder);
    ASSERT_THAT(taker.items, SizeIs(kept + 3));
    EXPECT_EQ(std::get<FrameGap>(taker.items[kept]), (FrameGap{.reports = 2, .settings = 0}));
    EXPECT_EQ(std::get<RecordedFrame>(taker.items[kept + 1]), report(101, {1}));
    EXPECT_EQ(feed.lost(), (FrameGap{.reports = 2, .settings = 0}));
}

TEST(FrameFeedTest, SettingFindsRoomWhereReportsFindNone) {
    FrameFeed feed([] {}, FrameFeed::kFewestBytes);
    while (feed.lost().reports == 0) {
        put(feed, report(1, {1}));
    }
    put(feed, state(2, "Algs.A", 1));
    EXPECT_EQ(feed.lost(), (FrameGap{.reports = 1, .settings = 0}));
    Taker taker;
    drain(feed, taker.decoder);
    ASSERT_GE(taker.items.size(), 2U);
    // The report was lost before it.
    EXPECT_EQ(std::get<FrameGap>(taker.items[taker.items.size() - 2]),
              (FrameGap{.reports = 1, .settings = 0}));
    EXPECT_EQ(std::get<RecordedFrame>(taker.items.back()), state(2, "Algs.A", 1));
    // They are not without bound either.
    while (feed.lost().settings == 0) {
        put(feed, state(3, "Algs.B", 2));
    }
}

TEST(FrameFeedTest, ClosingTellsOfTheLastGap) {
    FrameFeed feed([] {}, FrameFeed::kFewestBytes);
    while (feed.lost().settings < 3) {
        put(feed, state(3, "Algs.B", 2));
    }
    feed.close();
    Taker taker;
    drain(feed, taker.decoder);
    EXPECT_EQ(std::get<FrameGap>(taker.items.back()), (FrameGap{.reports = 0, .settings = 3}));
}

TEST(FrameFeedTest, WhatARecordingCannotHoldBecomesWhatAPipelineTakesAlike) {
    EXPECT_EQ(settingText({}), "null");
    EXPECT_EQ(settingText(200.0), "200.0");
    Vexa::PropertyValue deep = 1;
    for (int i = 0; i < 10'000; ++i) {
        deep = Vexa::PropertyValue::Array{deep};
    }
    EXPECT_EQ(settingText(deep), "null");
}

TEST(FrameFeedTest, BytesOfNoFeedAreRefused) {
    const auto refusal = [](const std::vector<std::uint8_t>& bytes) -> std::string {
        Taker taker;
        try {
            taker.decoder.write(bytes);
        } catch (const std::runtime_error& error) {
            return error.what();
        }
        return "taken";
    };
    const std::string_view beginning = "VXFRAME1";
    const auto record = [&](std::uint8_t length, std::uint8_t highest, std::uint8_t type,
                            std::vector<std::uint8_t> payload) {
        std::vector<std::uint8_t> bytes(beginning.begin(), beginning.end());
        bytes.insert(bytes.end(), {length, 0, 0, highest, type, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0});
        bytes.insert(bytes.end(), payload.begin(), payload.end());
        return bytes;
    };
    EXPECT_EQ(refusal({'{'}), "no feed of frames: it begins with something else");
    EXPECT_EQ(refusal(record(0, 0, 9, {})), "no feed of frames: a record is of no known type");
    EXPECT_EQ(refusal(record(0, 0x20, 1, {})), "no feed of frames: a record is too long");
    EXPECT_EQ(refusal(record(3, 0, 3, {1, 2, 3})),
              "no feed of frames: a record is of no known type");
    EXPECT_EQ(refusal(record(3, 0, 2, {1, 2, 3})), "no feed of frames: a setting is too short");
    EXPECT_EQ(refusal(record(5, 0, 2, {9, 0, 0, 0, 'A'})),
              "no feed of frames: a setting is too short");
    EXPECT_EQ(refusal(record(6, 0, 2, {1, 0, 0, 0, 'A', '{'})),
              "no feed of frames: a setting's value is no JSON");
}

TEST(FrameFeedTest, BetweenTwoThreadsEverythingComesOnceOrIsCounted) {
    const std::uint64_t seed = newSeed();
    SCOPED_TRACE("seed " + std::to_string(seed));
    constexpr std::uint64_t kReports = 200'000;
    std::atomic<std::uint32_t> wakes = 0;
    FrameFeed feed(
        [&wakes] {
            wakes.fetch_add(1);
            wakes.notify_all();
        },
        FrameFeed::kFewestBytes);
    std::thread putting([&] {
        SeededRandom random(seed);
        std::vector<std::uint8_t> bytes(80);
        for (std::uint64_t i = 0; i < kReports; ++i) {
            bytes.resize(static_cast<std::size_t>(random.between(0, 80)));
            feed.putReport(bytes, i);
        }
        feed.close();
    });
    std::uint64_t next = 0;
    std::uint64_t lost = 0;
    std::uint64_t taken = 0;
    FrameDecoder decoder({.onFrame =
                              [&](const RecordedFrame& frame) {
                                  EXPECT_EQ(frame.timestamp, next);
                                  next = frame.timestamp + 1;
                                  ++taken;
                              },
                          .onGap =
                              [&](const FrameGap& gap) {
                                  next += gap.reports;
                                  lost += gap.reports;
                              }});
    for (bool isOver = false; !isOver;) {
        const std::uint32_t woken = wakes.load();
        isOver = feed.isClosed();
        // Waits for a wake as a writer does: one that is missed would hang.
        if (!drain(feed, decoder) && !isOver) {
            wakes.wait(woken);
        }
    }
    putting.join();
    EXPECT_EQ(next, kReports);
    EXPECT_EQ(taken + lost, kReports);
    EXPECT_EQ(feed.lost().reports, lost);
}

}  // namespace
}  // namespace VexaTouch::Tools
