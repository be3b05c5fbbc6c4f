#include "Platform/Log.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cerrno>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr std::array kCategories = {LogCategory::HIDService, LogCategory::Pipeline,
                                    LogCategory::Recording, LogCategory::Algs};

/// Any number as a code, as a caller in C may pass it.
template <typename Code>
Code coded(int number) {
    return static_cast<Code>(number);
}

/// Collects messages, and leaves the process's log as it was.
class LogTest : public testing::Test {
protected:
    void SetUp() override {
        Log::setSink([this](LogCategory category, LogLevel level, std::string_view message) {
            lines.push_back(std::string(logCategoryName(category)) + "/" +
                            std::string(logLevelName(level)) + "/" + std::string(message));
        });
    }
    void TearDown() override {
        Log::setSink({});
        for (const LogCategory category : kCategories) Log::setLevel(category, LogLevel::Error);
    }

    std::vector<std::string> lines;
};

TEST_F(LogTest, OnlyErrorsAreWrittenAtFirst) {
    for (const LogCategory category : kCategories) {
        const Log log(category);
        EXPECT_FALSE(log.isEnabled(LogLevel::Debug));
        EXPECT_FALSE(log.isEnabled(LogLevel::Info));
        EXPECT_TRUE(log.isEnabled(LogLevel::Error));
    }
    const Log log(LogCategory::Pipeline);
    log.write(LogLevel::Debug, "d");
    log.write(LogLevel::Info, "i");
    log.write(LogLevel::Error, "e");
    EXPECT_THAT(lines, ElementsAre("Pipeline/error/e"));
}

TEST_F(LogTest, EachCategoryHasItsOwnLevel) {
    Log::setLevel(LogCategory::Algs, LogLevel::Debug);
    Log::setLevel(LogCategory::Recording, LogLevel::Info);
    Log::setLevel(LogCategory::Pipeline, LogLevel::Off);
    for (const LogCategory category : kCategories) {
        for (const LogLevel level : {LogLevel::Debug, LogLevel::Info, LogLevel::Error}) {
            Log(category).write(level, "m");
        }
    }
    EXPECT_THAT(lines, ElementsAre("HIDService/error/m", "Recording/info/m", "Recording/error/m",
                                   "Algs/debug/m", "Algs/info/m", "Algs/error/m"));
}

TEST_F(LogTest, NothingIsLoggedAtOff) {
    Log::setLevel(LogCategory::Algs, LogLevel::Debug);
    EXPECT_FALSE(Log(LogCategory::Algs).isEnabled(LogLevel::Off));
    Log(LogCategory::Algs).write(LogLevel::Off, "m");
    Log::setLevel(LogCategory::Algs, LogLevel::Off);
    Log(LogCategory::Algs).write(LogLevel::Off, "m");
    EXPECT_THAT(lines, IsEmpty());
}

TEST_F(LogTest, ASinkThatThrowsLosesTheMessageOnly) {
    const Log log(LogCategory::Algs);
    Log::setSink([](LogCategory, LogLevel, std::string_view) { throw std::runtime_error("full"); });
    log.write(LogLevel::Error, "lost");
    Log::setSink(
        [this](LogCategory, LogLevel, std::string_view message) { lines.emplace_back(message); });
    log.write(LogLevel::Error, "kept");
    EXPECT_THAT(lines, ElementsAre("kept"));
}

TEST_F(LogTest, ASinkMayLogAndReplaceItself) {
    const Log log(LogCategory::Algs);
    Log::setSink([this, log, text = std::string("own")](LogCategory, LogLevel, std::string_view) {
        log.write(LogLevel::Error, "from the sink");
        Log::setSink([this](LogCategory, LogLevel, std::string_view message) {
            lines.push_back("second: " + std::string(message));
        });
        lines.push_back("first: " + text);
    });
    log.write(LogLevel::Error, "1");
    log.write(LogLevel::Error, "2");
    EXPECT_THAT(lines, ElementsAre("first: own", "second: 2"));
}

TEST_F(LogTest, ASinkIsDestroyedWhenItIsReplaced) {
    const auto life = std::make_shared<int>(0);
    Log::setSink([life](LogCategory, LogLevel, std::string_view) {});
    EXPECT_EQ(life.use_count(), 2);
    Log::setSink([life](LogCategory, LogLevel, std::string_view) { Log::setSink({}); });
    EXPECT_EQ(life.use_count(), 2);
    Log(LogCategory::Algs).write(LogLevel::Error, "replaces its sink");
    EXPECT_EQ(life.use_count(), 1);
}

TEST_F(LogTest, ASinkThatReplacesItselfTwiceLeavesTheLast) {
    const auto life = std::make_shared<int>(0);
    Log::setSink([this, life](LogCategory, LogLevel, std::string_view) {
        Log::setSink([life](LogCategory, LogLevel, std::string_view) {});
        Log::setSink([this, life](LogCategory, LogLevel, std::string_view message) {
            lines.emplace_back(message);
        });
        EXPECT_EQ(life.use_count(), 3);  // ours, the running one's, the last one's
    });
    const Log log(LogCategory::Algs);
    log.write(LogLevel::Error, "1");
    EXPECT_EQ(life.use_count(), 2);
    log.write(LogLevel::Error, "2");
    EXPECT_THAT(lines, ElementsAre("2"));
}

