#include "Platform/Library/LogLevels.h"

#include "Platform/Library/LogNames.h"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <optional>

namespace Vexa::Library {

namespace {

constinit std::array<std::atomic<vexa_log_level>, kLogCategoryNames.size()> levels = {
    VEXA_LOG_ERROR, VEXA_LOG_ERROR, VEXA_LOG_ERROR, VEXA_LOG_ERROR};

std::atomic<vexa_log_level>& levelOf(vexa_log_category category) {
    return levels[static_cast<std::size_t>(category)];
}

char lowered(char letter) {
    return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
}

bool isSameIgnoringCase(std::string_view a, std::string_view b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                      [](char x, char y) { return lowered(x) == lowered(y); });
}

std::optional<vexa_log_level> levelFromName(std::string_view name) {
    for (std::size_t i = 0; i < kLogLevelNames.size(); ++i) {
        if (isSameIgnoringCase(name, kLogLevelNames[i])) return static_cast<vexa_log_level>(i);
    }
    return std::nullopt;
}

std::string_view trimmed(std::string_view text) {
    const std::size_t first = text.find_first_not_of(" \t");
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(" \t") - first + 1);
}

/// "LEVEL" or "CATEGORY=LEVEL".
bool setFromPart(std::string_view part) {
    const std::size_t equals = part.find('=');
    const bool isForAll = equals == std::string_view::npos;
    const std::string_view name = isForAll ? std::string_view() : trimmed(part.substr(0, equals));
    const auto level = levelFromName(isForAll ? part : trimmed(part.substr(equals + 1)));
    if (!level) return false;
    bool isKnown = false;
    for (std::size_t i = 0; i < kLogCategoryNames.size(); ++i) {
        if (!isForAll && name != kLogCategoryNames[i]) continue;
        LogLevels::set(static_cast<vexa_log_category>(i), *level);
        isKnown = true;
    }
    return isKnown;
}

}  // namespace

bool LogLevels::isEnabled(vexa_log_category category, vexa_log_level level) noexcept {
    // Off is a threshold only: nothing is logged at it.
    return isLogCategory(category) && isLogLevel(level) && level != VEXA_LOG_OFF &&
           level >= levelOf(category).load(std::memory_order_relaxed);
}

void LogLevels::set(vexa_log_category category, vexa_log_level level) noexcept {
    if (!isLogCategory(category) || !isLogLevel(level)) return;
    levelOf(category).store(level, std::memory_order_relaxed);
}

vexa_log_level LogLevels::get(vexa_log_category category) noexcept {
    if (!isLogCategory(category)) return VEXA_LOG_OFF;
    return levelOf(category).load(std::memory_order_relaxed);
}

std::string LogLevels::setFromText(std::string_view text) {
    std::string unknown;
    while (!text.empty()) {
        const std::size_t comma = std::min(text.find(','), text.size());
        const std::string_view part = trimmed(text.substr(0, comma));
        text.remove_prefix(std::min(comma + 1, text.size()));
        if (part.empty() || setFromPart(part)) continue;
        unknown.append(unknown.empty() ? "\"" : ", \"").append(part).append("\"");
    }
    if (unknown.empty()) return unknown;
    return "VEXATOUCH_LOG: ignoring " + unknown +
           "; it takes LEVEL or CATEGORY=LEVEL,... with the levels debug, info, error, off and the "
           "categories HIDService, Pipeline, Recording, Algs\n";
}

}  // namespace Vexa::Library
