#include "Shared/Util.h"

#include "Platform/HostClock.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <stdexcept>

namespace VexaTouch::Util {

namespace {

const Vexa::Timebase& cachedTimebase() noexcept {
    static const Vexa::Timebase timebase = Vexa::hostTimebase();
    return timebase;
}

constexpr std::uint8_t kNotHex = 0xFF;

constexpr std::array<std::uint8_t, 256> kHexDigits = [] {
    std::array<std::uint8_t, 256> digits{};
    digits.fill(kNotHex);
    for (std::uint8_t i = 0; i < 10; ++i) {
        digits[static_cast<std::size_t>('0' + i)] = i;
    }
    for (std::uint8_t i = 0; i < 6; ++i) {
        digits[static_cast<std::size_t>('a' + i)] = static_cast<std::uint8_t>(10 + i);
        digits[static_cast<std::size_t>('A' + i)] = static_cast<std::uint8_t>(10 + i);
    }
    return digits;
}();

constexpr std::uint16_t kNotHexPair = 0x100;

/// The first character in the low half, so that a little-endian machine reads both at once.
constexpr std::size_t pairIndex(char first, char second) noexcept {
    return static_cast<unsigned char>(first) |
           static_cast<std::size_t>(static_cast<unsigned char>(second)) << 8U;
}

/// The byte of every two characters. Of this large table texts touch a few lines only.
constexpr std::array<std::uint16_t, 65'536> kHexPairs = [] {
    std::array<std::uint16_t, 65'536> pairs{};
    pairs.fill(kNotHexPair);
    constexpr std::string_view digits = "0123456789abcdefABCDEF";
    for (const char first : digits) {
        for (const char second : digits) {
            pairs[pairIndex(first, second)] =
                static_cast<std::uint16_t>(kHexDigits[static_cast<unsigned char>(first)] << 4U |
                                           kHexDigits[static_cast<unsigned char>(second)]);
        }
    }
    return pairs;
}();

/// Two digits and a space, and one more character that does not count.
using HexText = std::array<char, 4>;
constexpr std::size_t kHexTextLength = 3;

constexpr std::array<HexText, 256> kHexTexts = [] {
    constexpr std::string_view digits = "0123456789abcdef";
    std::array<HexText, 256> texts{};
    for (std::size_t i = 0; i < texts.size(); ++i) {
        texts[i] = {digits[i / 16], digits[i % 16], ' ', ' '};
    }
    return texts;
}();

std::uint8_t hexDigit(char c) noexcept {
    return kHexDigits[static_cast<unsigned char>(c)];
}

bool isSpace(char c) noexcept {
    return c == ' ' || (c >= '\t' && c <= '\r');
}

/// Formatted extraction of 16-bit unsigned numbers in base 16 from a text, one after the other.
class HexNumberReader {
public:
    explicit HexNumberReader(std::string_view text) noexcept
        : next_(text.data()), end_(text.data() + text.size()) {}

    /// Two digits closed by a space are by far the most common number. Reads `count` of them, or
    /// nothing when any is of another form.
    template <std::size_t count>
    bool readPlainBytes(std::uint8_t* bytes) noexcept {
        constexpr std::ptrdiff_t kLength = count * kHexTextLength;
        if (end_ - next_ < kLength) {
            return false;
        }
        unsigned wrong = 0;
        for (std::size_t i = 0; i < count; ++i) {
            const char* text = next_ + i * kHexTextLength;
            const unsigned byte = kHexPairs[pairIndex(text[0], text[1])];
            wrong |= (byte & kNotHexPair) | static_cast<unsigned>(text[2] ^ ' ');
            bytes[i] = static_cast<std::uint8_t>(byte);
        }
        if (wrong != 0) {
            return false;
        }
        next_ += kLength;
        return true;
    }

    /// False when nothing reads as a number here or the number does not fit.
    bool read(std::uint16_t& value) noexcept {
        while (next_ != end_ && isSpace(*next_)) {
            ++next_;
        }
        bool negative = false;
        if (next_ != end_ && (*next_ == '-' || *next_ == '+')) {
            negative = *next_ == '-';
            ++next_;
        }
        bool any = skipPrefix();
        bool overflow = false;
        std::uint32_t magnitude = 0;
        for (; next_ != end_ && hexDigit(*next_) != kNotHex; ++next_) {
            any = true;
            magnitude = magnitude << 4U | hexDigit(*next_);
            overflow = overflow || magnitude > 0xFFFF;
            magnitude &= 0xFFFF;
        }
        value = static_cast<std::uint16_t>(negative ? 0U - magnitude : magnitude);
        return any && !overflow;
    }

private:
    /// Skips one leading zero and, behind it, an x. True if a zero stands as a digit of its own: a
    /// zero followed by an x is none, so a lone prefix is no number.
    bool skipPrefix() noexcept {
        if (next_ == end_ || *next_ != '0') {
            return false;
        }
        ++next_;
        if (next_ != end_ && (*next_ == 'x' || *next_ == 'X')) {
            ++next_;
            return false;
        }
        return true;
    }

