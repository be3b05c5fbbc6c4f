#pragma once

#include "Platform/JsonHandler.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

namespace Vexa {

/// How many arrays and objects may be open at once in a text that is read.
inline constexpr std::size_t kJsonMaxDepth = 512;

/// An incremental JSON reader: strict RFC 8259 text in UTF-8 without a byte order mark, nothing
/// after the value but white space, at most kJsonMaxDepth levels of nesting. What the handler
/// receives does not depend on how the text is cut into pieces, but for the pieces of its strings.
/// Not thread safe.
class JsonParser {
public:
    /// The handler must outlive the parser. May throw std::bad_alloc.
    explicit JsonParser(JsonHandler& handler);
    ~JsonParser();
    JsonParser(const JsonParser&) = delete;
    JsonParser& operator=(const JsonParser&) = delete;

    /// Reads the next piece of the text; false once the text is malformed (and ever after, also
    /// after the handler threw, and for any piece that follows finish).
    bool write(std::string_view piece);
    /// Ends the text; true when it was one whole value.
    bool finish();
    /// Bytes read before the fault, once write or finish returned false; within one character,
    /// escape or literal it may depend on how the text was cut.
    [[nodiscard]] std::uint64_t errorOffset() const noexcept;
    /// What was wrong, once write or finish returned false; empty before.
    [[nodiscard]] std::string errorMessage() const;

private:
    struct State;
    std::unique_ptr<State> state_;
};

}  // namespace Vexa
