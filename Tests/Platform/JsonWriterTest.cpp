#include "Platform/JsonWriter.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <string>

namespace Vexa {
namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();

std::string written(const PropertyValue& value) {
    std::string text;
    JsonWriter(text, JsonWriter::Style::Compact).value(value);
    return text;
}

void writeSample(JsonWriter& writer) {
    writer.beginObject();
    writer.key("list");
    writer.beginArray();
    writer.number(std::int64_t{-1});
    writer.beginArray();
    writer.endArray();
    writer.beginObject();
    writer.endObject();
    writer.string("x");
    writer.endArray();
    writer.key("yes");
    writer.boolean(true);
    writer.key("none");
    writer.null();
    writer.endObject();
}

TEST(JsonWriterTest, IndentsByTwoSpacesALevel) {
    std::string text;
    JsonWriter writer(text);
    writeSample(writer);
    EXPECT_EQ(text, R"({
  "list": [
    -1,
    [],
    {},
    "x"
  ],
  "yes": true,
  "none": null
})");
}

TEST(JsonWriterTest, WritesOnOneLine) {
    std::string text;
    JsonWriter writer(text, JsonWriter::Style::Compact);
    writeSample(writer);
    EXPECT_EQ(text, R"({"list":[-1,[],{},"x"],"yes":true,"none":null})");
}

TEST(JsonWriterTest, AppendsBehindWhatIsThere) {
    std::string text = "before ";
    JsonWriter writer(text);
    writer.beginArray();
    text.reserve(1000);  // the writer keeps no pointer into the text
    writer.endArray();
    EXPECT_EQ(text, "before []");
}

TEST(JsonWriterTest, KeepsTheKindOfANumber) {
    EXPECT_EQ(written(200.0), "200.0");
    EXPECT_EQ(written(200), "200");
    EXPECT_EQ(written(std::numeric_limits<std::uint64_t>::max()), "18446744073709551615");
    EXPECT_EQ(written(std::numeric_limits<std::int64_t>::min()), "-9223372036854775808");
    EXPECT_EQ(written(-0.0), "-0.0");
    EXPECT_EQ(written(0.1), "0.1");
    EXPECT_EQ(written(0.1f), "0.10000000149011612");
    EXPECT_EQ(written(1e300), "1e+300");
    EXPECT_EQ(written(5e-324), "5e-324");
}

TEST(JsonWriterTest, ANumberThatIsNotFiniteIsNull) {
    EXPECT_EQ(written(PropertyValue::Array{kInfinity, -kInfinity,
                                           std::numeric_limits<double>::quiet_NaN(),
                                           std::numeric_limits<float>::infinity()}),
              "[null,null,null,null]");
    std::string text;
    JsonWriter writer(text, JsonWriter::Style::Compact);
    writer.beginObject();
    writer.key("a");
    writer.number(kInfinity);
    writer.key("b");
    writer.number(1.0);
    writer.endObject();
    EXPECT_EQ(text, R"({"a":null,"b":1.0})");
}

TEST(JsonWriterTest, NoValueIsNull) {
    EXPECT_EQ(written(PropertyValue()), "null");
    EXPECT_EQ(written(PropertyValue::Array{PropertyValue(), 1}), "[null,1]");
    EXPECT_EQ(written(PropertyValue::Dictionary{{"a", PropertyValue()}}), R"({"a":null})");
}

TEST(JsonWriterTest, BytesAreHexadecimalText) {
    EXPECT_EQ(written(PropertyValue::Bytes{0x01, 0xAB, 0x00}), R"("01 ab 00 ")");
    EXPECT_EQ(written(PropertyValue::Bytes{}), R"("")");
}

TEST(JsonWriterTest, EscapesWhatMustBe) {
    EXPECT_EQ(written("\"\\/\b\f\n\r\t"), R"("\"\\/\b\f\n\r\t")");
    EXPECT_EQ(written(std::string("\0\x01\x1F\x7F", 4)), "\"\\u0000\\u0001\\u001f\x7F\"");
    EXPECT_EQ(written(PropertyValue::Dictionary{{"a\"b", 1}}), R"({"a\"b":1})");
}

