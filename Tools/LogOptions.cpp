#include "Tools/LogOptions.h"

#include "Platform/Log.h"
#include "Tools/Failure.h"

#include <array>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

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

std::pair<LogCategory, LogLevel> parse(std::string_view text) {
    const std::size_t equals = text.find('=');
    if (equals != std::string_view::npos) {
        const auto category = Vexa::logCategoryFromName(text.substr(0, equals));
        const auto level = Vexa::logLevelFromName(text.substr(equals + 1));
        if (category && level) {
            return {*category, *level};
        }
    }
    throw UsageError("--log " + std::string(text) + ": CATEGORY=LEVEL is needed; " + allNames());
}

void restoreLevels() {
    for (int i = 0; i < Vexa::kLogCategoryCount; ++i) {
        Vexa::Log::setLevel(static_cast<LogCategory>(i), LogLevel::Error);
    }
}

}  // namespace

LogOptions::LogOptions(std::span<const std::string> texts, Streams& streams)
    : active_(!texts.empty()) {
    std::vector<std::pair<LogCategory, LogLevel>> levels;
    for (const std::string& text : texts) {
        levels.push_back(parse(text));
    }
    if (!active_) {
        return;
    }
    Vexa::Log::setSink(
        [&error = streams.error](LogCategory category, LogLevel level, std::string_view message) {
            error << '[' << Vexa::logCategoryName(category) << "] " << Vexa::logLevelName(level)
                  << ": " << message << '\n';
        });
    for (const auto& [category, level] : levels) {
        Vexa::Log::setLevel(category, level);
    }
}

LogOptions::~LogOptions() {
    if (active_) {
        restoreLevels();
        Vexa::Log::setSink({});
    }
}

}  // namespace VexaTouch::Tools
