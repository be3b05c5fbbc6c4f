#include "Platform/ShortestText.h"

#include <charconv>
#include <cmath>
#include <string_view>

namespace Vexa {

namespace {

template <class Real>
void append(std::string& out, Real value) {
    if (std::isnan(value)) {
        out += "nan";  // whatever its sign and payload
        return;
    }
    char digits[32];  // the longest double has 24 characters
    const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value);
    const std::string_view text(digits, static_cast<std::size_t>(end - digits));
    out += text;
    const bool looksLikeAnInteger = text.find_first_not_of("-0123456789") == std::string_view::npos;
    if (looksLikeAnInteger) out += ".0";
}

}  // namespace

void appendShortest(std::string& out, float value) {
    append(out, value);
}

void appendShortest(std::string& out, double value) {
    append(out, value);
}

}  // namespace Vexa
