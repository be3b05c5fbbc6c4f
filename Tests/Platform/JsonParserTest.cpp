#include "Platform/JsonParser.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <limits>
#include <ostream>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;

constexpr double kInfinity = std::numeric_limits<double>::infinity();

/// Notes events as short texts; the pieces of a string or key count as one.
class EventLog final : public JsonHandler {
public:
    void onObjectBegin() override { events.emplace_back("{"); }
    void onObjectEnd() override { events.emplace_back("}"); }
    void onArrayBegin() override { events.emplace_back("["); }
    void onArrayEnd() override { events.emplace_back("]"); }
    void onKey(std::string_view piece, bool last) override { join("key ", piece, last); }
    void onString(std::string_view piece, bool last) override { join("text ", piece, last); }
    void onNumber(const JsonNumber& number) override {
        events.push_back(number.toPropertyValue().description());
        numbers.push_back(number);
    }
    void onBoolean(bool value) override { events.emplace_back(value ? "true" : "false"); }
    void onNull() override { events.emplace_back("null"); }

    std::vector<std::string> events;
    std::vector<JsonNumber> numbers;

private:
    void join(const char* kind, std::string_view piece, bool last) {
        text_ += piece;
        if (last) events.push_back(kind + std::exchange(text_, {}));
    }

    std::string text_;
};

struct Outcome {
    bool isRead = false;
    std::vector<std::string> events;
    std::uint64_t errorOffset = 0;
    std::string errorMessage;

    friend bool operator==(const Outcome&, const Outcome&) = default;
    friend void PrintTo(const Outcome& outcome, std::ostream* out) {
        *out << (outcome.isRead ? "read" : "fault: " + outcome.errorMessage) << " at "
             << outcome.errorOffset << ", events " << testing::PrintToString(outcome.events);
    }
};

Outcome read(const std::vector<std::string_view>& pieces) {
    EventLog log;
    JsonParser parser(log);
    Outcome outcome;
    outcome.isRead = true;
    for (const std::string_view piece : pieces) {
        outcome.isRead = outcome.isRead && parser.write(piece);
    }
    outcome.isRead = outcome.isRead && parser.finish();
    outcome.events = log.events;
    outcome.errorOffset = parser.errorOffset();
    outcome.errorMessage = parser.errorMessage();
    return outcome;
}

Outcome read(std::string_view text) {
    return read(std::vector<std::string_view>{text});
}

bool isRead(std::string_view text) {
    return read(text).isRead;
}

double readDouble(std::string_view text) {
    EventLog log;
    JsonParser parser(log);
    EXPECT_TRUE(parser.write(text) && parser.finish()) << text;
    if (log.numbers.size() != 1) {
        ADD_FAILURE() << "not one number: " << text;
        return 0;
    }
    EXPECT_EQ(log.numbers[0].kind, JsonNumber::Kind::Double) << text;
    return log.numbers[0].doubleValue;
}

/// Texts in which a cut anywhere could matter.
const std::vector<std::string>& textsToCut() {
    static const std::vector<std::string> texts = {
        R"( {"a" : [1, -2.5e+3, true, false, null, "x\n\u00e9\ud83d\ude00é😀"], "é":{}} )",
        "-0",
        "-0.0",
        "18446744073709551615",
        "-9223372036854775808",
        "184467440737095516150",
        "1e99999999999",
        "[-1e99999999999]",
        R"({"a":{"b":[1,2,1E-99999999999 ,"x"]},"c":0.5})",
        "[0e99999999999,1e99999999999,-2.5e99999999999999999999]",
        "1e99999999999.5",
        "123456789012345678901234e2147483647",
        "[1e-2147483648,1e2147483647,1e2147483648]",
        "[1e99999999999,,1]",
        R"({"a":1e99999999999)",
        "1e",
        "1e+",
        "-",
        "1.",
        "01",
        "[1,]",
        "{,}",
        R"({"a":1,})",
        R"("\x")",
        R"("\ud800")",
        R"("\ud800\u0041")",
        R"("\udc00")",
        "\"\xC3\x28\"",
        "\"\xED\xA0\x80\"",
        "\"\xF0\x9F\x98\"",
        "tru",
        "nul",
        "[1]]",
        "[1] 2",
        "\xEF\xBB\xBF[]",
        "\"\x01\"",
        "\"a\nb\"",
        "// c\n1",
        "[1 2]",
        "{\"a\" 1}",
        "{1:2}",
        "'a'",
        "NaN",
        "+1",
        ".5"};
    return texts;
}

