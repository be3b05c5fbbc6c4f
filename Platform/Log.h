#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string_view>

namespace Vexa {

enum class LogCategory : std::uint8_t { HIDService, Pipeline, Recording, Algs };
inline constexpr int kLogCategoryCount = 4;

/// A message is written when its level is at or above the level set for its category.
enum class LogLevel : std::uint8_t { Debug, Info, Error, Off };

/// The name of a category or level as it is written in logs and on command lines.
std::string_view logCategoryName(LogCategory category) noexcept;
std::string_view logLevelName(LogLevel level) noexcept;
/// The category or level of that name (levels regardless of case), or nothing.
std::optional<LogCategory> logCategoryFromName(std::string_view name) noexcept;
std::optional<LogLevel> logLevelFromName(std::string_view name) noexcept;

/// Where messages go. Called on the thread that logs, one call at a time.
using LogSink = std::function<void(LogCategory, LogLevel, std::string_view message)>;

/// The logging facility's handle for one category; a plain value.
///
/// Levels and the sink belong to the process. The level starts at Error for every category, the
/// sink at one line a message on standard error. All operations may be called on any thread.
class Log {
public:
    explicit Log(LogCategory category) noexcept : category_(category) {}

    /// One relaxed load: test it before building a text that costs something.
    [[nodiscard]] bool isEnabled(LogLevel level) const noexcept;

    /// Writes the message if the level is enabled. Never throws; a sink that throws loses it.
    void write(LogLevel level, std::string_view message) const noexcept;

    static void setLevel(LogCategory category, LogLevel level) noexcept;
    /// An empty sink restores standard error.
    static void setSink(LogSink sink);

private:
    LogCategory category_;
};

}  // namespace Vexa
