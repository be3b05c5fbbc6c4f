#include "Tools/EventDifference.h"

#include "Tests/Tools/CommandRun.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::ElementsAre;
using Testing::linesOf;

std::vector<EventRecord> taps(const std::vector<std::uint64_t>& indexes) {
    std::vector<EventRecord> events;
    for (const std::uint64_t index : indexes) {
        events.push_back({.index = index, .kind = EventKind::Tap});
    }
    return events;
}

/// Each row as the left index, the mark and the right index.
std::vector<std::string> rows(const std::vector<std::uint64_t>& expected,
                              const std::vector<std::uint64_t>& actual) {
    std::vector<std::string> all;
    std::vector<std::string> lines = linesOf(compareEvents(taps(expected), taps(actual)).text);
    for (std::size_t i = 2; i < lines.size(); ++i) {  // two lines of heading
        std::string line = lines[i];
        if (line == "...") {
            all.push_back(line);
            continue;
        }
        constexpr std::size_t width = 81;  // of the left side and the space behind it
        const auto index = [](std::string side) {
            side = side.substr(0, 8);
            side.erase(0, side.find_first_not_of(' '));
            return side;
        };
        line.resize(2 * width + 2, ' ');
        const std::string mark = line.substr(width, 1);
        all.push_back(index(line.substr(0, width)) + mark + index(line.substr(width + 2)));
    }
    return all;
}

TEST(EventDifferenceTest, EqualListsHaveNone) {
    EXPECT_EQ(compareEvents(taps({}), taps({})).differences, 0U);
    EXPECT_EQ(compareEvents(taps({1, 2}), taps({1, 2})).text, "");
}

TEST(EventDifferenceTest, WhatStandsAloneIsMarkedOnItsSide) {
    EXPECT_THAT(rows({1, 2, 3}, {1, 3}), ElementsAre("1 1", "2<", "3 3"));
    EXPECT_THAT(rows({1, 3}, {1, 2, 3}), ElementsAre("1 1", ">2", "3 3"));
    EXPECT_THAT(rows({}, {1}), ElementsAre(">1"));
    EXPECT_THAT(rows({1}, {}), ElementsAre("1<"));
}

TEST(EventDifferenceTest, WhatChangedStandsOppositeAndTheRestIsLinedUp) {
    EXPECT_THAT(rows({1, 2, 3, 4}, {1, 9, 3, 4}), ElementsAre("1 1", "2|9", "3 3", "4 4"));
    EXPECT_THAT(rows({1, 2, 3, 4, 5}, {2, 3, 7, 5, 6}),
                ElementsAre("1<", "2 2", "3 3", "4|7", "5 5", ">6"));
}

TEST(EventDifferenceTest, EqualEventsFarFromADifferenceAreLeftOut) {
    EXPECT_THAT(rows({1, 2, 3, 4, 5, 6, 7, 8, 9, 10}, {1, 2, 3, 4, 0, 6, 7, 8, 9, 10}),
                ElementsAre("...", "2 2", "3 3", "4 4", "5|0", "6 6", "7 7", "8 8", "..."));
}

TEST(EventDifferenceTest, VeryLongListsArePairedInOrder) {
    std::vector<std::uint64_t> expected;
    std::vector<std::uint64_t> actual;
    for (std::uint64_t i = 0; i < 5000; ++i) {
        expected.push_back(2 * i);
        actual.push_back(2 * i + 1);
    }
    EXPECT_EQ(compareEvents(taps(expected), taps(actual)).differences, 5000U);
    actual.push_back(1);
    EXPECT_EQ(compareEvents(taps(expected), taps(actual)).differences, 5001U);
}

}  // namespace
}  // namespace VexaTouch::Tools