TEST(JsonParserTest, HandsOverEventsInTheOrderOfTheText) {
    const Outcome outcome = read(R"( { "a" : [ 1, -2.5e+3, true, false, null, "x" ], "b": {} } )");
    EXPECT_TRUE(outcome.isRead);
    EXPECT_THAT(outcome.events, ElementsAre("{", "key a", "[", "1", "-2500.0", "true", "false",
                                            "null", "text x", "]", "key b", "{", "}", "}"));
}

TEST(JsonParserTest, ResolvesEscapes) {
    EXPECT_THAT(
        read(R"("\"\\\/\b\f\n\r\t\u0041\u00e9\u20ac\ud83d\ude00\u0000")").events,
        ElementsAre(std::string("text \"\\/\b\f\n\r\tA\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80") +
                    '\0'));
}

TEST(JsonParserTest, LongStringsArriveWhole) {
    const std::string plain(100'000, 'x');
    EXPECT_THAT(read('"' + plain + '"').events, ElementsAre("text " + plain));
    std::string escaped;
    for (int count = 0; count < 20'000; ++count) escaped += "\\n";
    EXPECT_THAT(read('"' + escaped + '"').events, ElementsAre("text " + std::string(20'000, '\n')));
}

TEST(JsonParserTest, TheAnswerDoesNotDependOnTheCut) {
    for (const std::string& text : textsToCut()) {
        const Outcome whole = read(text);
        for (std::size_t cut = 0; cut <= text.size(); ++cut) {
            const std::string_view view = text;
            Outcome parts = read({view.substr(0, cut), view.substr(cut)});
            // The library names a broken character where its last piece ends.
            // Within one character, escape or literal the place of a fault depends on the cut.
            const auto distance = static_cast<std::int64_t>(parts.errorOffset - whole.errorOffset);
            EXPECT_LE(std::abs(distance), 6) << text << " cut at " << cut;
            EXPECT_EQ(parts.errorMessage.empty(), whole.isRead) << text << " cut at " << cut;
            parts.errorOffset = whole.errorOffset;
            parts.errorMessage = whole.errorMessage;
            EXPECT_EQ(parts, whole) << text << " cut at " << cut;
        }
    }
}

TEST(JsonParserTest, TheAnswerIsTheSameByteByByte) {
    for (const std::string& text : textsToCut()) {
        const Outcome whole = read(text);
        std::vector<std::string_view> bytes;
        for (std::size_t at = 0; at < text.size(); ++at) {
            bytes.push_back(std::string_view(text).substr(at, 1));
            bytes.emplace_back();  // an empty piece changes nothing
        }
        const Outcome parts = read(bytes);
        EXPECT_EQ(parts.isRead, whole.isRead) << text;
        EXPECT_EQ(parts.events, whole.events) << text;
    }
}

TEST(JsonParserTest, RefusesATextThatIsCutOffAnywhere) {
    const std::string text = R"({"a":[1,"b",{"c":null}],"d":true})";
    ASSERT_TRUE(isRead(text));
    for (std::size_t length = 0; length < text.size(); ++length) {
        EXPECT_FALSE(isRead(text.substr(0, length))) << length;
    }
}

TEST(JsonParserTest, RefusesWhatIsNoJson) {
    for (const char* text : {"",
                             "  ",
                             "[1]x",
                             "[1] []",
                             "1 2",
                             "\xEF\xBB\xBF[]",
                             "[1,]",
                             "{\"a\":1,}",
                             "{a:1}",
                             "'a'",
                             "NaN",
                             "Infinity",
                             "-Infinity",
                             "+1",
                             ".5",
                             "1.",
                             "01",
                             "-01",
                             "00",
                             "0x10",
                             "1e",
                             "1e+",
                             "--1",
                             "-",
                             "tru",
                             "TRUE",
                             "nulL",
                             "// c\n1",
                             "/* c */ 1",
                             "[",
                             "]",
                             "{",
                             "}",
                             "[}",
                             "\"",
                             "\"\t\"",
                             "\"\x1F\"",
                             R"("\a")",
                             R"("\u12")",
                             R"("\u12G4")",
                             "{\"a\"}",
                             "{\"a\":}",
                             "{\"a\",1}",
                             "[1 2]",
                             ",",
                             ":",
                             "\v1",
                             "1\f",
                             "1e5.5",
                             "1e99999999999.5",
                             "1e99999999999x",
                             "1e99999999999e1",
                             "1e99999999999-"}) {
        EXPECT_FALSE(isRead(text)) << text;
    }
    EXPECT_FALSE(isRead(std::string_view("1\0", 2)));
    EXPECT_FALSE(isRead(std::string_view("\"\0\"", 3)));
}

TEST(JsonParserTest, RefusesInvalidUtf8) {
    for (const char* bytes :
         {"\x80", "\xBF", "\xC0\xAF", "\xC1\xBF", "\xC3", "\xC3\x28", "\xE0\x80\xAF",
          "\xE0\x9F\xBF", "\xE2\x82", "\xED\xA0\x80", "\xED\xBF\xBF", "\xF0\x80\x80\xAF",
          "\xF0\x9F\x98", "\xF4\x90\x80\x80", "\xF5\x80\x80\x80", "\xFE", "\xFF"}) {
        EXPECT_FALSE(isRead(std::string("\"") + bytes + "\"")) << testing::PrintToString(bytes);
        EXPECT_FALSE(isRead(std::string("{\"") + bytes + "\":1}")) << testing::PrintToString(bytes);
    }
    for (const char* bytes :
         {"\x7F", "\xC2\x80", "\xDF\xBF", "\xE0\xA0\x80", "\xED\x9F\xBF", "\xEE\x80\x80",
          "\xEF\xBF\xBF", "\xF0\x90\x80\x80", "\xF4\x8F\xBF\xBF"}) {
        EXPECT_THAT(read(std::string("\"") + bytes + "\"").events,
                    ElementsAre(std::string("text ") + bytes));
    }
}

TEST(JsonParserTest, RefusesLoneSurrogates) {
    for (const char* text : {R"("\ud800")", R"("\udbff x")", R"("\ud800\n")", R"("\ud800\u0041")",
                             R"("\ud800\ud800")", R"("\udc00")", R"("\udfff\ud800")"}) {
        EXPECT_FALSE(isRead(text)) << text;
    }
}

TEST(JsonParserTest, ReadsDownTo512Levels) {
    const auto arrays = [](std::size_t depth) {
        return std::string(depth, '[') + std::string(depth, ']');
    };
    const auto objects = [](std::size_t depth) {
        std::string text;
        for (std::size_t level = 1; level < depth; ++level) text += "{\"a\":";
        return text + "{}" + std::string(depth - 1, '}');
    };
    EXPECT_TRUE(isRead(arrays(512)));
    EXPECT_TRUE(isRead(objects(512)));
    for (const std::size_t depth : {std::size_t{513}, std::size_t{100'000}}) {
        EXPECT_FALSE(isRead(arrays(depth)));
        EXPECT_FALSE(isRead(objects(depth)));
    }
    // A container that was closed counts no more.
    EXPECT_TRUE(isRead("[" + arrays(511) + "," + arrays(511) + "]"));
}

TEST(JsonParserTest, IntegersKeepTheirValueAndSignType) {
    EventLog log;
    JsonParser parser(log);
    ASSERT_TRUE(
        parser.write("[0,-0,9223372036854775807,9223372036854775808,18446744073709551615,"
                     "-9223372036854775808]"));
    ASSERT_TRUE(parser.finish());
    using Kind = JsonNumber::Kind;
    std::vector<Kind> kinds;
    kinds.reserve(log.numbers.size());
    for (const JsonNumber& number : log.numbers) kinds.push_back(number.kind);
    EXPECT_THAT(kinds, ElementsAre(Kind::Signed, Kind::Signed, Kind::Signed, Kind::Unsigned,
                                   Kind::Unsigned, Kind::Signed));
    EXPECT_THAT(log.events, ElementsAre("[", "0", "0", "9223372036854775807", "9223372036854775808",
                                        "18446744073709551615", "-9223372036854775808", "]"));
}

TEST(JsonParserTest, IntegersBeyond64BitsAreTheNearestDouble) {
    EXPECT_EQ(readDouble("18446744073709551616"), 0x1p64);
    EXPECT_EQ(readDouble("-9223372036854775809"), -0x1p63);
    EXPECT_EQ(readDouble("123456789012345678901234567890"), 123456789012345678901234567890.0);
    EXPECT_EQ(readDouble("1" + std::string(400, '0')), kInfinity);
    EXPECT_EQ(readDouble("-1" + std::string(400, '0')), -kInfinity);
}

TEST(JsonParserTest, FractionsAndExponentsAreTheNearestDouble) {
    for (const char* text :
         {"200.0", "0.1", "1e0", "1E5", "1e+5", "1e-5", "123456789.123456789e-20",
          "2.2250738585072011e-308", "2.2250738585072014e-308", "4.9406564584124654e-324",
          "2.4703282292062328e-324", "1.7976931348623157e308", "9007199254740993.0",
          "9007199254740992.999999999999999999999999999", "8.988465674311580536566680721305e307",
          "0.000000000000000000000000000000000000000000000000000000000000012345678901234567890123",
          "3.1415926535897932384626433832795028841971693993751058209749445923"}) {
        EXPECT_EQ(readDouble(text), std::strtod(text, nullptr)) << text;
    }
    EXPECT_TRUE(std::signbit(readDouble("-0.0")));
    EXPECT_FALSE(std::signbit(readDouble("0.0")));
    EXPECT_TRUE(std::signbit(readDouble("-0e5")));
}

TEST(JsonParserTest, ANumberOutOfRangeIsInfiniteOrZero) {
    EXPECT_EQ(readDouble("1e309"), kInfinity);
    EXPECT_EQ(readDouble("-1e309"), -kInfinity);
    EXPECT_EQ(readDouble("1.7976931348623159e308"), kInfinity);
    EXPECT_EQ(readDouble("1e-400"), 0.0);
    EXPECT_EQ(readDouble("2.4703282292062327e-324"), 0.0);
    EXPECT_TRUE(std::signbit(readDouble("-1e-400")));
    EXPECT_EQ(readDouble("0e400"), 0.0);
    EXPECT_EQ(readDouble("0.000e2147483647"), 0.0);
    EXPECT_EQ(readDouble("1e2147483647"), kInfinity);
    EXPECT_EQ(readDouble("1e-2147483647"), 0.0);
}

TEST(JsonParserTest, TheMagnitudeDecidesAndNotTheExponent) {
    const std::string zeros(400, '0');
    EXPECT_EQ(readDouble("0." + zeros + "1e500"), 1e99);
    EXPECT_EQ(readDouble("0." + zeros + "1e900"), kInfinity);
    EXPECT_EQ(readDouble("0." + zeros + "1"), 0.0);
    EXPECT_EQ(readDouble("0." + zeros + "1e10"), 0.0);
    EXPECT_EQ(readDouble("1" + zeros + "e-500"), 1e-100);
    EXPECT_EQ(readDouble("1" + zeros + "e-800"), 0.0);
    EXPECT_EQ(readDouble("1" + zeros + ".0"), kInfinity);
    EXPECT_EQ(readDouble("1" + zeros + "e-10"), kInfinity);
    EXPECT_EQ(readDouble("1" + zeros + "e-700"), 1e-300);
    EXPECT_TRUE(std::signbit(readDouble("-0." + zeros + "1e10")));
}

TEST(JsonParserTest, AnExponentOfAnyLengthIsRead) {
    const std::string nines(100, '9');
    EXPECT_EQ(readDouble("1e99999999999"), kInfinity);
    EXPECT_EQ(readDouble("-1.5E+99999999999"), -kInfinity);
    EXPECT_EQ(readDouble("1e-99999999999"), 0.0);
    EXPECT_TRUE(std::signbit(readDouble("-1e-99999999999")));
    EXPECT_EQ(readDouble("0e99999999999"), 0.0);
    EXPECT_EQ(readDouble("-0.000e" + nines), 0.0);
    EXPECT_EQ(readDouble("1e" + nines), kInfinity);
    EXPECT_EQ(readDouble("1e-" + nines), 0.0);
    EXPECT_EQ(readDouble("0.001e" + nines), kInfinity);
    EXPECT_EQ(readDouble("1e2147483648"), kInfinity);
    EXPECT_EQ(readDouble("123456789012345678901234567890e2147483647"), kInfinity);
    EXPECT_EQ(readDouble("0.1234567890123456789e-2147483647"), 0.0);
    EXPECT_EQ(readDouble("1e" + std::string(1000, '0') + "5"), 1e5);
}

TEST(JsonParserTest, ReadingGoesOnBehindAnOverflowingExponent) {
    EXPECT_THAT(
        read(R"({"a":[[1e99999999999,2],{"b":-1E99999999999}],"c":1e-99999999999,"d":3})").events,
        ElementsAre("{", "key a", "[", "[", "inf", "2", "]", "{", "key b", "-inf", "}", "]",
                    "key c", "0.0", "key d", "3", "}"));
    EXPECT_EQ(read("[1e99999999999}").errorMessage, "syntax error");
    EXPECT_EQ(read("[1e99999999999}").errorOffset, 14u);
    EXPECT_FALSE(isRead(R"({"a":1e99999999999])"));
    EXPECT_FALSE(isRead("[1e99999999999"));
}

TEST(JsonParserTest, TheDepthLimitHoldsBehindAnOverflowingExponent) {
    const auto text = [](std::size_t outer, std::size_t inner) {
        return std::string(outer, '[') + "1e99999999999," + std::string(inner, '[') +
               std::string(inner, ']') + std::string(outer, ']');
    };
    EXPECT_TRUE(isRead(text(512, 0).replace(512, 14, "1e99999999999")));
    EXPECT_TRUE(isRead(text(500, 12)));
    EXPECT_FALSE(isRead(text(500, 13)));
}

TEST(JsonParserTest, SaysWhatIsWrongAndWhere) {
    EXPECT_EQ(read("[1, x]").errorMessage, "syntax error");
    EXPECT_EQ(read("[1, x]").errorOffset, 4u);
    EXPECT_EQ(read({"[1, ", "2, ", "x]"}).errorOffset, 7u);
    EXPECT_EQ(read("[1] x").errorMessage, "extra data");
    EXPECT_EQ(read("[1] x").errorOffset, 4u);
    EXPECT_EQ(read("[1").errorMessage, "incomplete JSON");
    EXPECT_EQ(read("[1").errorOffset, 2u);
    EXPECT_EQ(read("").errorMessage, "incomplete JSON");
    EXPECT_EQ(read("[1]").errorMessage, "");
}

TEST(JsonParserTest, AFaultIsForGood) {
    EventLog log;
    JsonParser parser(log);
    EXPECT_FALSE(parser.write("[x"));
    EXPECT_FALSE(parser.write("[]"));
    EXPECT_FALSE(parser.finish());
    EXPECT_EQ(parser.errorOffset(), 1u);
    EXPECT_THAT(log.events, ElementsAre("["));
}

TEST(JsonParserTest, NothingFollowsTheEnd) {
    EventLog log;
    JsonParser parser(log);
    EXPECT_TRUE(parser.write("[]"));
    EXPECT_TRUE(parser.finish());
    EXPECT_TRUE(parser.finish());
    EXPECT_FALSE(parser.write("[]"));
    EXPECT_EQ(parser.errorMessage(), "extra data");
    EXPECT_EQ(parser.errorOffset(), 2u);
    EXPECT_FALSE(parser.finish());
    EXPECT_THAT(log.events, ElementsAre("[", "]"));
}

TEST(JsonParserTest, WhatAHandlerThrowsLeavesWriteAndEndsTheText) {
    class Thrower final : public JsonHandler {
    public:
        void onObjectBegin() override {}
        void onObjectEnd() override {}
        void onArrayBegin() override {}
        void onArrayEnd() override {}
        void onKey(std::string_view, bool) override {}
        void onString(std::string_view, bool) override {}
        void onNumber(const JsonNumber&) override { throw std::out_of_range("number"); }
        void onBoolean(bool) override {}
        void onNull() override {}
    };
    Thrower thrower;
    JsonParser parser(thrower);
    EXPECT_THROW(parser.write("[1,2]"), std::out_of_range);
    EXPECT_FALSE(parser.write("]"));
    EXPECT_FALSE(parser.finish());

    JsonParser atTheEnd(thrower);
    EXPECT_TRUE(atTheEnd.write("1"));
    EXPECT_THROW(atTheEnd.finish(), std::out_of_range);
    EXPECT_FALSE(atTheEnd.finish());
}

TEST(JsonParserTest, ManyOverflowingExponentsDeepInsideAreRead) {
    std::string text(500, '[');
    for (int count = 0; count < 200; ++count) text += "1e99999999999,";
    text += "0" + std::string(500, ']');
    const Outcome outcome = read(text);
    EXPECT_TRUE(outcome.isRead);
    EXPECT_EQ(std::count(outcome.events.begin(), outcome.events.end(), "inf"), 200);
}

}  // namespace
}  // namespace Vexa
