#pragma once

#include "Platform/JsonHandler.h"
#include "Platform/JsonParser.h"
#include "Platform/JsonValueBuilder.h"
#include "Platform/JsonWriter.h"
#include "Platform/PropertyValue.h"
#include "Platform/ShortestText.h"

#include <string>
#include <string_view>

namespace Vexa {

/// The value of a whole JSON text, or no value when the text is malformed. May throw
/// std::bad_alloc.
PropertyValue readJson(std::string_view text);

/// The value as JSON text. May throw std::bad_alloc.
std::string writeJson(const PropertyValue& value,
                      JsonWriter::Style style = JsonWriter::Style::Indented);

}  // namespace Vexa
