#include "Platform/Json.h"

#include <gtest/gtest.h>

#include <clocale>
#include <cstdint>
#include <limits>
#include <string>

namespace Vexa {
namespace {

void expectRoundTrip(const PropertyValue& value) {
    for (const auto style : {JsonWriter::Style::Indented, JsonWriter::Style::Compact}) {
        const std::string text = writeJson(value, style);
        const PropertyValue back = readJson(text);
        EXPECT_EQ(back, value) << text;
        EXPECT_EQ(back.type(), value.type()) << text;
    }
}

TEST(JsonTest, AValueWithAJsonFormReadsBackTheSame) {
    expectRoundTrip(PropertyValue::null());
    expectRoundTrip(true);
    expectRoundTrip(false);
    expectRoundTrip(0);
    expectRoundTrip(std::numeric_limits<std::int64_t>::min());
    expectRoundTrip(std::numeric_limits<std::int64_t>::max());
    expectRoundTrip(std::numeric_limits<std::uint64_t>::max());
    expectRoundTrip(200.0);
    expectRoundTrip(-0.0);
    expectRoundTrip(0.1);
    expectRoundTrip(1e23);
    expectRoundTrip(0x1p64);
    expectRoundTrip(std::numeric_limits<double>::max());
    expectRoundTrip(std::numeric_limits<double>::denorm_min());
    expectRoundTrip("");
    expectRoundTrip(std::string("a\0\"\\\n\x7F\xC3\xA9\xF0\x9F\x98\x80", 12));
    expectRoundTrip(PropertyValue::Array{});
    expectRoundTrip(PropertyValue::Dictionary{});
    expectRoundTrip(PropertyValue::Dictionary{
        {"", PropertyValue::Array{1, 1.0, "1", PropertyValue::Array{PropertyValue::null()}}},
        {"\n", PropertyValue::Dictionary{{"a", false}}}});
}

TEST(JsonTest, AFloatReadsBackAsTheDoubleOfItsValue) {
    const PropertyValue back = readJson(writeJson(0.1f));
    EXPECT_EQ(back.type(), PropertyValue::Type::Double);
    EXPECT_EQ(back, PropertyValue(0.1f));
    EXPECT_EQ(back.toFloat(), 0.1f);
}

TEST(JsonTest, MalformedTextIsNoValue) {
    for (const char* text : {"", " ", "[1", "[1]x", "{\"a\":1,}", "\"\xFF\"", R"("\ud800")",
                             "\xEF\xBB\xBF[]", "nul", "1e"}) {
        EXPECT_FALSE(readJson(text)) << text;
    }
}

TEST(JsonTest, WhiteSpaceAroundTheValueIsFine) {
    EXPECT_EQ(readJson(" \t\r\n[1]\n "), PropertyValue(PropertyValue::Array{1}));
}

TEST(JsonTest, TheLastOfDuplicateMembersStands) {
    EXPECT_EQ(readJson(R"({"a":1,"b":2,"a":[3],"a":{"a":4}})"),
              PropertyValue(
                  PropertyValue::Dictionary{{"a", PropertyValue::Dictionary{{"a", 4}}}, {"b", 2}}));
}

TEST(JsonTest, OverflowReadsAsInfinityAndIsWrittenAsNull) {
    const PropertyValue value = readJson("[1e400,-1e99999999999]");
    ASSERT_TRUE(value.asArray());
    constexpr double kInfinity = std::numeric_limits<double>::infinity();
    EXPECT_EQ(value, PropertyValue(PropertyValue::Array{kInfinity, -kInfinity}));
    EXPECT_EQ(writeJson(value, JsonWriter::Style::Compact), "[null,null]");
}

TEST(JsonTest, DeepTextReadsToAValueOrToNone) {
    const auto nested = [](std::size_t depth) {
        return std::string(depth, '[') + std::string(depth, ']');
    };
    EXPECT_TRUE(readJson(nested(512)));
    EXPECT_FALSE(readJson(nested(513)));
    EXPECT_FALSE(readJson(nested(1'000'000)));
    EXPECT_FALSE(readJson(std::string(1'000'000, '[')));
    EXPECT_EQ(writeJson(readJson(nested(512)), JsonWriter::Style::Compact), nested(512));
}

TEST(JsonTest, TheLocaleChangesNothing) {
    const std::string before = std::setlocale(LC_ALL, nullptr);
    for (const char* name : {"de_DE.UTF-8", "de_DE.utf8", "fr_FR.UTF-8", "C.UTF-8"}) {
        if (std::setlocale(LC_ALL, name)) break;
    }
    const PropertyValue value = readJson("[0.5,1e-5,1234567.25,1e400]");
    const std::string text = writeJson(value, JsonWriter::Style::Compact);
    std::setlocale(LC_ALL, before.c_str());
    EXPECT_EQ(text, "[0.5,1e-05,1234567.25,null]");
}

}  // namespace
}  // namespace Vexa
