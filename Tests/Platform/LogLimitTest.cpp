#include "Platform/Library/LogLimit.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <vector>

namespace Vexa::Library {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using namespace std::chrono_literals;

class LogLimitTest : public testing::Test {
protected:
    /// What is written when this is logged now.
    std::vector<std::string> log(const std::string& text, vexa_log_level level = VEXA_LOG_ERROR,
                                 vexa_log_category category = VEXA_LOG_HID_SERVICE) {
        std::vector<std::string> lines;
        limit.pass({.category = category, .level = level, .time = {}, .text = text}, now,
                   [&](const LogMessage& line) { lines.push_back(line.text); });
        return lines;
    }
    /// How many of these are written, the messages alone.
    std::size_t logMany(int count, const std::string& text) {
        std::size_t written = 0;
        for (int i = 0; i < count; ++i) written += log(text + std::to_string(i)).size();
        return written;
    }
    std::vector<std::string> tellAll() {
        std::vector<std::string> lines;
        limit.tellAll(now, [&](const LogMessage& line) { lines.push_back(line.text); });
        return lines;
    }

    LogLimit limit;
    LogLimit::Time now{1h};
};

TEST_F(LogLimitTest, OfErrorsThatDifferInNumbersSoManyAreWritten) {
    for (int i = 0; i < 20; ++i) {
        const std::string text = "frame " + std::to_string(i) + " -> " + std::to_string(7 * i);
        EXPECT_THAT(log(text), ElementsAre(text));
    }
    EXPECT_THAT(log("frame 20 -> 8"), IsEmpty());
    EXPECT_THAT(log("frame 21 -> 9"), IsEmpty());
    // Another text, and the same of another category.
    EXPECT_THAT(log("image 21 -> 9"), SizeIs(1));
    EXPECT_THAT(log("frame 21 -> 9", VEXA_LOG_ERROR, VEXA_LOG_ALGS), SizeIs(1));
    EXPECT_THAT(tellAll(), ElementsAre("2 more like this left out, the last: frame 21 -> 9"));
    EXPECT_THAT(tellAll(), IsEmpty());
}

TEST_F(LogLimitTest, WhatWasLeftOutIsToldOfWhenTheTimeIsOver) {
    EXPECT_EQ(logMany(1000, "frame "), 20U);
    now += 60s - 1ns;
    EXPECT_THAT(log("other"), ElementsAre("other"));
    now += 1ns;
    EXPECT_THAT(log("other"),
                ElementsAre("980 more like this left out, the last: frame 999", "other"));
    now += 60s;
    EXPECT_THAT(log("other"), ElementsAre("other"));
    // It has ended and may begin anew.
    EXPECT_EQ(logMany(1000, "frame "), 20U);
}

TEST_F(LogLimitTest, WhatGoesOnIsOneMessageAndOneLineEachTime) {
    EXPECT_EQ(logMany(1000, "frame "), 20U);
    for (int minute = 0; minute < 3; ++minute) {
        now += 60s;
        EXPECT_THAT(log("frame 7"), SizeIs(2));
        EXPECT_EQ(logMany(1000, "frame "), 0U);
    }
}

TEST_F(LogLimitTest, FewArePassedForEver) {
    for (int minute = 0; minute < 10; ++minute) {
        EXPECT_EQ(logMany(20, "frame "), 20U);
        now += 60s;
    }
    EXPECT_THAT(tellAll(), IsEmpty());
}

TEST_F(LogLimitTest, LevelsThatWereAskedForPass) {
    for (int i = 0; i < 100; ++i) {
        EXPECT_THAT(log("frame", VEXA_LOG_DEBUG), SizeIs(1));
        EXPECT_THAT(log("frame", VEXA_LOG_INFO), SizeIs(1));
    }
}

TEST_F(LogLimitTest, AKindThatGivesItsPlaceAwayIsToldOf) {
    EXPECT_EQ(logMany(21, "frame "), 20U);
    for (char kind = 'a'; kind < 'a' + 15; ++kind) {
        now += 1s;
        EXPECT_THAT(log(std::string(1, kind)), SizeIs(1));
    }
    EXPECT_THAT(log("z"), ElementsAre("1 more like this left out, the last: frame 20", "z"));
}

TEST_F(LogLimitTest, ALongTextIsKeptInPart) {
    const std::string text(5000, 'x');
    for (int i = 0; i < 21; ++i) log(text);
    EXPECT_THAT(tellAll(), ElementsAre("1 more like this left out, the last: " +
                                       std::string(LogLimit::kKeptLength, 'x')));
}

}  // namespace
}  // namespace Vexa::Library
