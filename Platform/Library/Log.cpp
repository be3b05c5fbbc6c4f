#include "Platform/Library/LogLevels.h"
#include "Platform/Library/LogNames.h"
#include "Platform/Library/Logger.h"
#include "Platform/Library/StandardError.h"

#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <exception>
#include <string_view>

namespace {

using Vexa::Library::Logger;
using Vexa::Library::LogLevels;

/// What happens when the library is loaded and when the process ends.
class Lifetime {
public:
    Lifetime() noexcept {
        static_cast<void>(Logger::shared());
        const char* const levels = std::getenv("VEXATOUCH_LOG");
        if (levels == nullptr) return;
        try {
            Vexa::Library::StandardError::writeBytes(LogLevels::setFromText(levels));
        } catch (const std::exception&) {
            return;  // no memory to say what was wrong
        }
    }
    ~Lifetime() { Logger::shared().finish(); }
    Lifetime(const Lifetime&) = delete;
    Lifetime(Lifetime&&) = delete;
    Lifetime& operator=(const Lifetime&) = delete;
    Lifetime& operator=(Lifetime&&) = delete;
};
const Lifetime lifetime;

}  // namespace

extern "C" {

bool vexa_log_is_enabled(vexa_log_category category, vexa_log_level level) noexcept {
    return LogLevels::isEnabled(category, level);
}

void vexa_log_write(vexa_log_category category, vexa_log_level level, const char* message,
                    size_t length) noexcept {
    if (!LogLevels::isEnabled(category, level)) return;
    const int error = errno;
    Logger::shared().write(category, level, std::string_view(message, length));
    errno = error;  // whoever logs a failure may still want it
}

void vexa_log_set_level(vexa_log_category category, vexa_log_level level) noexcept {
    LogLevels::set(category, level);
}

vexa_log_level vexa_log_get_level(vexa_log_category category) noexcept {
    return LogLevels::get(category);
}

const char* vexa_log_category_name(vexa_log_category category) noexcept {
    if (!Vexa::Library::isLogCategory(category)) return "?";
    return Vexa::Library::kLogCategoryNames[static_cast<std::size_t>(category)];
}

const char* vexa_log_level_name(vexa_log_level level) noexcept {
    if (!Vexa::Library::isLogLevel(level)) return "?";
    return Vexa::Library::kLogLevelNames[static_cast<std::size_t>(level)];
}

void vexa_log_set_sink(vexa_log_sink sink, void* context, void (*destroy)(void* context)) noexcept {
    Logger::shared().setSink(sink, context, destroy);
}

bool vexa_log_set_thread_must_not_block(bool must_not_block) noexcept {
    return Logger::shared().setThreadMustNotBlock(must_not_block);
}

void vexa_log_flush(void) noexcept {
    Logger::shared().flush();
}

uint64_t vexa_log_get_dropped(void) noexcept {
    return Logger::shared().dropped();
}

}  // extern "C"
