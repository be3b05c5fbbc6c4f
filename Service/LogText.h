#pragma once

#include "Platform/Log.h"
#include "Platform/PropertyValue.h"

#include <new>
#include <string>

namespace VexaTouch {

/// Writes a printf text of less than 256 bytes. Builds nothing unless the level is enabled, and
/// never allocates.
[[gnu::format(printf, 3, 4)]] void logFormat(const Vexa::Log& log, Vexa::LogLevel level,
                                             const char* format, ...) noexcept;

/// Writes the text that `build` makes, if the level is enabled. Without memory the message is lost.
template <typename Build>
void logText(const Vexa::Log& log, Vexa::LogLevel level, const Build& build) noexcept {
    if (!log.isEnabled(level)) return;
    try {
        log.write(level, build());
    } catch (const std::bad_alloc&) {
        return;
    }
}

/// What "%@" shows of a value: a string as it stands, anything else described, "(null)" for none.
std::string objectText(const Vexa::PropertyValue& value);

}  // namespace VexaTouch
