#include "Platform/Library/DescriptionText.h"

#include <vexa/value.h>
#include <array>
#include <charconv>
#include <cmath>
#include <cstring>
#include <string_view>

namespace Vexa::Library {

namespace {

using NumberText = std::array<char, VEXA_NUMBER_TEXT_SIZE>;

template <class Real>
std::size_t writeNumber(char* out, Real value) noexcept {
    if (std::isnan(value)) {  // whatever its sign and payload
        std::memcpy(out, "nan", 4);
        return 3;
    }
    // The longest double has 24 characters, so that there is room for what follows.
    char* end = std::to_chars(out, out + VEXA_NUMBER_TEXT_SIZE, value).ptr;
    const std::string_view text(out, static_cast<std::size_t>(end - out));
    const bool looksLikeAnInteger = text.find_first_not_of("-0123456789") == std::string_view::npos;
    if (looksLikeAnInteger) {
        *end++ = '.';
        *end++ = '0';
    }
    *end = '\0';
    return static_cast<std::size_t>(end - out);
}

template <class Real>
void append(std::string& out, Real value) {
    NumberText text;
    out.append(text.data(), writeNumber(text.data(), value));
}

}  // namespace

void appendHexadecimalByte(std::string& out, std::uint8_t byte) {
    constexpr std::string_view kDigits = "0123456789abcdef";
    out += kDigits[byte >> 4];
    out += kDigits[byte & 15];
}

void appendBytes(std::string& out, std::span<const std::uint8_t> bytes) {
    out += '<';
    for (const std::uint8_t byte : bytes) appendHexadecimalByte(out, byte);
    out += '>';
}

void appendNumber(std::string& out, float value) {
    append(out, value);
}

void appendNumber(std::string& out, double value) {
    append(out, value);
}

}  // namespace Vexa::Library

extern "C" {

size_t vexa_number_text_of_float(float value, char* out) noexcept {
    return Vexa::Library::writeNumber(out, value);
}

size_t vexa_number_text_of_double(double value, char* out) noexcept {
    return Vexa::Library::writeNumber(out, value);
}

}  // extern "C"
