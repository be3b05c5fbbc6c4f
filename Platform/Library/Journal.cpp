#include "Platform/Library/Journal.h"

#include "Platform/Library/LogNames.h"

// The function itself, not the macro that adds this file's place to each message.
#define SD_JOURNAL_SUPPRESS_LOCATION
#include <dlfcn.h>
#include <sys/stat.h>
#include <systemd/sd-journal.h>
#include <unistd.h>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstddef>
#include <cstdlib>
#include <string>
#include <string_view>
#include <type_traits>

namespace Vexa::Library {

namespace {

bool isStandardErrorFile(dev_t device, ino_t inode) {
    struct stat file{};
    return fstat(STDERR_FILENO, &file) == 0 && file.st_dev == device && file.st_ino == inode;
}

/// "device:inode", as systemd gives it to services.
bool readStream(std::string_view text, dev_t& device, ino_t& inode) {
    const char* const end = text.data() + text.size();
    const auto [colon, firstError] = std::from_chars(text.data(), end, device);
    if (firstError != std::errc() || colon == end || *colon != ':') return false;
    const auto [last, secondError] = std::from_chars(colon + 1, end, inode);
    return secondError == std::errc() && last == end;
}

/// As syslog numbers them.
std::string_view priorityOf(vexa_log_level level) {
    switch (level) {
        case VEXA_LOG_DEBUG:
            return "7";
        case VEXA_LOG_INFO:
            return "6";
        case VEXA_LOG_ERROR:
        case VEXA_LOG_OFF:
            break;
    }
    return "3";
}

}  // namespace

Journal::Journal() noexcept {
    static_assert(std::is_same_v<Send, decltype(&sd_journal_sendv)>);
    const char* const stream = std::getenv("JOURNAL_STREAM");
    if (stream == nullptr || !readStream(stream, device_, inode_)) return;
    if (!isStandardErrorFile(device_, inode_)) return;
    // Never closed: messages may come until the process ends.
    void* const library = dlopen("libsystemd.so.0", RTLD_NOW | RTLD_LOCAL);
    if (library != nullptr) send_ = reinterpret_cast<Send>(dlsym(library, "sd_journal_sendv"));
}

bool Journal::isStandardError() const noexcept {
    return send_ != nullptr && isStandardErrorFile(device_, inode_);
}

bool Journal::send(const LogMessage& message) const {
    // A text of ours may end in empty lines, the field's must not.
    const std::size_t length = message.text.find_last_not_of('\n') + 1;
    const std::array fields = {
        "MESSAGE=" + message.text.substr(0, length),
        "PRIORITY=" + std::string(priorityOf(message.level)),
        "SYSLOG_IDENTIFIER=" + std::string(program_invocation_short_name),
        "VEXATOUCH_CATEGORY=" +
            std::string(kLogCategoryNames[static_cast<std::size_t>(message.category)]),
        "TID=" + std::to_string(message.thread),
    };
    std::array<iovec, fields.size()> places{};
    for (std::size_t i = 0; i < fields.size(); ++i) {
        places[i] = {.iov_base = const_cast<char*>(fields[i].data()), .iov_len = fields[i].size()};
    }
    return send_(places.data(), static_cast<int>(places.size())) >= 0;
}

}  // namespace Vexa::Library
