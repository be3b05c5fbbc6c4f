#include "Platform/ReportDescriptor.h"

#include "Tools/HidReportDescriptor.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using Bytes = std::vector<std::uint8_t>;
using Report = ReportDescriptor::Report;

constexpr auto kInput = ReportKind::Input;
constexpr auto kOutput = ReportKind::Output;
constexpr auto kFeature = ReportKind::Feature;

Bytes joined(std::initializer_list<Bytes> parts) {
    Bytes all;
    for (const Bytes& part : parts) all.insert(all.end(), part.begin(), part.end());
    return all;
}

std::vector<Report> reportsOf(const Bytes& bytes) {
    ReportDescriptorError error;
    const auto descriptor = parseReportDescriptor(bytes, &error);
    if (!descriptor) {
        ADD_FAILURE() << error.reason << " at " << error.offset;
        return {};
    }
    return descriptor->reports;
}

/// "reason at offset".
std::string errorOf(const Bytes& bytes) {
    ReportDescriptorError error;
    if (parseReportDescriptor(bytes, &error)) return "none";
    EXPECT_FALSE(parseReportDescriptor(bytes)) << "without asking why";
    return std::string(error.reason) + " at " + std::to_string(error.offset);
}

TEST(ReportDescriptorTest, ReadsOurOwn) {
    const auto& bytes = VexaTouch::Tools::kHidReportDescriptor;
    const UsageRange surface{0xFF60, 1, 1};
    const auto usages = [](std::initializer_list<std::uint16_t> ids) {
        std::vector<UsageRange> ranges;
        for (const std::uint16_t id : ids) ranges.push_back({0xFF60, id, id});
        return ranges;
    };
    const auto descriptor = parseReportDescriptor(bytes);
    ASSERT_TRUE(descriptor);
    EXPECT_THAT(descriptor->reports,
                ElementsAre(Report{kInput, 1, 576, {surface}, usages({16, 17, 18, 19, 20})},
                            Report{kInput, 2, 72, {surface}, usages({32})},
                            Report{kFeature, 4, 16, {surface}, usages({48})},
                            Report{kFeature, 31, 32, {surface}, usages({49})},
                            Report{kFeature, 63, 32, {surface}, usages({50})}));
    EXPECT_EQ(descriptor->longest(kInput), 73U);
    EXPECT_EQ(descriptor->longest(kFeature), 5U);
    EXPECT_EQ(descriptor->longest(kOutput), 0U);
    EXPECT_EQ(descriptor->find(kInput, 2)->bytes(), 9U);
    EXPECT_EQ(descriptor->find(kInput, 4), nullptr);
}

TEST(ReportDescriptorTest, ReadsABootKeyboard) {
    const Bytes keyboard = {
        0x05, 0x01, 0x09, 0x06, 0xA1, 0x01,                          // Generic Desktop: Keyboard
        0x05, 0x07, 0x19, 0xE0, 0x29, 0xE7, 0x15, 0x00, 0x25, 0x01,  // Keyboard E0..E7
        0x75, 0x01, 0x95, 0x08, 0x81, 0x02,                          // 8 bits
        0x95, 0x01, 0x75, 0x08, 0x81, 0x01,                          // padding
        0x95, 0x05, 0x75, 0x01, 0x05, 0x08, 0x19, 0x01, 0x29, 0x05,  // LEDs 1..5
        0x91, 0x02, 0x95, 0x01, 0x75, 0x03, 0x91, 0x01,              // and 3 bits
        0x95, 0x06, 0x75, 0x08, 0x15, 0x00, 0x25, 0x65, 0x05, 0x07,  // six keys
        0x19, 0x00, 0x29, 0x65, 0x81, 0x00, 0xC0};
    EXPECT_THAT(reportsOf(keyboard),
                ElementsAre(Report{kInput, 0, 64, {{1, 6, 6}}, {{7, 0xE0, 0xE7}, {7, 0, 0x65}}},
                            Report{kOutput, 0, 8, {{1, 6, 6}}, {{8, 1, 5}}}));
    const auto descriptor = parseReportDescriptor(keyboard);
    EXPECT_EQ(descriptor->longest(kInput), 8U) << "no id is sent";
    EXPECT_FALSE(descriptor->reports[0].isVendors());
}