TEST_F(LogTest, FlushingInASinkDoesNothing) {
    Log::setSink([this](LogCategory, LogLevel, std::string_view message) {
        Log::flush();
        lines.emplace_back(message);
    });
    Log(LogCategory::Algs).write(LogLevel::Error, "m");
    EXPECT_THAT(lines, ElementsAre("m"));
}

TEST_F(LogTest, AMessageEndsWithAZeroByteAndMayHoldSome) {
    std::string seen;
    vexa_log_set_sink(
        [](void* context, vexa_log_category, vexa_log_level, const char* message, size_t length) {
            static_cast<std::string*>(context)->assign(message, length + 1);
        },
        &seen, nullptr);
    Log(LogCategory::Algs).write(LogLevel::Error, std::string_view("a\0bcd", 4));
    EXPECT_EQ(seen, std::string("a\0bc\0", 5));
}

TEST_F(LogTest, LoggingKeepsTheErrorNumber) {
    Log::setSink([](LogCategory, LogLevel, std::string_view) { errno = EBADF; });
    errno = EPERM;
    Log(LogCategory::Algs).write(LogLevel::Error, "m");
    EXPECT_EQ(errno, EPERM);
}

TEST_F(LogTest, UnknownCodesAreNeverEnabled) {
    const auto category = coded<vexa_log_category>(4);
    vexa_log_set_level(category, VEXA_LOG_DEBUG);
    EXPECT_EQ(vexa_log_get_level(category), VEXA_LOG_OFF);
    EXPECT_FALSE(vexa_log_is_enabled(category, VEXA_LOG_ERROR));
    vexa_log_write(category, VEXA_LOG_ERROR, "m", 1);
    vexa_log_set_level(VEXA_LOG_ALGS, coded<vexa_log_level>(4));
    EXPECT_EQ(vexa_log_get_level(VEXA_LOG_ALGS), VEXA_LOG_ERROR);
    EXPECT_FALSE(vexa_log_is_enabled(VEXA_LOG_ALGS, coded<vexa_log_level>(4)));
    vexa_log_write(VEXA_LOG_ALGS, coded<vexa_log_level>(-1), "m", 1);
    EXPECT_THAT(lines, IsEmpty());
}

TEST_F(LogTest, ALevelReadsBack) {
    Log::setLevel(LogCategory::Pipeline, LogLevel::Info);
    EXPECT_EQ(Log::level(LogCategory::Pipeline), LogLevel::Info);
    EXPECT_EQ(Log::level(LogCategory::Algs), LogLevel::Error);
}

TEST_F(LogTest, WithoutASinkALineGoesToStandardError) {
    Log::setSink({});
    testing::internal::CaptureStderr();
    Log(LogCategory::HIDService).write(LogLevel::Error, "disjoint image");
    EXPECT_THAT(testing::internal::GetCapturedStderr(),
                testing::EndsWith(" HIDService error: disjoint image\n"));
}

TEST_F(LogTest, ThreadsLogOneAtATime) {
    std::array<std::thread, 4> threads;
    for (std::thread& thread : threads) {
        thread = std::thread([] {
            const Log log(LogCategory::Pipeline);
            for (int round = 0; round < 250; ++round) {
                log.write(LogLevel::Error, "m");
                log.write(LogLevel::Debug, "never");
            }
        });
    }
    for (int round = 0; round < 100; ++round) Log::setLevel(LogCategory::Algs, LogLevel::Info);
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(lines, std::vector<std::string>(1000, "Pipeline/error/m"));
}

TEST(LogNameTest, NamesReadBack) {
    for (const LogCategory category : kCategories) {
        EXPECT_EQ(logCategoryFromName(logCategoryName(category)), category);
    }
    for (const LogLevel level : {LogLevel::Debug, LogLevel::Info, LogLevel::Error, LogLevel::Off}) {
        EXPECT_EQ(logLevelFromName(logLevelName(level)), level);
    }
    EXPECT_EQ(logCategoryName(LogCategory::HIDService), "HIDService");
    EXPECT_EQ(logCategoryName(LogCategory::Algs), "Algs");
    EXPECT_EQ(logLevelName(LogLevel::Debug), "debug");
}

TEST(LogNameTest, OnlyLevelsAreReadRegardlessOfCase) {
    EXPECT_EQ(logLevelFromName("DEBUG"), LogLevel::Debug);
    EXPECT_EQ(logLevelFromName("Off"), LogLevel::Off);
    EXPECT_EQ(logLevelFromName("warn"), std::nullopt);
    EXPECT_EQ(logLevelFromName("debugging"), std::nullopt);
    EXPECT_EQ(logLevelFromName(""), std::nullopt);
    EXPECT_EQ(logCategoryFromName("algs"), std::nullopt);
    EXPECT_EQ(logCategoryFromName(""), std::nullopt);
}

TEST(LogNameTest, UnknownCodesHaveAPlaceholder) {
    EXPECT_EQ(logCategoryName(static_cast<LogCategory>(9)), "?");
    EXPECT_EQ(logLevelName(static_cast<LogLevel>(9)), "?");
}

}  // namespace
}  // namespace Vexa
