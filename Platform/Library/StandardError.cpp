#include "Platform/Library/StandardError.h"

#include "Platform/Library/LogNames.h"

// Formatting only, with fmt as a header too: nothing to link, and no logger or thread of its own.
#define FMT_HEADER_ONLY
#define SPDLOG_HEADER_ONLY
#ifndef SPDLOG_FMT_EXTERNAL
#define SPDLOG_FMT_EXTERNAL
#endif
#include <poll.h>
#include <spdlog/pattern_formatter.h>
#include <unistd.h>
#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <memory>
#include <string>

namespace Vexa::Library {

namespace {

spdlog::pattern_formatter& formatter() {
    // Never destroyed: messages may come until the process ends.
    static spdlog::pattern_formatter& pattern =
        *std::make_unique<spdlog::pattern_formatter>("%Y-%m-%d %H:%M:%S.%e %n %^%l%$: %v")
             .release();
    return pattern;
}

spdlog::level::level_enum levelOf(const LogMessage& message) {
    switch (message.level) {
        case VEXA_LOG_DEBUG:
            return spdlog::level::debug;
        case VEXA_LOG_INFO:
            return spdlog::level::info;
        case VEXA_LOG_ERROR:
        case VEXA_LOG_OFF:
            break;
    }
    return spdlog::level::err;
}

std::string_view colorOf(const LogMessage& message) {
    switch (message.level) {
        case VEXA_LOG_DEBUG:
            return "\033[2m";
        case VEXA_LOG_INFO:
            return "\033[32m";
        case VEXA_LOG_ERROR:
        case VEXA_LOG_OFF:
            break;
    }
    return "\033[1;31m";
}

bool isColored() {
    const char* const wish = std::getenv("NO_COLOR");
    return (wish == nullptr || *wish == '\0') && isatty(STDERR_FILENO) == 1;
}

}  // namespace

void StandardError::write(const LogMessage& message) {
    std::string_view text = message.text;
    text.remove_suffix(text.size() - (text.find_last_not_of('\n') + 1));
    const spdlog::details::log_msg parts(
        message.time, spdlog::source_loc{},
        kLogCategoryNames[static_cast<std::size_t>(message.category)], levelOf(message),
        spdlog::string_view_t(text.data(), text.size()));
    spdlog::memory_buf_t line;
    formatter().format(parts, line);
    std::string colored(line.data(), line.size());
    if (isColored()) {
        colored.insert(parts.color_range_end, "\033[m");
        colored.insert(parts.color_range_start, colorOf(message));
    }
    // One call, so that lines of several processes do not mix on a terminal; not stdio, whose lock
    // a slow reader would keep until the end of the process.
    writeBytes(colored);
}

void StandardError::writeBytes(std::string_view bytes) noexcept {
    while (!bytes.empty()) {
        const ssize_t written = ::write(STDERR_FILENO, bytes.data(), bytes.size());
        if (written >= 0) {
            bytes.remove_prefix(static_cast<std::size_t>(written));
        } else if (errno == EAGAIN) {
            pollfd reader{.fd = STDERR_FILENO, .events = POLLOUT, .revents = 0};
            static_cast<void>(poll(&reader, 1, -1));
        } else if (errno != EINTR) {
            return;  // nobody will ever read it
        }
    }
}

}  // namespace Vexa::Library
