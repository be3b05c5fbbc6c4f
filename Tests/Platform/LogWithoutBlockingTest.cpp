// Threads that must not block in a log call, and what those who may see of their messages.
#include "Platform/Log.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <future>
#include <map>
#include <regex>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

const Log kInputLog(LogCategory::HIDService);
const Log kOtherLog(LogCategory::Pipeline);

std::string numbered(const std::string& text, int number) {
    return text + " " + std::to_string(number);
}

std::string droppedText(std::uint64_t count) {
    return std::to_string(count) + " log message(s) dropped";
}

/// A pipe as standard error, until it is taken away.
class StandardErrorPipe {
public:
    StandardErrorPipe() {
        EXPECT_EQ(pipe(ends_.data()), 0);
        EXPECT_GT(fcntl(ends_[1], F_SETPIPE_SZ, 4096), 0);
        EXPECT_EQ(dup2(ends_[1], STDERR_FILENO), STDERR_FILENO);
        close(ends_[1]);
    }
    ~StandardErrorPipe() {
        takeAway();
        close(ends_[0]);
    }
    StandardErrorPipe(const StandardErrorPipe&) = delete;
    StandardErrorPipe(StandardErrorPipe&&) = delete;
    StandardErrorPipe& operator=(const StandardErrorPipe&) = delete;
    StandardErrorPipe& operator=(StandardErrorPipe&&) = delete;

    /// As before; the reader meets the end.
    void takeAway() {
        if (before_ < 0) return;
        EXPECT_EQ(dup2(before_, STDERR_FILENO), STDERR_FILENO);
        close(before_);
        before_ = -1;
    }
    [[nodiscard]] bool isFull() const {
        int held = 0;
        EXPECT_EQ(ioctl(ends_[0], FIONREAD, &held), 0);
        return held == fcntl(ends_[0], F_GETPIPE_SZ);
    }
    /// All lines up to the end, without their times.
    [[nodiscard]] std::vector<std::string> readLines() const {
        std::string text;
        std::array<char, 4096> piece{};
        for (;;) {
            const ssize_t length = read(ends_[0], piece.data(), piece.size());
            if (length <= 0) break;
            text.append(piece.data(), static_cast<std::size_t>(length));
        }
        std::vector<std::string> lines;
        std::istringstream stream(text);
        const std::string time = "2000-01-01 00:00:00.000 ";
        for (std::string line; std::getline(stream, line);) {
            lines.push_back(line.size() < time.size() ? line : line.substr(time.size()));
        }
        return lines;
    }

private:
    std::array<int, 2> ends_{};
    int before_ = dup(STDERR_FILENO);
};

class LogWithoutBlockingTest : public testing::Test {
protected:
    void SetUp() override { Log::flush(); }
    void TearDown() override { Log::setSink({}); }

    /// Calls one at a time need no lock here; the thread sanitizer would tell.
    void collect() {
        Log::setSink([this](LogCategory, LogLevel, std::string_view message) {
            lines.emplace_back(message);
        });
    }

    std::vector<std::string> lines;
};

