#pragma once

#include "Platform/PropertyValue.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

namespace Vexa {

/// How many arrays and objects may be open at once in a text that is read.
inline constexpr std::size_t kJsonMaxDepth = 512;

/// A number of a JSON text: an integer keeps its exact value (Signed up to 2^63-1, else Unsigned),
/// anything with a fraction or exponent, or beyond 64 bits, is the nearest double (infinity when it
/// overflows).
struct JsonNumber {
    enum class Kind : std::uint8_t { Signed, Unsigned, Double } kind = Kind::Signed;
    std::int64_t signedValue = 0;
    std::uint64_t unsignedValue = 0;
    double doubleValue = 0;

    [[nodiscard]] PropertyValue toPropertyValue() const;
};

/// Receives a JSON text as it is read. Strings and keys arrive in UTF-8 with escapes resolved, in
/// one or more pieces of which the last is marked; a piece lives only for the call. Whatever a
/// handler throws leaves JsonParser::write.
class JsonHandler {
public:
    virtual ~JsonHandler() = default;
    virtual void onObjectBegin() = 0;
    virtual void onObjectEnd() = 0;
    virtual void onArrayBegin() = 0;
    virtual void onArrayEnd() = 0;
    virtual void onKey(std::string_view piece, bool last) = 0;
    virtual void onString(std::string_view piece, bool last) = 0;
    virtual void onNumber(const JsonNumber& number) = 0;
    virtual void onBoolean(bool value) = 0;
    virtual void onNull() = 0;
};

/// An incremental JSON reader: strict RFC 8259 text in UTF-8, nothing after the value but white
/// space, at most kJsonMaxDepth levels of nesting. Not thread safe.
class JsonParser {
public:
    explicit JsonParser(JsonHandler& handler);
    ~JsonParser();
    JsonParser(const JsonParser&) = delete;
    JsonParser& operator=(const JsonParser&) = delete;

    /// Reads the next piece of the text; false once the text is malformed (and ever after).
    bool write(std::string_view piece);
    /// Ends the text; true when it was one whole value.
    bool finish();
    /// Bytes read before the fault, once write or finish returned false.
    [[nodiscard]] std::uint64_t errorOffset() const noexcept;
    /// What was wrong, once write or finish returned false.
    [[nodiscard]] std::string errorMessage() const;

private:
    struct State;
    std::unique_ptr<State> state_;
};

/// Builds one PropertyValue from handler calls; of duplicate members the last one stands. Feed it
/// the events of exactly one value, then take it.
class JsonValueBuilder final : public JsonHandler {
public:
    JsonValueBuilder();
    ~JsonValueBuilder() override;

    void onObjectBegin() override;
    void onObjectEnd() override;
    void onArrayBegin() override;
    void onArrayEnd() override;
    void onKey(std::string_view piece, bool last) override;
    void onString(std::string_view piece, bool last) override;
    void onNumber(const JsonNumber& number) override;
    void onBoolean(bool value) override;
    void onNull() override;

    /// True when a whole value is there to take.
    [[nodiscard]] bool isComplete() const noexcept;
    /// The value; the builder is then empty and may be used again.
    PropertyValue take();

private:
    struct State;
    std::unique_ptr<State> state_;
};

/// The value of a whole JSON text, or no value when the text is malformed.
PropertyValue readJson(std::string_view text);

/// An append-only JSON writer into a string, indented by two spaces a level (or on one line).
///
/// Exact: a double is the shortest text that reads back to it and keeps a point or exponent
/// (200.0), a float is written with the value of its double. What has no JSON form is still
/// written: bytes as hexadecimal text, a number that is not finite as null, no value as null,
/// invalid UTF-8 with U+FFFD for each maximal invalid part.
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
    void value(const PropertyValue& value);
    void string(std::string_view text);
    void boolean(bool value);
    void null();
    void number(std::int64_t value);
    void number(std::uint64_t value);
    void number(double value);
    /// Text that is known to need no escaping (for instance hexadecimal digits), quoted as it is.
    void plainString(std::string_view text);

private:
    void beforeValue();
    void newLine();

    std::string& out_;
    Style style_;
    std::uint32_t depth_ = 0;
    bool first_ = true;      // nothing written yet in the innermost container
    bool afterKey_ = false;  // the next value follows its key on the same line
};

/// The value as JSON text.
std::string writeJson(const PropertyValue& value,
                      JsonWriter::Style style = JsonWriter::Style::Indented);

/// Appends the shortest text that reads back to the same float (or double): always with a point or
/// an exponent; inf, -inf and nan by these names. For texts other than JSON.
void appendShortest(std::string& out, float value);
void appendShortest(std::string& out, double value);

}  // namespace Vexa
