#include "Platform/JsonWriter.h"

#include "Platform/PropertyWalk.h"
#include "Platform/ShortestText.h"

#include <vexa/value.h>
#include <array>
#include <charconv>
#include <cmath>
#include <cstddef>
#include <cstring>
#include <span>

namespace Vexa {

namespace {

constexpr std::string_view kHexDigits = "0123456789abcdef";
constexpr std::string_view kReplacementCharacter = "\xEF\xBF\xBD";

/// Which bytes may stand in a JSON string as they are.
constexpr std::array<bool, 256> kIsPlain = [] {
    std::array<bool, 256> isPlain{};
    for (std::size_t code = 0x20; code < 0x80; ++code) isPlain[code] = true;
    isPlain['"'] = false;
    isPlain['\\'] = false;
    return isPlain;
}();

/// How many bytes at the front of `text` need no escaping.
std::size_t plainLength(std::string_view text) {
    std::size_t length = 0;
    // Eight at a time: the high bit of a byte of each term is set when the byte is not ASCII, is
    // below 0x20, is a quote, is a backslash. (A borrow may flag a byte too many, never too few;
    // the loop below then looks again.)
    constexpr std::uint64_t kOnes = 0x0101010101010101;
    constexpr std::uint64_t kHighBits = 0x80 * kOnes;
    while (text.size() - length >= 8) {
        std::uint64_t word = 0;
        std::memcpy(&word, text.data() + length, 8);
        const std::uint64_t control = word - 0x20 * kOnes;
        const std::uint64_t quote = (word ^ (0x22 * kOnes)) - kOnes;
        const std::uint64_t backslash = (word ^ (0x5C * kOnes)) - kOnes;
        if ((word | control | quote | backslash) & kHighBits) break;
        length += 8;
    }
    while (length < text.size() && kIsPlain[static_cast<unsigned char>(text[length])]) ++length;
    return length;
}

struct Utf8Part {
    std::size_t length;
    bool isValid;
};

/// The character at the front of `text`, which begins with a byte from 0x80 on, or else the
/// longest part there that could have become one (at least one byte).
Utf8Part nextUtf8Part(std::string_view text) {
    const auto byteAt = [text](std::size_t index) -> unsigned {
        return index < text.size() ? static_cast<unsigned char>(text[index]) : 0;
    };
    const unsigned lead = byteAt(0);
    std::size_t length = 0;
    // What the second byte must lie in, so that nothing is overlong, a surrogate or too large.
    unsigned low = 0x80;
    unsigned high = 0xBF;
    if (lead >= 0xC2 && lead <= 0xDF) {
        length = 2;
    } else if (lead >= 0xE0 && lead <= 0xEF) {
        length = 3;
        if (lead == 0xE0) low = 0xA0;
        if (lead == 0xED) high = 0x9F;
    } else if (lead >= 0xF0 && lead <= 0xF4) {
        length = 4;
        if (lead == 0xF0) low = 0x90;
        if (lead == 0xF4) high = 0x8F;
    } else {
        return {1, false};
    }
    if (byteAt(1) < low || byteAt(1) > high) return {1, false};
    for (std::size_t index = 2; index < length; ++index) {
        if (byteAt(index) < 0x80 || byteAt(index) > 0xBF) return {index, false};
    }
    return {length, true};
}

void appendEscaped(std::string& out, char character) {
    switch (character) {
        case '"':
            out += "\\\"";
            return;
        case '\\':
            out += "\\\\";
            return;
        case '\b':
            out += "\\b";
            return;
        case '\f':
            out += "\\f";
            return;
        case '\n':
            out += "\\n";
            return;
        case '\r':
            out += "\\r";
            return;
        case '\t':
            out += "\\t";
            return;
        default:
            break;
    }
    const auto code = static_cast<unsigned char>(character);
    out += "\\u00";
    out += kHexDigits[code >> 4];
    out += kHexDigits[code & 15];
}

std::string hexadecimalText(std::span<const std::uint8_t> bytes) {
    std::string text;
    text.reserve(bytes.size() * 3);
    for (const std::uint8_t byte : bytes) {
        text += kHexDigits[byte >> 4];
        text += kHexDigits[byte & 15];
        text += ' ';
    }
    return text;
}

template <class Integer>
void appendInteger(std::string& out, Integer value) {
    char digits[24];
    const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value);
    out.append(digits, end);
}

/// Hands a walk through a value on to the writer.
class ValueWriter {
public:
    explicit ValueWriter(JsonWriter& writer) : writer_(writer) {}

