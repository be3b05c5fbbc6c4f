#pragma once

#include "Platform/Log.h"
#include "Tools/CommandTable.h"

#include <array>
#include <span>
#include <string>

namespace VexaTouch::Tools {

/// How a command's table offers what LogOptions takes.
inline constexpr OptionEntry kLogOption = {
    .name = "--log",
    .valueName = "LEVEL",
    .help =
        "Log from the level debug, info, error or off on; CATEGORY=LEVEL does so for "
        "HIDService, Pipeline, Recording or Algs alone. Wins over the environment's "
        "VEXATOUCH_LOG",
    .repeatable = true,
    .kind = ValueKind::Choice,
    .choices = "debug info error off Algs=debug Pipeline=debug Recording=debug HIDService=debug"};

/// Sets log levels from LEVEL or CATEGORY=LEVEL texts, later ones over earlier ones, as long as it
/// lives; then they are what they were, and everything logged has been written.
class LogOptions {
public:
    /// Throws UsageError for a category or level that does not exist.
    explicit LogOptions(std::span<const std::string> texts);
    ~LogOptions();
    LogOptions(const LogOptions&) = delete;
    LogOptions& operator=(const LogOptions&) = delete;

private:
    std::array<Vexa::LogLevel, Vexa::kLogCategoryCount> before_;
};

}  // namespace VexaTouch::Tools
