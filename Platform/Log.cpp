#include "Platform/Log.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cstddef>
#include <cstdio>
#include <memory>
#include <mutex>
#include <string>
#include <utility>

namespace Vexa {

namespace {

constexpr std::array<std::string_view, kLogCategoryCount> kCategoryNames = {
    "HIDService", "Pipeline", "Recording", "Algs"};
constexpr std::array<std::string_view, 4> kLevelNames = {"debug", "info", "error", "off"};

constinit std::array<std::atomic<LogLevel>, kLogCategoryCount> levels = {
    LogLevel::Error, LogLevel::Error, LogLevel::Error, LogLevel::Error};

template <std::size_t kCount>
std::string_view nameAt(const std::array<std::string_view, kCount>& names, std::size_t index) {
    return index < names.size() ? names[index] : std::string_view("?");
}

char lowered(char letter) {
    return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
}

void writeToStandardError(LogCategory category, LogLevel level, std::string_view message) {
    std::string line;
    line.append(logCategoryName(category)).append(" ").append(logLevelName(level)).append(": ");
    line.append(message).append("\n");
    // One call, so that lines of several processes do not mix on a terminal.
    std::fwrite(line.data(), 1, line.size(), stderr);
}

struct SinkState {
    // Recursive, so that a sink may log (the message is lost) or replace itself.
    std::recursive_mutex mutex;
    std::shared_ptr<const LogSink> sink;
    bool isCalling = false;
};

/// Marks the sink as being called, for as long as this object lives.
class CallMark {
public:
    explicit CallMark(SinkState& state) : state_(state) { state_.isCalling = true; }
    ~CallMark() { state_.isCalling = false; }
    CallMark(const CallMark&) = delete;
    CallMark(CallMark&&) = delete;
    CallMark& operator=(const CallMark&) = delete;
    CallMark& operator=(CallMark&&) = delete;

private:
    SinkState& state_;
};

SinkState& sinkState() {
    // Never destroyed: detached threads may log until the process ends.
    static SinkState& state = *std::make_unique<SinkState>().release();
    return state;
}

}  // namespace

std::string_view logCategoryName(LogCategory category) noexcept {
    return nameAt(kCategoryNames, static_cast<std::size_t>(category));
}

std::string_view logLevelName(LogLevel level) noexcept {
    return nameAt(kLevelNames, static_cast<std::size_t>(level));
}

std::optional<LogCategory> logCategoryFromName(std::string_view name) noexcept {
    const auto found = std::find(kCategoryNames.begin(), kCategoryNames.end(), name);
    if (found == kCategoryNames.end()) return std::nullopt;
    return static_cast<LogCategory>(found - kCategoryNames.begin());
}

std::optional<LogLevel> logLevelFromName(std::string_view name) noexcept {
    const auto isName = [name](std::string_view candidate) {
        return std::equal(candidate.begin(), candidate.end(), name.begin(), name.end(),
                          [](char a, char b) { return a == lowered(b); });
    };
    const auto found = std::find_if(kLevelNames.begin(), kLevelNames.end(), isName);
    if (found == kLevelNames.end()) return std::nullopt;
    return static_cast<LogLevel>(found - kLevelNames.begin());
}

bool Log::isEnabled(LogLevel level) const noexcept {
    // Off is a threshold only: nothing is logged at it.
    return level < LogLevel::Off &&
           level >= levels[static_cast<std::size_t>(category_)].load(std::memory_order_relaxed);
}

void Log::write(LogLevel level, std::string_view message) const noexcept {
    if (!isEnabled(level)) return;
    try {
        SinkState& state = sinkState();
        const std::lock_guard lock(state.mutex);
        if (state.isCalling) return;
        const CallMark mark(state);
        // A copy keeps the sink alive when it replaces itself.
        const std::shared_ptr<const LogSink> sink = state.sink;
        if (sink) {
            (*sink)(category_, level, message);
        } else {
            writeToStandardError(category_, level, message);
        }
    } catch (...) {
        return;  // the message is lost, the caller is not disturbed
    }
}

void Log::setLevel(LogCategory category, LogLevel level) noexcept {
    levels[static_cast<std::size_t>(category)].store(level, std::memory_order_relaxed);
}

void Log::setSink(LogSink sink) {
    std::shared_ptr<const LogSink> next;
    if (sink) next = std::make_shared<const LogSink>(std::move(sink));
    SinkState& state = sinkState();
    const std::lock_guard lock(state.mutex);
    state.sink.swap(next);
}

}  // namespace Vexa
