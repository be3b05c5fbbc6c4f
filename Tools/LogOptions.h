#pragma once

#include "Tools/Streams.h"

#include <span>
#include <string>

namespace VexaTouch::Tools {

/// Sets log levels from CATEGORY=LEVEL texts and sends messages to the error stream, as long as it
/// lives; then the levels are Error and the messages go where they go by default.
class LogOptions {
public:
    /// Throws UsageError for a category or level that does not exist.
    LogOptions(std::span<const std::string> texts, Streams& streams);
    ~LogOptions();
    LogOptions(const LogOptions&) = delete;
    LogOptions& operator=(const LogOptions&) = delete;

private:
    bool active_;
};

}  // namespace VexaTouch::Tools