TEST(ReportDescriptorTest, PushAndPopKeepTheWholeGlobalState) {
    EXPECT_THAT(reportsOf({0x05, 0x01, 0x75, 0x08, 0x95, 0x02, 0x85, 0x01,        // 2 bytes of id 1
                           0xA4, 0xA4,                                            // push twice
                           0x06, 0x00, 0xFF, 0x75, 0x10, 0x95, 0x03, 0x85, 0x02,  // 3 words of id 2
                           0x09, 0x05, 0x81, 0x02, 0xB4, 0x09, 0x06, 0x81, 0x02, 0xB4}),
                ElementsAre(Report{kInput, 2, 48, {}, {{0xFF00, 5, 5}}},
                            Report{kInput, 1, 16, {}, {{1, 6, 6}}}));
}

TEST(ReportDescriptorTest, AShortUsageTakesThePageInForceAtTheMainItem) {
    EXPECT_THAT(
        reportsOf({0x05, 0x01, 0x09, 0x30, 0x06, 0x60, 0xFF, 0x75, 0x08, 0x95, 0x01, 0x81, 0x02}),
        ElementsAre(Report{kInput, 0, 8, {}, {{0xFF60, 0x30, 0x30}}}));
}

TEST(ReportDescriptorTest, AUsageOfFourBytesBringsItsPage) {
    EXPECT_THAT(reportsOf({0x05, 0x01, 0x75, 0x08, 0x95, 0x01,  //
                           0x0B, 0x34, 0x12, 0x60, 0xFF,        // Usage FF60:1234
                           0x1B, 0x01, 0x00, 0x09, 0x00, 0x2B, 0x08, 0x00, 0x09, 0x00,  // Buttons
                           0x81, 0x02}),
                ElementsAre(Report{kInput, 0, 8, {}, {{0xFF60, 0x1234, 0x1234}, {9, 1, 8}}}));
}

TEST(ReportDescriptorTest, ARangeWithoutSenseHoldsNothing) {
    const Bytes item = {0x05, 0x09, 0x75, 0x08, 0x95, 0x01};
    const Bytes input = {0x81, 0x02};
    const std::vector<UsageRange> none = {{9, 0, 0}};
    // Backwards, from page to page, with one end of two and one of four bytes, without a beginning.
    for (const Bytes& range :
         {Bytes{0x19, 0x08, 0x29, 0x01},
          Bytes{0x1B, 0x01, 0x00, 0x01, 0x00, 0x2B, 0x08, 0x00, 0x02, 0x00},
          Bytes{0x19, 0x01, 0x2B, 0x08, 0x00, 0x09, 0x00}, Bytes{0x29, 0x08}}) {
        EXPECT_THAT(reportsOf(joined({item, range, input})),
                    ElementsAre(Report{kInput, 0, 8, {}, none}));
    }
}

TEST(ReportDescriptorTest, LocalItemsAreGoneAfterAMainItem) {
    EXPECT_THAT(reportsOf({0x05, 0x01, 0x75, 0x08, 0x95, 0x01, 0x19, 0x05, 0x09, 0x30, 0x81, 0x02,
                           0x29, 0x08, 0xB1, 0x02}),
                ElementsAre(Report{kInput, 0, 8, {}, {{1, 0x30, 0x30}}},
                            Report{kFeature, 0, 8, {}, {{1, 0, 0}}}));
}

TEST(ReportDescriptorTest, OnlyTheOutermostCollectionTellsWhatAReportIsAbout) {
    EXPECT_THAT(reportsOf({0x06, 0x00, 0xFF, 0x75, 0x08, 0x95, 0x01, 0x85, 0x01,  //
                           0x09, 0x01, 0xA1, 0x01, 0x09, 0x02, 0xA1, 0x00, 0x09, 0x03, 0x81,
                           0x02, 0xC0, 0x09, 0x04, 0x81, 0x02, 0xC0,  //
                           0x05, 0x0C, 0x09, 0x05, 0xA1, 0x01, 0x09, 0x06, 0x81, 0x02, 0xC0}),
                ElementsAre(Report{kInput,
                                   1,
                                   24,
                                   {{0xFF00, 1, 1}, {12, 5, 5}},
                                   {{0xFF00, 3, 3}, {0xFF00, 4, 4}, {12, 6, 6}}}));
}

TEST(ReportDescriptorTest, LongAndReservedItemsArePassedOver) {
    EXPECT_THAT(reportsOf({0xFE, 0x03, 0xF0, 0x81, 0x81, 0x81,  // a long item with three bytes
                           0xFE, 0x00, 0xF1,                    // and with none
                           0x0C, 0xFD, 0x81,              // reserved type, 0 and 1 bytes
                           0x75, 0x08, 0x95, 0x01, 0xF1, 0x55, 0xF5, 0x55, 0xF9, 0x55,  // tags
                           0x81, 0x02}),
                ElementsAre(Report{kInput, 0, 8, {}, {{0, 0, 0}}}));
}

