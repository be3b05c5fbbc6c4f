// Reading hexadecimal text held to the standard library's formatted extraction, on random texts.

#include "Shared/Util.h"
#include "Tests/Property/Holds.h"

#include <gtest/gtest.h>
#include <rapidcheck.h>

#include <algorithm>
#include <cstdint>
#include <locale>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <string>
#include <tuple>
#include <vector>

namespace VexaTouch::Util {
namespace {

/// The bytes, or nothing when the text is refused.
using Answer = std::optional<std::vector<std::uint8_t>>;

Answer byStream(const std::string& text) {
    std::istringstream stream(text);
    stream.imbue(std::locale::classic());
    std::vector<std::uint8_t> bytes;
    std::uint16_t value = 0;
    while (stream >> std::hex >> value) {
        if (value > 0xFF) {
            return std::nullopt;
        }
        bytes.push_back(static_cast<std::uint8_t>(value));
    }
    return bytes;
}

Answer byReader(const std::string& text) {
    try {
        return bytesFromHexString(text);
    } catch (const std::invalid_argument& error) {
        EXPECT_STREQ(error.what(), "invalid hex string");
        return std::nullopt;
    }
}

rc::Gen<std::string> joined(const rc::Gen<std::string>& part) {
    return rc::gen::map(rc::gen::container<std::vector<std::string>>(part),
                        [](const std::vector<std::string>& parts) {
                            std::string text;
                            for (const std::string& each : parts) {
                                text += each;
                            }
                            return text;
                        });
}

/// Characters that mean something to a reader of numbers, in any order.
rc::Gen<std::string> anyMeaningfulText() {
    const auto character = rc::gen::weightedOneOf<char>({
        {6, rc::gen::elementOf(std::string("0123456789abcdefABCDEF"))},
        {3, rc::gen::elementOf(std::string(" \t\n\v\f\r"))},
        {2, rc::gen::elementOf(std::string("0xX"))},
        {1, rc::gen::elementOf(std::string("+-"))},
        {1, rc::gen::elementOf(std::string(",.gGzo'_\0\x85\xA0\xFF", 12))},
    });
    return rc::gen::container<std::string>(character);
}

/// A number as somebody might write it: sign, prefix, leading zeros, too many digits.
rc::Gen<std::string> anyNumber() {
    const auto digit = rc::gen::map(rc::gen::elementOf(std::string("0123456789abcdefABCDEF")),
                                    [](char c) { return std::string(1, c); });
    return rc::gen::map(
        rc::gen::tuple(rc::gen::weightedElement<std::string>({{8, ""}, {1, "+"}, {2, "-"}}),
                       rc::gen::weightedElement<std::string>({{8, ""}, {1, "0x"}, {1, "0X"}}),
                       rc::gen::weightedElement<std::string>(
                           {{4, ""}, {2, "0"}, {1, "00000"}, {1, "ff"}, {1, "ffff"}}),
                       rc::gen::resize(3, joined(digit)),
                       rc::gen::weightedElement<std::string>({{8, " "},
                                                              {2, "  "},
                                                              {1, "\n"},
                                                              {1, "\t"},
                                                              {1, "\r\n"},
                                                              {1, "\v"},
                                                              {1, "\f"},
                                                              {1, ""},
                                                              {1, ","}})),
        [](const auto& parts) {
            return std::apply([](const auto&... part) { return (part + ...); }, parts);
        });
}

/// Nearly all of it as reports are written, so that the end is far away.
rc::Gen<std::string> nearlyPlainText() {
    const auto plain = rc::gen::map(rc::gen::arbitrary<std::uint8_t>(),
                                    [](std::uint8_t byte) { return hexStringFromBytes({byte}); });
    return joined(rc::gen::weightedOneOf<std::string>({{40, plain}, {1, anyNumber()}}));
}

constexpr int kRounds = 5000;

/// Every such text reads as by a stream. Of the texts some are refused, some read to the end and
/// some stop before it, or the test would not be worth it.
void expectReadsAsAStream(const rc::Gen<std::string>& texts, std::size_t longestAtLeast) {
    int refused = 0;
    int read = 0;
    std::size_t longest = 0;
    EXPECT_TRUE(Testing::holds("reads as a stream reads", kRounds, [&] {
        const std::string text = *texts;
        const Answer expected = byStream(text);
        RC_ASSERT(byReader(text) == expected);
        ++(expected ? read : refused);
        longest = std::max(longest, expected ? expected->size() : 0);
    }));
    EXPECT_GT(refused, kRounds / 50);
    EXPECT_GT(read, kRounds / 50);
    EXPECT_GE(longest, longestAtLeast);
}

TEST(HexPropertyTest, ReadsAnyMeaningfulTextAsAStreamReadsIt) {
    expectReadsAsAStream(anyMeaningfulText(), 2);
}

TEST(HexPropertyTest, ReadsNumbersOfAnyFormAsAStreamReadsThem) {
    expectReadsAsAStream(joined(anyNumber()), 3);
}

TEST(HexPropertyTest, ReadsLongTextsAsAStreamReadsThem) {
    expectReadsAsAStream(nearlyPlainText(), 20);
}

TEST(HexPropertyTest, ReadsAnyBytesAsAStreamReadsThem) {
    EXPECT_TRUE(Testing::holds("reads as a stream reads", kRounds, [](const std::string& text) {
        RC_ASSERT(byReader(text) == byStream(text));
    }));
}

TEST(HexPropertyTest, ReadsEveryTextOfFiveMeaningfulCharactersAsAStreamReadsIt) {
    const std::string characters = "01fx- +g\t";
    std::string text(5, ' ');
    const auto each = [&](auto&& self, std::size_t position) -> void {
        if (position == text.size()) {
            ASSERT_EQ(byReader(text), byStream(text)) << "text: '" << text << "'";
            return;
        }
        for (const char c : characters) {
            text[position] = c;
            self(self, position + 1);
        }
    };
    each(each, 0);
}

TEST(HexPropertyTest, WhatIsWrittenReadsBack) {
    EXPECT_TRUE(Testing::holds("reads back", kRounds, [](const std::vector<std::uint8_t>& bytes) {
        RC_ASSERT(bytesFromHexString(hexStringFromBytes(bytes)) == bytes);
    }));
}

}  // namespace
}  // namespace VexaTouch::Util
