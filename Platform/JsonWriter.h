#pragma once

#include "Platform/PropertyValue.h"

#include <cstdint>
#include <string>
#include <string_view>

namespace Vexa {

/// An append-only JSON writer into a string, indented by two spaces a level (or on one line).
///
/// Exact: a double is the shortest text that reads back to it and keeps a point or exponent
/// (200.0), a float is written with the value of its double. What has no JSON form is still
/// written: bytes as hexadecimal text ("01 ab ", two digits and a space each), a number that is
/// not finite as null, no value as null, invalid UTF-8 with U+FFFD for each maximal invalid part.
///
/// The caller sees to the order of calls: one key before each member's value, every container
/// ended. Not thread safe; every operation may throw std::bad_alloc.
class JsonWriter {
public:
    enum class Style : std::uint8_t { Indented, Compact };

    /// Appends to `out`, which must outlive the writer.
    explicit JsonWriter(std::string& out, Style style = Style::Indented) noexcept;

    void beginObject();
    void endObject();
    void beginArray();
    void endArray();
    /// The name of the next member.
    void key(std::string_view name);
    /// A whole value of any depth; members in the order of the dictionary.
    void value(const PropertyValue& value);
    void string(std::string_view text);
    void boolean(bool value);
    void null();
    void number(std::int64_t value);
    void number(std::uint64_t value);
    void number(double value);
    /// Opens a string whose text is appended to the returned output by hand, without escaping, and
    /// closed by endPlainString. Saves long texts a copy.
    std::string& beginPlainString();
    void endPlainString();
    /// Text that is known to need no escaping (for instance hexadecimal digits), quoted as it is.
    void plainString(std::string_view text);

private:
    void beforeItem();
    void beforeValue();
    void newLine();
    void open(char bracket);
    void close(char bracket);
    void quoted(std::string_view text);

    std::string& out_;
    Style style_;
    std::uint32_t depth_ = 0;
    bool first_ = true;      // nothing written yet in the innermost container
    bool afterKey_ = false;  // the next value follows its key on the same line
};

}  // namespace Vexa
