#include "Tools/OutputFile.h"

#include "Tools/Failure.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <random>
#include <system_error>

namespace VexaTouch::Tools {
namespace {

constexpr std::size_t kBufferSize = std::size_t{1} << 18;
constexpr int kNameAttempts = 100;
constexpr unsigned kNewFileMode = 0666;  // less the process's mask

std::filesystem::path temporaryName(const std::filesystem::path& target) {
    static std::random_device random;
    constexpr std::string_view digits = "0123456789abcdefghijklmnopqrstuv";
    std::string name = "." + target.filename().string() + ".";
    for (int i = 0; i < 8; ++i) {
        name += digits[random() % digits.size()];
    }
    return target.parent_path() / name;
}

}  // namespace

OutputFile::OutputFile(const std::string& path, Streams& streams)
    : name_(path == "-" ? "standard output" : path) {
    if (path == "-") {
        stream_ = &streams.out;
        return;
    }
    // A link keeps pointing where it points.
    std::error_code error;
    const std::filesystem::path resolved = std::filesystem::canonical(path, error);
    target_ = error ? std::filesystem::path(path) : resolved;
    struct stat status{};
    const bool exists = stat(target_.c_str(), &status) == 0;
    if (exists && S_ISDIR(status.st_mode)) {
        fail(EISDIR);
    }
    if (exists && !S_ISREG(status.st_mode)) {
        descriptor_ = open(target_.c_str(), O_WRONLY | O_CLOEXEC);
        if (descriptor_ < 0) {
            fail(errno);
        }
        return;
    }
    if (exists && access(target_.c_str(), W_OK) != 0) {
        fail(errno);
    }
    for (int attempt = 0; descriptor_ < 0 && attempt < kNameAttempts; ++attempt) {
        temporary_ = temporaryName(target_);
        descriptor_ =
            open(temporary_.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kNewFileMode);
        if (descriptor_ < 0 && errno != EEXIST) {
            break;
        }
    }
    if (descriptor_ < 0) {
        const int reason = errno;
        temporary_.clear();
        fail(reason);
    }
    if (exists) {
        // Best effort: the file stays as readable as it was.
        static_cast<void>(fchmod(descriptor_, status.st_mode & 07777U) == 0);
    }
}

OutputFile::~OutputFile() {
    if (descriptor_ >= 0) {
        close(descriptor_);
    }
    if (!temporary_.empty()) {
        std::error_code ignored;
        std::filesystem::remove(temporary_, ignored);
    }
}

void OutputFile::fail(int error) const {
    throw Failure(name_ + ": cannot write: " + std::generic_category().message(error));
}

void OutputFile::writeThrough(std::string_view text) {
    while (!text.empty()) {
        const ssize_t written = ::write(descriptor_, text.data(), text.size());
        if (written < 0) {
            if (errno == EINTR) {
                continue;
            }
            fail(errno);
        }
        text.remove_prefix(static_cast<std::size_t>(written));
    }
}

void OutputFile::write(std::string_view text) {
    if (stream_ != nullptr) {
        errno = 0;
        if (!stream_->write(text.data(), static_cast<std::streamsize>(text.size()))) {
            fail(errno != 0 ? errno : EIO);
        }
        return;
    }
    if (buffer_.size() + text.size() > kBufferSize) {
        writeThrough(buffer_);
        buffer_.clear();
    }
    if (text.size() >= kBufferSize) {
        writeThrough(text);
    } else {
        buffer_ += text;
    }
}

void OutputFile::commit() {
    if (stream_ != nullptr) {
        errno = 0;
        if (!stream_->flush()) {
            fail(errno != 0 ? errno : EIO);
        }
        return;
    }
    writeThrough(buffer_);
    buffer_.clear();
    const int descriptor = descriptor_;
    descriptor_ = -1;
    if (close(descriptor) != 0) {
        fail(errno);
    }
    if (!temporary_.empty()) {
        std::error_code error;
        std::filesystem::rename(temporary_, target_, error);
        if (error) {
            fail(error.value());
        }
        temporary_.clear();
    }
}

}  // namespace VexaTouch::Tools
