#pragma once

#include "Platform/Library/LogMessage.h"

#include <string_view>

namespace Vexa::Library {

/// Standard error, for people: local time, category, level and text, a line each; the level in
/// colour on a terminal. One call at a time; may wait for whoever reads.
class StandardError {
public:
    /// Line ends at the end of the text are left out, since the line has its own. Throws
    /// std::bad_alloc.
    static void write(const LogMessage& message);
    /// These bytes as they stand.
    static void writeBytes(std::string_view bytes) noexcept;
};

}  // namespace Vexa::Library