TEST(JsonWriterTest, EscapesAtEveryPlaceOfALongText) {
    for (std::size_t length = 1; length < 40; ++length) {
        for (std::size_t at = 0; at < length; ++at) {
            for (const char special : {'"', '\\', '\x1F', '\x01'}) {
                std::string text(length, ' ');
                text[at] = special;
                std::string expected = text;
                expected.replace(at, 1,
                                 special == '"'      ? "\\\""
                                 : special == '\\'   ? "\\\\"
                                 : special == '\x01' ? "\\u0001"
                                                     : "\\u001f");
                ASSERT_EQ(written(text), '"' + expected + '"');
            }
        }
    }
}

TEST(JsonWriterTest, EveryPlainCharacterStandsAsItIs) {
    std::string plain;
    for (int round = 0; round < 3; ++round) {
        for (char character = 0x20; character != 0x7F; ++character) {
            if (character != '"' && character != '\\') plain += character;
        }
    }
    EXPECT_EQ(written(plain), '"' + plain + '"');
}

TEST(JsonWriterTest, ValidUtf8StandsAsItIs) {
    const std::string text =
        "\xC2\x80 \xDF\xBF \xE0\xA0\x80 \xED\x9F\xBF \xEE\x80\x80 \xEF\xBF\xBF \xF0\x90\x80\x80 "
        "\xF4\x8F\xBF\xBF";
    EXPECT_EQ(written(text), '"' + text + '"');
}

TEST(JsonWriterTest, EachMaximalInvalidPartIsReplacedOnce) {
    const std::string r = "\xEF\xBF\xBD";
    const struct {
        std::string text;
        std::string expected;
    } cases[] = {
        {"\x80", r},
        {"a\xFF"
         "b",
         "a" + r + "b"},
        {"\xC0\xAF", r + r},
        {"\xC3", r},
        {"\xC3(", r + "("},
        {"\xE0\x80\x80", r + r + r},
        {"\xE2\x82", r},
        {"\xE2\x82x", r + "x"},
        {"\xED\xA0\x80", r + r + r},
        {"\xF0\x80\x80\x80", r + r + r + r},
        {"\xF0\x9F\x98", r},
        {"\xF0\x9F\x98\xF0\x9F\x98\x80", r + "\xF0\x9F\x98\x80"},
        {"\xF1\x80\x80\xE1\x80\xC2"
         "b\x80"
         "c\x80\xBF"
         "d",
         r + r + r + "b" + r + "c" + r + r + "d"},
        {"\xF4\x90\x80\x80", r + r + r + r},
        {"\xF5\xFE", r + r},
    };
    for (const auto& [text, expected] : cases) {
        EXPECT_EQ(written(text), '"' + expected + '"') << testing::PrintToString(text);
    }
}

TEST(JsonWriterTest, PlainStringIsQuotedAsItIs) {
    std::string text;
    JsonWriter writer(text, JsonWriter::Style::Compact);
    writer.beginArray();
    writer.plainString("01 ab ");
    writer.plainString("");
    writer.endArray();
    EXPECT_EQ(text, R"(["01 ab ",""])");
}

TEST(JsonWriterTest, MembersComeInTheOrderOfTheDictionary) {
    EXPECT_EQ(written(PropertyValue::Dictionary{{"b", 1}, {"a", 2}, {"", 3}, {"B", 4}}),
              R"({"":3,"B":4,"a":2,"b":1})");
}

TEST(JsonWriterTest, ValuesTakeTheirPlaceAmongOtherCalls) {
    std::string text;
    JsonWriter writer(text);
    writer.beginObject();
    writer.key("v");
    writer.value(PropertyValue::Array{1, PropertyValue::Dictionary{{"k", 2}}});
    writer.key("w");
    writer.value("x");
    writer.endObject();
    EXPECT_EQ(text, R"({
  "v": [
    1,
    {
      "k": 2
    }
  ],
  "w": "x"
})");
}

TEST(JsonWriterTest, AnyDepthIsWritten) {
    constexpr std::size_t kDepth = 200'000;
    PropertyValue value = 1;
    for (std::size_t level = 0; level < kDepth; ++level) {
        value = PropertyValue::Array{std::move(value)};
    }
    EXPECT_EQ(written(value), std::string(kDepth, '[') + "1" + std::string(kDepth, ']'));
}

}  // namespace
}  // namespace Vexa
