#include "Platform/Log.h"

#include <algorithm>
#include <memory>
#include <utility>

namespace Vexa {

namespace {

constexpr int kLogLevelCount = 4;

vexa_log_category coded(LogCategory category) {
    return static_cast<vexa_log_category>(category);
}

vexa_log_level coded(LogLevel level) {
    return static_cast<vexa_log_level>(level);
}

char lowered(char letter) {
    return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
}

void callSink(void* context, vexa_log_category category, vexa_log_level level, const char* message,
              size_t length) noexcept {
    try {
        const LogSink& sink = *static_cast<const LogSink*>(context);
        sink(static_cast<LogCategory>(category), static_cast<LogLevel>(level),
             std::string_view(message, length));
    } catch (...) {
        return;  // the message is lost, the caller is not disturbed
    }
}

void destroySink(void* context) noexcept {
    const std::unique_ptr<LogSink> owned(static_cast<LogSink*>(context));
}

}  // namespace

std::string_view logCategoryName(LogCategory category) noexcept {
    return vexa_log_category_name(coded(category));
}

std::string_view logLevelName(LogLevel level) noexcept {
    return vexa_log_level_name(coded(level));
}

std::optional<LogCategory> logCategoryFromName(std::string_view name) noexcept {
    for (int i = 0; i < kLogCategoryCount; ++i) {
        const auto category = static_cast<LogCategory>(i);
        if (name == logCategoryName(category)) return category;
    }
    return std::nullopt;
}

std::optional<LogLevel> logLevelFromName(std::string_view name) noexcept {
    for (int i = 0; i < kLogLevelCount; ++i) {
        const auto level = static_cast<LogLevel>(i);
        const std::string_view candidate = logLevelName(level);
        if (std::equal(candidate.begin(), candidate.end(), name.begin(), name.end(),
                       [](char a, char b) { return a == lowered(b); })) {
            return level;
        }
    }
    return std::nullopt;
}

void Log::write(LogLevel level, std::string_view message) const noexcept {
    vexa_log_write(coded(category_), coded(level), message.data(), message.size());
}

void Log::setLevel(LogCategory category, LogLevel level) noexcept {
    vexa_log_set_level(coded(category), coded(level));
}

LogLevel Log::level(LogCategory category) noexcept {
    return static_cast<LogLevel>(vexa_log_get_level(coded(category)));
}

void Log::setSink(LogSink sink) {
    if (!sink) {
        vexa_log_set_sink(nullptr, nullptr, nullptr);
        return;
    }
    auto owned = std::make_unique<LogSink>(std::move(sink));
    vexa_log_set_sink(&callSink, owned.release(), &destroySink);
}

void Log::flush() noexcept {
    vexa_log_flush();
}

}  // namespace Vexa