TEST(ReportDescriptorTest, AlternativesInADelimiterAreUsagesLikeOthers) {
    EXPECT_THAT(reportsOf({0x05, 0x01, 0x75, 0x08, 0x95, 0x01, 0xA9, 0x01, 0x09, 0x30, 0x09, 0x31,
                           0xA9, 0x00, 0x81, 0x02}),
                ElementsAre(Report{kInput, 0, 8, {}, {{1, 0x30, 0x30}, {1, 0x31, 0x31}}}));
}

TEST(ReportDescriptorTest, PartsOfAByteAreCountedAsBits) {
    const auto reports =
        reportsOf({0x75, 0x01, 0x95, 0x03, 0x81, 0x02, 0x75, 0x07, 0x95, 0x02, 0x81, 0x01});
    ASSERT_EQ(reports.size(), 1U);
    EXPECT_EQ(reports[0].bits, 17U);
    EXPECT_EQ(reports[0].bytes(), 3U);
}

TEST(ReportDescriptorTest, NothingDescribesNothing) {
    EXPECT_THAT(reportsOf({}), IsEmpty());
    // No bits, but the report is there.
    EXPECT_THAT(reportsOf({0x81, 0x02}), ElementsAre(Report{kInput, 0, 0, {}, {}}));
}

TEST(ReportDescriptorTest, SaysWhereAndWhyItIsWrong) {
    const std::vector<std::pair<Bytes, std::string>> cases = {
        {{0x05}, "the bytes break off within an item at 0"},
        {{0x75, 0x08, 0x27, 0, 0, 0}, "the bytes break off within an item at 2"},
        {{0xFE}, "the bytes break off within an item at 0"},
        {{0xFE, 0x02, 0x00, 0x01}, "the bytes break off within an item at 0"},
        {{0x85, 0x00}, "report id 0 is reserved at 0"},
        {{0x86, 0x00, 0x01}, "a report id is above 255 at 0"},
        {{0xB4}, "a pop without a push at 0"},
        {{0xA4, 0xB4, 0xB4}, "a pop without a push at 2"},
        {{0xC0}, "a collection is ended that was not begun at 0"},
        {{0xA1, 0x01, 0xA1, 0x01, 0xC0}, "a collection is not ended at 5"},
        {{0xA9, 0x01}, "a delimiter is not closed at 2"},
        {{0xA9, 0x00}, "a delimiter is closed that was not opened at 0"},
        {{0xA9, 0x01, 0xA9, 0x01}, "a delimiter within another at 2"},
        {{0xA9, 0x01, 0x81, 0x02}, "a delimiter is not closed at 2"},
        {{0x77, 0xFF, 0xFF, 0xFF, 0xFF, 0x97, 0xFF, 0xFF, 0xFF, 0xFF, 0x81, 0x02},
         "the report is too long at 10"},
        {{0x75, 0x08, 0x96, 0x00, 0x40, 0x81, 0x02, 0x95, 0x01, 0x81, 0x02},
         "the report is too long at 9"},
        {Bytes(4097, 0xA4), "longer than 4096 bytes at 4096"},
    };
    for (const auto& [bytes, error] : cases) EXPECT_EQ(errorOf(bytes), error);
}

TEST(ReportDescriptorTest, TheLongestReportAndDescriptorAreTaken) {
    EXPECT_EQ(reportsOf({0x75, 0x08, 0x96, 0x00, 0x40, 0x81, 0x02})[0].bytes(), kLongestHidReport);
    EXPECT_EQ(errorOf(Bytes(4096, 0xA4)), "none");
    EXPECT_EQ(errorOf(Bytes(4096, 0xA0)), "a collection is not ended at 4096");
}

}  // namespace

// Found by the tests' printer.
void PrintTo(const UsageRange& range, std::ostream* out) {
    *out << std::hex << range.page << ':' << range.first << '-' << range.last << std::dec;
}
void PrintTo(const ReportDescriptor::Report& report, std::ostream* out) {
    *out << static_cast<int>(report.kind) << ' ' << int{report.id} << ", " << report.bits
         << " bits, " << testing::PrintToString(report.collections) << ' '
         << testing::PrintToString(report.usages);
}

}  // namespace Vexa
