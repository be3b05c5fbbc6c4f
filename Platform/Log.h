#pragma once

#include <vexa/log.h>
#include <cstdint>
#include <functional>
#include <optional>
#include <string_view>

namespace Vexa {

enum class LogCategory : std::uint8_t {
    HIDService = VEXA_LOG_HID_SERVICE,
    Pipeline = VEXA_LOG_PIPELINE,
    Recording = VEXA_LOG_RECORDING,
    Algs = VEXA_LOG_ALGS,
};
inline constexpr int kLogCategoryCount = 4;

/// A message is written when its level is at or above the level set for its category.
enum class LogLevel : std::uint8_t {
    Debug = VEXA_LOG_DEBUG,
    Info = VEXA_LOG_INFO,
    Error = VEXA_LOG_ERROR,
    Off = VEXA_LOG_OFF,
};

/// The name of a category or level as it is written in logs and on command lines.
std::string_view logCategoryName(LogCategory category) noexcept;
std::string_view logLevelName(LogLevel level) noexcept;
/// The category or level of that name (levels regardless of case), or nothing.
std::optional<LogCategory> logCategoryFromName(std::string_view name) noexcept;
std::optional<LogLevel> logLevelFromName(std::string_view name) noexcept;

/// Where messages go: called for one at a time, in the order of logging, on any thread.
using LogSink = std::function<void(LogCategory, LogLevel, std::string_view message)>;

/// The logging facility's handle for one category, a plain value; <vexa/log.h> is its manual.
///
/// Levels and the sink belong to the process. All operations may be called on any thread.
class Log {
public:
    explicit Log(LogCategory category) noexcept : category_(category) {}

    /// One relaxed load behind a call: test it before building a text that costs something.
    [[nodiscard]] bool isEnabled(LogLevel level) const noexcept {
        return vexa_log_is_enabled(static_cast<vexa_log_category>(category_),
                                   static_cast<vexa_log_level>(level));
    }

    /// Writes the message if the level is enabled. Never throws; a sink that throws loses it.
    void write(LogLevel level, std::string_view message) const noexcept;

    static void setLevel(LogCategory category, LogLevel level) noexcept;
    [[nodiscard]] static LogLevel level(LogCategory category) noexcept;
    /// An empty sink restores the default. The previous sink has got everything logged before, is
    /// no longer called and is destroyed when this returns; a sink that replaces itself is
    /// destroyed after its call. Throws std::bad_alloc.
    static void setSink(LogSink sink);
    /// Returns once everything logged before has gone to the sink.
    static void flush() noexcept;

private:
    LogCategory category_;
};

/// Lets no log call of this thread block, as long as it lives: what finds no room is dropped and
/// counted.
class LogWithoutBlocking {
public:
    LogWithoutBlocking() noexcept : before_(vexa_log_set_thread_must_not_block(true)) {}
    ~LogWithoutBlocking() { vexa_log_set_thread_must_not_block(before_); }
    LogWithoutBlocking(const LogWithoutBlocking&) = delete;
    LogWithoutBlocking(LogWithoutBlocking&&) = delete;
    LogWithoutBlocking& operator=(const LogWithoutBlocking&) = delete;
    LogWithoutBlocking& operator=(LogWithoutBlocking&&) = delete;

private:
    bool before_;
};

}  // namespace Vexa
