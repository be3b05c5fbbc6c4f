// Any text reads to a value or to none, whole or in pieces alike; a value is written and reads back
// as its documented normal form.

#include "Fuzz/FuzzInput.h"
#include "Platform/Json.h"

#include <cmath>
#include <cstdint>
#include <string>
#include <string_view>

namespace {

using Vexa::JsonParser;
using Vexa::JsonValueBuilder;
using Vexa::JsonWriter;
using Vexa::PropertyValue;
using VexaTouch::Fuzz::require;

PropertyValue readInPieces(std::string_view text, std::size_t longest) {
    JsonValueBuilder builder;
    JsonParser parser(builder);
    VexaTouch::Fuzz::inPieces(text, longest,
                              [&](std::string_view piece) { return parser.write(piece); });
    return parser.finish() ? builder.take() : PropertyValue();
}

/// What was read, as it reads back: an infinite number has no JSON form and becomes null.
PropertyValue normalForm(const PropertyValue& value) {
    if (const auto array = value.asArray()) {
        PropertyValue::Array elements;
        for (const PropertyValue element : *array) elements.push_back(normalForm(element));
        return elements;
    }
    if (const auto dictionary = value.asDictionary()) {
        PropertyValue::Dictionary members;
        for (const auto [name, member] : *dictionary) {
            members.emplace(name, normalForm(member));
        }
        return members;
    }
    return std::isfinite(value.toDouble()) ? value : PropertyValue::null();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view text(reinterpret_cast<const char*>(data), size);
    const PropertyValue value = Vexa::readJson(text);

    require(readInPieces(text, 1) == value, "byte by byte as whole");
    require(readInPieces(text, 7) == value, "in short pieces as whole");
    require(readInPieces(text, 100) == value, "in long pieces as whole");
    if (!value) return 0;

    require(!value.description().empty(), "a value has a description");
    const PropertyValue expected = normalForm(value);
    const std::string compact = Vexa::writeJson(value, JsonWriter::Style::Compact);
    require(Vexa::readJson(compact) == expected, "what is written reads back");
    require(Vexa::readJson(Vexa::writeJson(value)) == expected, "indented as on one line");
    require(Vexa::writeJson(expected, JsonWriter::Style::Compact) == compact,
            "written twice the same");
    return 0;
}