    void beginArray(std::size_t /*count*/) { writer_.beginArray(); }
    void endArray() { writer_.endArray(); }
    void beginDictionary(std::size_t /*count*/) { writer_.beginObject(); }
    void endDictionary() { writer_.endObject(); }
    void key(std::string_view name) { writer_.key(name); }

    void leaf(const vexa_value* value, vexa_value_type type) {
        switch (type) {
            case VEXA_VALUE_BOOLEAN:
                return writer_.boolean(vexa_value_to_boolean(value));
            case VEXA_VALUE_SIGNED:
                return writer_.number(static_cast<std::int64_t>(vexa_value_to_unsigned(value)));
            case VEXA_VALUE_UNSIGNED:
                return writer_.number(vexa_value_to_unsigned(value));
            case VEXA_VALUE_FLOAT:
            case VEXA_VALUE_DOUBLE:
                return writer_.number(vexa_value_to_double(value));
            case VEXA_VALUE_STRING: {
                std::size_t length = 0;
                const char* text = vexa_value_get_string(value, &length);
                return writer_.string({text, length});
            }
            case VEXA_VALUE_BYTES: {
                std::size_t length = 0;
                const std::uint8_t* bytes = vexa_value_get_bytes(value, &length);
                return writer_.plainString(hexadecimalText({bytes, length}));
            }
            default:
                return writer_.null();
        }
    }

private:
    JsonWriter& writer_;
};

}  // namespace

JsonWriter::JsonWriter(std::string& out, Style style) noexcept : out_(out), style_(style) {}

void JsonWriter::newLine() {
    if (style_ == Style::Compact) return;
    out_ += '\n';
    out_.append(std::size_t{2} * depth_, ' ');
}

void JsonWriter::beforeItem() {
    if (!first_) out_ += ',';
    first_ = false;
    newLine();
}

void JsonWriter::beforeValue() {
    if (afterKey_) {
        afterKey_ = false;
    } else if (depth_ > 0) {
        beforeItem();
    }
}

void JsonWriter::open(char bracket) {
    beforeValue();
    out_ += bracket;
    ++depth_;
    first_ = true;
}

void JsonWriter::close(char bracket) {
    --depth_;
    if (!first_) newLine();
    out_ += bracket;
    first_ = false;
}

void JsonWriter::beginObject() {
    open('{');
}

void JsonWriter::endObject() {
    close('}');
}

void JsonWriter::beginArray() {
    open('[');
}

void JsonWriter::endArray() {
    close(']');
}

void JsonWriter::key(std::string_view name) {
    beforeItem();
    quoted(name);
    out_ += style_ == Style::Compact ? ":" : ": ";
    afterKey_ = true;
}

void JsonWriter::quoted(std::string_view text) {
    out_ += '"';
    while (true) {
        const std::size_t plain = plainLength(text);
        out_.append(text, 0, plain);
        text.remove_prefix(plain);
        if (text.empty()) break;
        if (static_cast<unsigned char>(text.front()) < 0x80) {
            appendEscaped(out_, text.front());
            text.remove_prefix(1);
        } else {
            const auto [length, isValid] = nextUtf8Part(text);
            out_ += isValid ? text.substr(0, length) : kReplacementCharacter;
            text.remove_prefix(length);
        }
    }
    out_ += '"';
}

void JsonWriter::string(std::string_view text) {
    beforeValue();
    quoted(text);
}

std::string& JsonWriter::beginPlainString() {
    beforeValue();
    out_ += '"';
    return out_;
}

void JsonWriter::endPlainString() {
    out_ += '"';
}

void JsonWriter::plainString(std::string_view text) {
    beginPlainString() += text;
    endPlainString();
}

void JsonWriter::boolean(bool value) {
    beforeValue();
    out_ += value ? "true" : "false";
}

void JsonWriter::null() {
    beforeValue();
    out_ += "null";
}

void JsonWriter::number(std::int64_t value) {
    beforeValue();
    appendInteger(out_, value);
}

void JsonWriter::number(std::uint64_t value) {
    beforeValue();
    appendInteger(out_, value);
}

void JsonWriter::number(double value) {
    if (!std::isfinite(value)) return null();
    beforeValue();
    appendShortest(out_, value);
}

void JsonWriter::value(const PropertyValue& value) {
    ValueWriter visitor(*this);
    Detail::PropertyWalk(visitor).walk(value.handle());
}

}  // namespace Vexa
