#pragma once

#include <sys/types.h>
#include <vexa/log.h>
#include <chrono>
#include <string>

namespace Vexa::Library {

/// A message with where and when it was logged.
struct LogMessage {
    vexa_log_category category = VEXA_LOG_HID_SERVICE;
    vexa_log_level level = VEXA_LOG_ERROR;
    std::chrono::system_clock::time_point time;
    pid_t thread = 0;
    std::string text;
};

}  // namespace Vexa::Library