// The claim: a slow reader of standard error, and a thread that waits for it with the log's lock in
// its hands, do not hold up a thread that must not block. Without it this test never ends.
TEST_F(LogWithoutBlockingTest, AFullPipeAndALockedLogDoNotHoldTheInputThreadUp) {
    constexpr int kCount = 10'000;
    const std::string longText(100'000, 'x');
    const std::uint64_t droppedBefore = vexa_log_get_dropped();
    // Of errors, which are alike, most would be left out.
    Log::setLevel(LogCategory::HIDService, LogLevel::Info);
    StandardErrorPipe pipe;
    std::thread slow([&longText] { kOtherLog.write(LogLevel::Error, longText); });
    // Its text is longer than the pipe: once the pipe is full, it waits in the middle of its call.
    while (!pipe.isFull()) std::this_thread::yield();

    std::thread([] {
        const LogWithoutBlocking here;
        for (int i = 0; i < kCount; ++i) {
            kInputLog.write(LogLevel::Info, numbered("message", i));
        }
    }).join();
    EXPECT_TRUE(pipe.isFull());  // nobody has read a byte so far
    const std::uint64_t dropped = vexa_log_get_dropped() - droppedBefore;

    auto reading = std::async(std::launch::async, [&pipe] { return pipe.readLines(); });
    slow.join();
    Log::flush();
    Log::setLevel(LogCategory::HIDService, LogLevel::Error);
    pipe.takeAway();

    ASSERT_GT(dropped, 0u);
    ASSERT_LT(dropped, static_cast<std::uint64_t>(kCount));
    std::vector<std::string> expected = {"Pipeline error: " + longText};
    for (int i = 0; i < kCount - static_cast<int>(dropped); ++i) {
        expected.push_back(numbered("HIDService info: message", i));
    }
    expected.push_back("HIDService error: " + droppedText(dropped));
    EXPECT_EQ(reading.get(), expected);
}

TEST_F(LogWithoutBlockingTest, DroppedMessagesAreCountedWhereTheyWouldHaveBeen) {
    std::promise<void> isInSink;
    std::promise<void> mayGoOn;
    Log::setSink([&](LogCategory category, LogLevel level, std::string_view message) {
        if (lines.empty()) {
            isInSink.set_value();
            mayGoOn.get_future().wait();
        }
        lines.push_back(std::string(logCategoryName(category)) + "/" +
                        std::string(logLevelName(level)) + "/" + std::string(message));
    });
    std::thread slow([] { kOtherLog.write(LogLevel::Error, "slow"); });
    isInSink.get_future().wait();
    int kept = 0;
    std::thread([&kept] {
        const LogWithoutBlocking here;
        const std::uint64_t before = vexa_log_get_dropped();
        while (vexa_log_get_dropped() == before) {
            kInputLog.write(LogLevel::Error, numbered("kept", kept++));
        }
        --kept;  // that one was dropped
        kInputLog.write(LogLevel::Error, "dropped");
        kInputLog.write(LogLevel::Error, "dropped");
    }).join();
    mayGoOn.set_value();
    slow.join();
    Log::flush();
    std::thread([] {
        const LogWithoutBlocking here;
        kInputLog.write(LogLevel::Error, "after");
    }).join();
    Log::flush();

    std::vector<std::string> expected = {"Pipeline/error/slow"};
    for (int i = 0; i < kept; ++i) expected.push_back("HIDService/error/" + numbered("kept", i));
    expected.emplace_back("HIDService/error/" + droppedText(3));
    expected.emplace_back("HIDService/error/after");
    EXPECT_EQ(lines, expected);
}

TEST_F(LogWithoutBlockingTest, TheCountComesBeforeWhatFoundRoomAgain) {
    std::array<std::promise<void>, 3> isInSink;
    std::array<std::promise<void>, 3> mayGoOn;
    Log::setSink([&](LogCategory, LogLevel, std::string_view message) {
        if (lines.size() < isInSink.size()) {
            isInSink[lines.size()].set_value();
            mayGoOn[lines.size()].get_future().wait();
        }
        lines.emplace_back(message);
    });
    std::thread slow([] { kOtherLog.write(LogLevel::Error, "slow"); });
    isInSink[0].get_future().wait();
    int kept = 0;
    std::thread([&] {
        const LogWithoutBlocking here;
        const std::uint64_t before = vexa_log_get_dropped();
        while (vexa_log_get_dropped() == before) {
            kInputLog.write(LogLevel::Error, numbered("kept", kept++));
        }
        --kept;
        // The sink takes two from the ring; the first one's place is free then.
        mayGoOn[0].set_value();
        mayGoOn[1].set_value();
        isInSink[2].get_future().wait();
        kInputLog.write(LogLevel::Error, "after");
        EXPECT_EQ(vexa_log_get_dropped(), before + 1);
        mayGoOn[2].set_value();
    }).join();
    slow.join();
    Log::flush();

    std::vector<std::string> expected = {"slow"};
    for (int i = 0; i < kept; ++i) expected.push_back(numbered("kept", i));
    expected.push_back(droppedText(1));
    expected.emplace_back("after");
    EXPECT_EQ(lines, expected);
}

TEST_F(LogWithoutBlockingTest, TheCountComesAfterWhatWasKeptBefore) {
    std::promise<void> isInSink;
    std::promise<void> mayGoOn;
    Log::setSink([&](LogCategory, LogLevel, std::string_view message) {
        if (lines.empty()) {
            isInSink.set_value();
            mayGoOn.get_future().wait();
        }
        lines.emplace_back(message);
    });
    std::vector<std::string> expected;
    std::thread([&] {
        const LogWithoutBlocking here;
        const std::uint64_t before = vexa_log_get_dropped();
        kInputLog.write(LogLevel::Error, numbered("kept", 0));
        expected.push_back(numbered("kept", 0));
        // The log's own thread is in the sink with the only message there was.
        isInSink.get_future().wait();
        while (vexa_log_get_dropped() == before) {
            expected.push_back(numbered("kept", static_cast<int>(expected.size())));
            kInputLog.write(LogLevel::Error, expected.back());
        }
        expected.back() = droppedText(1);
    }).join();
    mayGoOn.set_value();
    Log::flush();
    EXPECT_EQ(lines, expected);
}

TEST_F(LogWithoutBlockingTest, MessagesArriveThoughNobodyElseLogs) {
    std::promise<std::string> arrived;
    Log::setSink([&arrived](LogCategory, LogLevel, std::string_view message) {
        arrived.set_value(std::string(message));
    });
    std::thread([] {
        const LogWithoutBlocking here;
        kInputLog.write(LogLevel::Error, "m");
    }).join();
    EXPECT_EQ(arrived.get_future().get(), "m");
}

TEST_F(LogWithoutBlockingTest, WhatWasLoggedBeforeWorkWasPassedOnComesFirst) {
    collect();
    std::vector<std::string> expected;
    for (int round = 0; round < 200; ++round) {
        std::promise<void> work;
        std::thread worker([&work, round] {
            work.get_future().wait();
            kOtherLog.write(LogLevel::Error, numbered("landing", round));
        });
        std::thread([&work, round] {
            const LogWithoutBlocking here;
            kInputLog.write(LogLevel::Error, numbered("takeoff", round));
            work.set_value();
        }).join();
        worker.join();
        expected.push_back(numbered("takeoff", round));
        expected.push_back(numbered("landing", round));
    }
    EXPECT_EQ(lines, expected);
}

TEST_F(LogWithoutBlockingTest, TextsOfAnyLengthArriveWhole) {
    collect();
    std::vector<std::string> expected;
    for (const std::size_t length : {0u, 1u, 239u, 240u, 4096u, 4097u, 300'000u, 5u}) {
        expected.emplace_back(length, static_cast<char>('a' + expected.size()));
    }
    // Twice round the ring: longer texts leave their places larger.
    for (int round = 0; round < 600; ++round) {
        const LogWithoutBlocking here;
        for (const std::string& text : expected) kInputLog.write(LogLevel::Error, text);
        Log::flush();
        ASSERT_EQ(lines, expected);
        lines.clear();
    }
}

TEST_F(LogWithoutBlockingTest, TheDeclarationEndsWithItsScope) {
    std::thread([] {
        EXPECT_FALSE(vexa_log_set_thread_must_not_block(false));
        {
            const LogWithoutBlocking outer;
            {
                const LogWithoutBlocking inner;
            }
            EXPECT_TRUE(vexa_log_set_thread_must_not_block(true));
        }
        EXPECT_FALSE(vexa_log_set_thread_must_not_block(false));
    }).join();
}

TEST_F(LogWithoutBlockingTest, ASinkGetsEverythingLoggedBeforeItIsReplaced) {
    collect();
    const LogWithoutBlocking here;
    std::vector<std::string> expected;
    for (int i = 0; i < 500; ++i) {
        kInputLog.write(LogLevel::Error, numbered("m", i));
        expected.push_back(numbered("m", i));
    }
    std::vector<std::string> later;
    Log::setSink(
        [&later](LogCategory, LogLevel, std::string_view message) { later.emplace_back(message); });
    EXPECT_EQ(lines, expected);
    EXPECT_THAT(later, IsEmpty());
    kInputLog.write(LogLevel::Error, "last");
    Log::setSink({});
    EXPECT_THAT(later, ElementsAre("last"));
}

TEST_F(LogWithoutBlockingTest, ManyThreadsLoseNothingButWhatIsCounted) {
    constexpr int kCount = 5'000;
    constexpr int kUnblocked = 4;
    constexpr int kBlocking = 2;
    const std::uint64_t droppedBefore = vexa_log_get_dropped();
    std::vector<std::thread> threads;
    std::atomic<bool> isOver{false};
    collect();
    for (int number = 0; number < kUnblocked + kBlocking; ++number) {
        threads.emplace_back([number] {
            const bool before = vexa_log_set_thread_must_not_block(number < kUnblocked);
            for (int i = 0; i < kCount; ++i) {
                kInputLog.write(LogLevel::Error, std::to_string(number) + ":" + std::to_string(i));
            }
            vexa_log_set_thread_must_not_block(before);
        });
    }
    std::thread replacing([this, &isOver] {
        while (!isOver) {
            collect();
            Log::flush();
        }
    });
    for (std::thread& thread : threads) thread.join();
    isOver = true;
    replacing.join();
    Log::flush();

    std::map<int, int> last;
    std::map<int, int> counts;
    std::uint64_t reported = 0;
    for (const std::string& line : lines) {
        const std::size_t colon = line.find(':');
        if (colon == std::string::npos) {
            const std::uint64_t count = std::stoull(line);
            EXPECT_EQ(line, droppedText(count));
            reported += count;
            continue;
        }
        const int number = std::stoi(line.substr(0, colon));
        const int i = std::stoi(line.substr(colon + 1));
        if (const auto found = last.find(number); found != last.end()) {
            ASSERT_GT(i, found->second) << "thread " << number;
        }
        last[number] = i;
        ++counts[number];
    }
    EXPECT_EQ(reported, vexa_log_get_dropped() - droppedBefore);
    std::uint64_t unblocked = 0;
    for (int number = 0; number < kUnblocked; ++number) {
        unblocked += static_cast<std::uint64_t>(counts[number]);
    }
    EXPECT_EQ(unblocked + reported, static_cast<std::uint64_t>(kUnblocked * kCount));
    for (int number = kUnblocked; number < kUnblocked + kBlocking; ++number) {
        EXPECT_EQ(counts[number], kCount);
    }
}

}  // namespace
}  // namespace Vexa
