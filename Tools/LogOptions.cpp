#include "Tools/LogOptions.h"

#include "Tools/Failure.h"

#include <cstddef>
#include <optional>
#include <string_view>

namespace VexaTouch::Tools {
namespace {

using Vexa::LogCategory;
using Vexa::LogLevel;

constexpr std::array kLevels = {LogLevel::Debug, LogLevel::Info, LogLevel::Error, LogLevel::Off};

std::string allNames() {
    std::string text = "CATEGORY is one of";
    for (int i = 0; i < Vexa::kLogCategoryCount; ++i) {
        text += ' ';
        text += Vexa::logCategoryName(static_cast<LogCategory>(i));
    }
    text += ", LEVEL one of";
    for (const LogLevel level : kLevels) {
        text += ' ';
        text += Vexa::logLevelName(level);
    }
    return text;
}

/// The level that a text sets for a category, if it does.
using Levels = std::array<std::optional<LogLevel>, Vexa::kLogCategoryCount>;

void parse(std::string_view text, Levels& levels) {
    const std::size_t equals = text.find('=');
    const bool isForAll = equals == std::string_view::npos;
    const auto level = Vexa::logLevelFromName(isForAll ? text : text.substr(equals + 1));
    const auto category =
        isForAll ? std::nullopt : Vexa::logCategoryFromName(text.substr(0, equals));
    if (!level || (!isForAll && !category)) {
        throw UsageError("--log " + std::string(text) + ": LEVEL or CATEGORY=LEVEL is needed; " +
                         allNames());
    }
    if (isForAll) {
        levels.fill(level);
    } else {
        levels[static_cast<std::size_t>(*category)] = level;
    }
}

}  // namespace

LogOptions::LogOptions(std::span<const std::string> texts) : before_() {
    Levels levels;
    for (const std::string& text : texts) {
        parse(text, levels);
    }
    for (std::size_t i = 0; i < levels.size(); ++i) {
        const auto category = static_cast<LogCategory>(i);
        before_[i] = Vexa::Log::level(category);
        if (levels[i]) {
            Vexa::Log::setLevel(category, *levels[i]);
        }
    }
}

LogOptions::~LogOptions() {
    for (std::size_t i = 0; i < before_.size(); ++i) {
        Vexa::Log::setLevel(static_cast<LogCategory>(i), before_[i]);
    }
    Vexa::Log::flush();
}

}  // namespace VexaTouch::Tools
