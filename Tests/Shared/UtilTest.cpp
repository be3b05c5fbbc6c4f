#include "Shared/Util.h"

#include "Tests/Support/Touch.h"

#include <gmock/gmock.h>

#include <array>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Util {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Bytes = std::vector<std::uint8_t>;

/// The text of the exception, which must be of exactly this kind; empty when there is none.
std::string refusal(std::string_view text) {
    try {
        bytesFromHexString(text);
    } catch (const std::invalid_argument& error) {
        return error.what();
    }
    return {};
}

// Time. The machine's ticks are nanoseconds; other timebases have test programs of their own.

TEST(UtilTimeTest, ZeroStaysZero) {
    EXPECT_EQ(machTimeFromNanoseconds(0), 0U);
    EXPECT_EQ(nanosecondsFromMachTime(0), 0U);
}

TEST(UtilTimeTest, ATickOfThisHostIsANanosecond) {
    for (const std::uint64_t value :
         {std::uint64_t{1}, std::uint64_t{1'000'000}, ~std::uint64_t{0}}) {
        EXPECT_EQ(machTimeFromNanoseconds(value), value);
        EXPECT_EQ(nanosecondsFromMachTime(value), value);
    }
}

// Hexadecimal text.

TEST(HexTextTest, AByteIsTwoLowercaseDigitsAndASpace) {
    EXPECT_EQ(hexStringFromBytes({0x01, 0xAB, 0x00}), "01 ab 00 ");
    EXPECT_EQ(hexStringFromBytes({0x0F}), "0f ");
    EXPECT_EQ(hexStringFromBytes({0xFF, 0x7F, 0x80}), "ff 7f 80 ");
}

TEST(HexTextTest, NoBytesAreNoText) {
    EXPECT_EQ(hexStringFromBytes({}), "");
}

TEST(HexTextTest, AppendingLeavesWhatIsThere) {
    std::string text = "bytes: ";
    appendHexString(text, Bytes{0x12, 0x34});
    appendHexString(text, Bytes{});
    EXPECT_EQ(text, "bytes: 12 34 ");
}

TEST(HexTextTest, EveryByteReadsBack) {
    Bytes all;
    for (int i = 0; i < 256; ++i) {
        all.push_back(static_cast<std::uint8_t>(i));
    }
    EXPECT_EQ(bytesFromHexString(hexStringFromBytes(all)), all);
}

TEST(HexTextTest, LongReportsReadBack) {
    Bytes bytes(65'536);
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        bytes[i] = static_cast<std::uint8_t>(i * 31 + i / 256);
    }
    EXPECT_EQ(bytesFromHexString(hexStringFromBytes(bytes)), bytes);
}

TEST(HexTextTest, NoTextIsNoBytes) {
    EXPECT_THAT(bytesFromHexString(""), IsEmpty());
    EXPECT_THAT(bytesFromHexString(" \t\n\v\f\r"), IsEmpty());
}

TEST(HexTextTest, NumbersMayHaveOneDigitOrMore) {
    EXPECT_THAT(bytesFromHexString("1 2 3"), ElementsAre(0x01, 0x02, 0x03));
    EXPECT_THAT(bytesFromHexString("f"), ElementsAre(0x0F));
    EXPECT_THAT(bytesFromHexString("00000000000000000000000000ff"), ElementsAre(0xFF));
    EXPECT_THAT(bytesFromHexString("Ab aB AB"), ElementsAre(0xAB, 0xAB, 0xAB));
    EXPECT_THAT(bytesFromHexString("01 ab"), ElementsAre(0x01, 0xAB));  // no space behind
}

TEST(HexTextTest, AnyWhiteSpaceSeparates) {
    EXPECT_THAT(bytesFromHexString("\t01\n02\v03\f04\r05  06\r\n07\n"),
                ElementsAre(0x01, 0x02, 0x03, 0x04, 0x05, 0x06, 0x07));
}

