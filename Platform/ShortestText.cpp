#include "Platform/ShortestText.h"

#include <vexa/value.h>
#include <array>

namespace Vexa {

void appendShortest(std::string& out, float value) {
    std::array<char, VEXA_NUMBER_TEXT_SIZE> text;
    out.append(text.data(), vexa_number_text_of_float(value, text.data()));
}

void appendShortest(std::string& out, double value) {
    std::array<char, VEXA_NUMBER_TEXT_SIZE> text;
    out.append(text.data(), vexa_number_text_of_double(value, text.data()));
}

}  // namespace Vexa