    const char* next_;
    const char* end_;
};

using ImageRow = std::string_view;

/// Where each pixel's value stands in the picture: a run of four equal letters a value.
constexpr std::array<ImageRow, 13> kImageLayout = {
    "           HHHH      GGGG           ",  //
    "                IIII                ",  //
    "     BBBB                  AAAA     ",  //
    "         JJJJ          JJJJ         ",  //
    "     FFFF                  EEEE     ",  //
    " AAAA                          BBBB ",  //
    "                KKKK                ",  //
    " DDDD                          CCCC ",  //
    "     EEEE                  FFFF     ",  //
    "         LLLL          LLLL         ",  //
    "     CCCC                  DDDD     ",  //
    "                MMMM                ",  //
    "           NNNN      OOOO           ",  //
};

// Every letter is a pixel's, and a space closes every run.
static_assert(std::ranges::all_of(kImageLayout, [](ImageRow row) {
    return row.size() == 36 && row.back() == ' ' &&
           std::ranges::all_of(row, [](char c) { return c == ' ' || (c >= 'A' && c <= 'O'); });
}));

/// Right-aligned in half the width of its run, then as many spaces as its length differs from the
/// run. The space that closes the run is swallowed, so a short number is one character narrower
/// than run and space together.
void appendPixelValue(std::string& line, std::intmax_t value, int runLength) {
    const int field = runLength / 2;
    std::array<char, 24> number{};
    const int length = std::snprintf(number.data(), number.size(), "%*jd", field, value);
    line.append(number.data(), static_cast<std::size_t>(length));
    line.append(static_cast<std::size_t>(std::abs(runLength - length)), ' ');
}

std::string imageLine(ImageRow row, const InputReport::Image& image, bool showUnsigned) {
    std::string line;
    int runLength = 0;
    char letter = ' ';
    for (const char c : row) {
        if (c != ' ') {
            ++runLength;
            letter = c;
        } else if (runLength == 0) {
            line += ' ';
        } else {
            const auto pixel = static_cast<std::size_t>(letter - 'A');
            appendPixelValue(line,
                             showUnsigned ? std::intmax_t{image.unsignedPixels[pixel]}
                                          : std::intmax_t{image.signedPixels[pixel]},
                             runLength);
            runLength = 0;
        }
    }
    line += '\n';
    return line;
}

}  // namespace

std::uint64_t machTimeFromNanoseconds(std::uint64_t nanoseconds) noexcept {
    const auto& timebase = cachedTimebase();
    return timebase.numerator == 0 ? 0 : nanoseconds * timebase.denominator / timebase.numerator;
}

std::uint64_t nanosecondsFromMachTime(std::uint64_t ticks) noexcept {
    const auto& timebase = cachedTimebase();
    return timebase.denominator == 0 ? 0 : ticks * timebase.numerator / timebase.denominator;
}

std::string hexStringFromBytes(const std::vector<std::uint8_t>& bytes) {
    std::string text;
    appendHexString(text, bytes);
    return text;
}

void appendHexString(std::string& text, std::span<const std::uint8_t> bytes) {
    // Each byte's text is written with a fourth character, which the next one overwrites.
    const std::size_t start = text.size();
    const std::size_t end = start + bytes.size() * kHexTextLength;
    text.resize(end + 1);
    char* out = text.data() + start;
    for (const std::uint8_t byte : bytes) {
        std::memcpy(out, kHexTexts[byte].data(), sizeof(HexText));
        out += kHexTextLength;
    }
    text.resize(end);
}

std::vector<std::uint8_t> bytesFromHexString(std::string_view text) {
    std::vector<std::uint8_t> bytes;
    readHexString(text, bytes);
    return bytes;
}

std::size_t readPlainHexBytes(std::string_view text, std::span<std::uint8_t> bytes) noexcept {
    HexNumberReader reader(text);
    constexpr std::size_t kMany = 8;
    std::size_t count = 0;
    while (bytes.size() - count >= kMany && reader.readPlainBytes<kMany>(&bytes[count])) {
        count += kMany;
    }
    while (bytes.size() != count && reader.readPlainBytes<1>(&bytes[count])) {
        ++count;
    }
    return count;
}

void readHexString(std::string_view text, std::vector<std::uint8_t>& bytes) {
    // The usual text has three characters a byte; a text of single digits needs the list to grow.
    bytes.resize(text.size() / kHexTextLength);
    const std::size_t plain = readPlainHexBytes(text, bytes);
    bytes.resize(plain);
    HexNumberReader reader(text.substr(plain * kHexTextLength));
    std::uint16_t value = 0;
    while (reader.read(value)) {
        if (value > 0xFF) {
            throw std::invalid_argument("invalid hex string");
        }
        bytes.push_back(static_cast<std::uint8_t>(value));
    }
}

bool stripDomainFromKey(std::string& key, const std::string& domain) {
    const std::string prefix = domain + ".";
    for (std::size_t i = 0; i < prefix.size(); ++i) {
        const char c = i < key.size() ? key[i] : '\0';
        if (c != prefix[i]) {
            return false;
        }
        if (c == '\0') {
            break;
        }
    }
    key.erase(0, prefix.size());
    return true;
}

std::string stringFromImage(const InputReport::Image& image, bool showUnsigned) {
    std::string text = "# Image frame " + std::to_string(image.frameNumber) + "    time " +
                       std::to_string(image.timestampMs) + " ms\n\n";
    for (const ImageRow row : kImageLayout) {
        text += imageLine(row, image, showUnsigned);
    }
    return text;
}

}  // namespace VexaTouch::Util
