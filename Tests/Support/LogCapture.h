#pragma once

#include "Platform/Log.h"

#include <algorithm>
#include <mutex>
#include <ostream>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Testing {

/// A message as it was logged.
struct LogLine {
    Vexa::LogLevel level = Vexa::LogLevel::Debug;
    std::string text;

    friend bool operator==(const LogLine&, const LogLine&) = default;
    friend std::ostream& operator<<(std::ostream& out, const LogLine& line) {
        return out << Vexa::logLevelName(line.level) << ": \"" << line.text << '"';
    }
};

inline LogLine debug(std::string text) {
    return {Vexa::LogLevel::Debug, std::move(text)};
}
inline LogLine info(std::string text) {
    return {Vexa::LogLevel::Info, std::move(text)};
}
inline LogLine error(std::string text) {
    return {Vexa::LogLevel::Error, std::move(text)};
}

/// Keeps what the category HIDService logs, at every level, instead of showing it.
class LogCapture {
public:
    LogCapture() {
        Vexa::Log::setSink(
            [this](Vexa::LogCategory category, Vexa::LogLevel level, std::string_view message) {
                if (category != Vexa::LogCategory::HIDService) return;
                const std::lock_guard lock(mutex_);
                lines_.push_back({level, std::string(message)});
            });
        Vexa::Log::setLevel(Vexa::LogCategory::HIDService, Vexa::LogLevel::Debug);
    }
    ~LogCapture() {
        Vexa::Log::setLevel(Vexa::LogCategory::HIDService, before_);
        Vexa::Log::setSink({});
    }
    LogCapture(const LogCapture&) = delete;
    LogCapture(LogCapture&&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;
    LogCapture& operator=(LogCapture&&) = delete;

    /// What was logged since the last call, without the priority that the machine may refuse.
    [[nodiscard]] std::vector<LogLine> take() {
        Vexa::Log::flush();
        const std::lock_guard lock(mutex_);
        std::vector<LogLine> lines;
        lines.swap(lines_);
        std::erase_if(lines, [](const LogLine& line) {
            return line.text.starts_with("pthread_setschedparam failed: ");
        });
        return lines;
    }

private:
    Vexa::LogLevel before_ = Vexa::Log::level(Vexa::LogCategory::HIDService);
    std::mutex mutex_;
    std::vector<LogLine> lines_;
};

}  // namespace VexaTouch::Testing
