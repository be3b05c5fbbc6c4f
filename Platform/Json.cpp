#include "Platform/Json.h"

namespace Vexa {

PropertyValue readJson(std::string_view text) {
    JsonValueBuilder builder;
    JsonParser parser(builder);
    if (!parser.write(text) || !parser.finish()) return {};
    return builder.take();
}

std::string writeJson(const PropertyValue& value, JsonWriter::Style style) {
    std::string text;
    JsonWriter(text, style).value(value);
    return text;
}

}  // namespace Vexa
