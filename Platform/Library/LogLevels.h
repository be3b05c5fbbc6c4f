#pragma once

#include <vexa/log.h>
#include <string>
#include <string_view>

namespace Vexa::Library {

/// The level of each category.
class LogLevels {
public:
    static bool isEnabled(vexa_log_category category, vexa_log_level level) noexcept;
    static void set(vexa_log_category category, vexa_log_level level) noexcept;
    static vexa_log_level get(vexa_log_category category) noexcept;

    /// Sets levels from a level for all or a list of CATEGORY=LEVEL, later parts over earlier ones;
    /// returns what it did not understand, as a line for whoever wrote it, or nothing.
    static std::string setFromText(std::string_view text);
};

}  // namespace Vexa::Library
