#pragma once

#include "Platform/PropertyValue.h"

#include <cstdint>
#include <string_view>

namespace Vexa {

/// A number of a JSON text: an integer keeps its exact value (Signed up to 2^63-1, else Unsigned),
/// anything with a fraction or exponent, or beyond 64 bits, is the nearest double (infinity when it
/// overflows). "-0" is the integer 0, "-0.0" the double -0.0.
struct JsonNumber {
    enum class Kind : std::uint8_t { Signed, Unsigned, Double } kind = Kind::Signed;
    std::int64_t signedValue = 0;
    std::uint64_t unsignedValue = 0;
    double doubleValue = 0;

    /// May throw std::bad_alloc.
    [[nodiscard]] PropertyValue toPropertyValue() const;
};

/// Receives a JSON text as it is read. Strings and keys arrive in UTF-8 with escapes resolved, in
/// one or more pieces of which the last is marked; a piece lives only for the call. Whatever a
/// handler throws leaves JsonParser::write (or finish).
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

protected:
    JsonHandler() = default;
    JsonHandler(const JsonHandler&) = default;
    JsonHandler(JsonHandler&&) = default;
    JsonHandler& operator=(const JsonHandler&) = default;
    JsonHandler& operator=(JsonHandler&&) = default;
};

}  // namespace Vexa