TEST(HexTextTest, WhatIsNoNumberEndsTheListQuietly) {
    EXPECT_THAT(bytesFromHexString("ff zz 01"), ElementsAre(0xFF));
    EXPECT_THAT(bytesFromHexString("ab,cd"), ElementsAre(0xAB));
    EXPECT_THAT(bytesFromHexString("ab, cd"), ElementsAre(0xAB));
    EXPECT_THAT(bytesFromHexString("ab ,cd"), ElementsAre(0xAB));
    EXPECT_THAT(bytesFromHexString("g"), IsEmpty());
    EXPECT_THAT(bytesFromHexString("12 \xC3\xA9 34"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("12 \xC2\xA0"
                                   "34"),
                ElementsAre(0x12));  // no-break space
}

TEST(HexTextTest, ANumberEndsAtTheFirstCharacterThatIsNoDigit) {
    EXPECT_THAT(bytesFromHexString("12+34"), ElementsAre(0x12, 0x34));
    EXPECT_THAT(bytesFromHexString("12-ff01"), ElementsAre(0x12, 0xFF));
    EXPECT_THAT(bytesFromHexString("12x34"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("1.2"), ElementsAre(0x01));
}

TEST(HexTextTest, AZeroByteInTheTextIsNoDigitAndNoSpace) {
    EXPECT_THAT(bytesFromHexString(std::string_view("12 \0 34", 7)), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString(std::string_view("12\0 34", 6)), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString(std::string_view("1\0", 2)), ElementsAre(0x01));
}

TEST(HexTextTest, APrefixIsSkipped) {
    EXPECT_THAT(bytesFromHexString("0x10"), ElementsAre(0x10));
    EXPECT_THAT(bytesFromHexString("0X1f 0xA"), ElementsAre(0x1F, 0x0A));
    EXPECT_THAT(bytesFromHexString("+0x10 -0xFF01"), ElementsAre(0x10, 0xFF));
}

TEST(HexTextTest, APrefixIsOneZeroAndOneX) {
    EXPECT_THAT(bytesFromHexString("00x10"), ElementsAre(0x00));
    EXPECT_THAT(bytesFromHexString("0xx1"), IsEmpty());
    EXPECT_THAT(bytesFromHexString("0x0x1"), ElementsAre(0x00));
}

TEST(HexTextTest, ALonePrefixEndsTheList) {
    EXPECT_THAT(bytesFromHexString("12 0x"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("12 0x 34"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("12 0xg 34"), ElementsAre(0x12));
}

TEST(HexTextTest, ALoneSignEndsTheList) {
    EXPECT_THAT(bytesFromHexString("12 - 34"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("12 + 34"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("12 +-1"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("-"), IsEmpty());
}

TEST(HexTextTest, ANegativeNumberWrapsAtSixteenBits) {
    EXPECT_THAT(bytesFromHexString("-ff01"), ElementsAre(0xFF));
    EXPECT_THAT(bytesFromHexString("-ffff"), ElementsAre(0x01));
    EXPECT_THAT(bytesFromHexString("-0"), ElementsAre(0x00));
    EXPECT_THAT(bytesFromHexString("+7f"), ElementsAre(0x7F));
    EXPECT_EQ(refusal("-1"), "invalid hex string");
    EXPECT_EQ(refusal("-ff00"), "invalid hex string");
    EXPECT_EQ(refusal("-8000"), "invalid hex string");
}

TEST(HexTextTest, ANumberOfTwoHundredFiftySixOrMoreIsRefused) {
    EXPECT_EQ(refusal("fff"), "invalid hex string");
    EXPECT_EQ(refusal("ff 100"), "invalid hex string");
    EXPECT_EQ(refusal("100"), "invalid hex string");
    EXPECT_EQ(refusal("ffff"), "invalid hex string");
    EXPECT_EQ(refusal("01 02 03 0100 04"), "invalid hex string");
    EXPECT_EQ(refusal("ff"), "");
}

TEST(HexTextTest, ANumberBeyondSixteenBitsEndsTheListQuietly) {
    EXPECT_THAT(bytesFromHexString("12 10000 34"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("12 ffffffffffffffffffffffffff 34"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("12 100000001 34"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("12 -10000 34"), ElementsAre(0x12));
    // A refusal behind the end of the list is never met.
    EXPECT_THAT(bytesFromHexString("12 10000 100"), ElementsAre(0x12));
    EXPECT_THAT(bytesFromHexString("12 zz 100"), ElementsAre(0x12));
}

// Dotted keys.

struct Stripped {
    bool result;
    std::string key;

    friend bool operator==(const Stripped&, const Stripped&) = default;
};

void PrintTo(const Stripped& stripped, std::ostream* out) {
    *out << stripped.result << " " << ::testing::PrintToString(stripped.key);
}

Stripped strip(std::string key, const std::string& domain) {
    const bool result = stripDomainFromKey(key, domain);
    return {result, key};
}

TEST(StripDomainTest, TheDomainAndItsDotAreRemoved) {
    EXPECT_EQ(strip("Algs.ActivationThreshold", "Algs"), (Stripped{true, "ActivationThreshold"}));
    EXPECT_EQ(strip("Pipeline.Algs.Key", "Pipeline"), (Stripped{true, "Algs.Key"}));
}

TEST(StripDomainTest, OneDomainIsRemovedAtATime) {
    EXPECT_EQ(strip("Algs.Algs.Key", "Algs"), (Stripped{true, "Algs.Key"}));
}

TEST(StripDomainTest, TheDomainAndADotAloneLeaveAnEmptyKey) {
    EXPECT_EQ(strip("Algs.", "Algs"), (Stripped{true, ""}));
}

TEST(StripDomainTest, AnyOtherKeyIsLeftAlone) {
    for (const char* key : {"Algs", "AlgsX.Key", "Algs Key", "algs.Key", "", ".", "Key", "Alg.s",
                            "Pipeline.Algs.Key", " Algs.Key"}) {
        EXPECT_EQ(strip(key, "Algs"), (Stripped{false, key}));
    }
}

TEST(StripDomainTest, AnEmptyDomainStripsALeadingDotOnly) {
    EXPECT_EQ(strip(".Key", ""), (Stripped{true, "Key"}));
    EXPECT_EQ(strip("..Key", ""), (Stripped{true, ".Key"}));
    EXPECT_EQ(strip(".", ""), (Stripped{true, ""}));
    EXPECT_EQ(strip("Key", ""), (Stripped{false, "Key"}));
    EXPECT_EQ(strip("Key.Rest", ""), (Stripped{false, "Key.Rest"}));
    EXPECT_EQ(strip("", ""), (Stripped{false, ""}));
}

TEST(StripDomainTest, WhatFollowsThePrefixMayHoldAnything) {
    const std::string rest("\0.\xFF", 3);
    EXPECT_EQ(strip("Algs." + rest, "Algs"), (Stripped{true, rest}));
}

TEST(StripDomainTest, TheComparisonEndsAtAZeroByteOfBoth) {
    using namespace std::string_literals;
    // Equal up to the zero byte counts as the prefix; its whole length is erased.
    EXPECT_EQ(strip("Al\0XYZ-rest"s, "Al\0gs"s), (Stripped{true, "-rest"}));
    EXPECT_EQ(strip("Al"s, "Al\0gs"s), (Stripped{true, ""}));
    EXPECT_EQ(strip("Al\0"s, "Al\0gs"s), (Stripped{true, ""}));
    // A zero byte of one alone is a difference like any other.
    EXPECT_EQ(strip("Al\0s.Key"s, "Algs"), (Stripped{false, "Al\0s.Key"s}));
    EXPECT_EQ(strip("Algs\0Key"s, "Algs"), (Stripped{false, "Algs\0Key"s}));
    EXPECT_EQ(strip("Alg", "Al\0gs"s), (Stripped{false, "Alg"}));
}

// The picture of an image.

using Unsigned = std::array<std::uint16_t, kPixelCount>;

InputReport::Image picture(const Testing::Samples& signedPixels, const Unsigned& unsignedPixels,
                           std::uint32_t frameNumber = 0, std::uint32_t timestampMs = 0) {
    const Bytes bytes =
        Testing::imageReport(signedPixels, frameNumber, timestampMs, unsignedPixels);
    return InputReport::Image::parse(bytes.data(), bytes.size()).value();
}

TEST(ImagePictureTest, AnImageOfZerosShowsASpaceAZeroAndTwoSpacesAtEachPlace) {
    const std::string expected =
        "# Image frame 0    time 0 ms\n"
        "\n"
        "            0        0            \n"
        "                 0                 \n"
        "      0                    0      \n"
        "          0            0          \n"
        "      0                    0      \n"
        "  0                            0  \n"
        "                 0                 \n"
        "  0                            0  \n"
        "      0                    0      \n"
        "          0            0          \n"
        "      0                    0      \n"
        "                 0                 \n"
        "            0        0            \n";
    EXPECT_EQ(stringFromImage(picture({}, {}), false), expected);
    EXPECT_EQ(stringFromImage(picture({}, {}), true), expected);
}

TEST(ImagePictureTest, EachPixelStandsAtItsPlace) {
    Testing::Samples samples{};
    for (std::size_t i = 0; i < samples.size(); ++i) {
        samples[i] = static_cast<std::int16_t>(i + 1);
    }
    EXPECT_EQ(stringFromImage(picture(samples, {}, 4294967295, 4294967294), false),
              "# Image frame 4294967295    time 4294967294 ms\n"
              "\n"
              "            8        7            \n"
              "                 9                 \n"
              "      2                    1      \n"
              "         10           10          \n"
              "      6                    5      \n"
              "  1                            2  \n"
              "                11                 \n"
              "  4                            3  \n"
              "      5                    6      \n"
              "         12           12          \n"
              "      3                    4      \n"
              "                13                 \n"
              "           14       15            \n");
}

/// The picture's first row, where the pixels H and G stand.
std::string firstRow(int h, int g) {
    Testing::Samples samples{};
    samples[7] = static_cast<std::int16_t>(h);
    samples[6] = static_cast<std::int16_t>(g);
    std::string text = stringFromImage(picture(samples, {}), false);
    text.erase(0, text.find("\n\n") + 2);
    return text.substr(0, text.find('\n'));
}

TEST(ImagePictureTest, AShortNumberIsOneCharacterNarrowerThanItsPlace) {
    EXPECT_EQ(firstRow(7, 12), "            7       12            ");
    EXPECT_EQ(firstRow(123, -12), "           123      -12           ");
    EXPECT_EQ(firstRow(1234, -123), "           1234     -123          ");
}

TEST(ImagePictureTest, ALongNumberIsPaddedByWhatItIsTooLong) {
    EXPECT_EQ(firstRow(-1234, 0), "           -1234       0            ");
    EXPECT_EQ(firstRow(-32768, 32767), "           -32768       32767           ");
}

TEST(ImagePictureTest, SignedAndUnsignedValuesAreShownByChoice) {
    Testing::Samples samples;
    samples.fill(-32768);
    Unsigned unsignedPixels;
    unsignedPixels.fill(65535);
    const InputReport::Image image = picture(samples, unsignedPixels, 17, 1234);
    EXPECT_EQ(stringFromImage(image, true),
              "# Image frame 17    time 1234 ms\n"
              "\n"
              "           65535      65535           \n"
              "                65535                \n"
              "     65535                  65535     \n"
              "         65535          65535         \n"
              "     65535                  65535     \n"
              " 65535                          65535 \n"
              "                65535                \n"
              " 65535                          65535 \n"
              "     65535                  65535     \n"
              "         65535          65535         \n"
              "     65535                  65535     \n"
              "                65535                \n"
              "           65535      65535           \n");
    EXPECT_EQ(stringFromImage(image, false),
              "# Image frame 17    time 1234 ms\n"
              "\n"
              "           -32768       -32768            \n"
              "                -32768                 \n"
              "     -32768                   -32768      \n"
              "         -32768           -32768          \n"
              "     -32768                   -32768      \n"
              " -32768                           -32768  \n"
              "                -32768                 \n"
              " -32768                           -32768  \n"
              "     -32768                   -32768      \n"
              "         -32768           -32768          \n"
              "     -32768                   -32768      \n"
              "                -32768                 \n"
              "           -32768       -32768            \n");
}

}  // namespace
}  // namespace VexaTouch::Util
