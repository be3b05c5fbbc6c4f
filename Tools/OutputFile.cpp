#include "Tools/OutputFile.h"

#include "Tools/DiskSync.h"
#include "Tools/Failure.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>
#include <random>
#include <system_error>
#include <utility>

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

OutputFile::OutputFile(const std::string& path, Streams& streams, Content content)
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
    waitsForDisk_ = exists || content == Content::Unique;
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
    if (temporary_.empty()) {
        if (const int error = closeDescriptor(); error != 0) {
            fail(error);
        }
        return;
    }
    // From here on it is whole, and not removed any more.
    const std::string written = std::exchange(temporary_, {});
    // Otherwise the machine's end might leave the name with nothing behind it.
    const int unsafe = waitsForDisk_ ? syncFile(descriptor_) : 0;
    const int unclosed = closeDescriptor();
    if (const int error = unsafe != 0 ? unsafe : unclosed; error != 0) {
        throw Failure(name_ + ": the disk did not confirm what was written: " +
                      std::generic_category().message(error) + "; it is in " + written);
    }
    if (::rename(written.c_str(), target_.c_str()) != 0) {
        throw Failure(name_ + ": the new file cannot take its place: " +
                      std::generic_category().message(errno) + "; what was written is in " +
                      written);
    }
    if (const int error = waitsForDisk_ ? syncFolder(target_.parent_path()) : 0; error != 0) {
        throw Failure(name_ + ": is written, but the disk did not confirm its name: " +
                      std::generic_category().message(error));
    }
}

int OutputFile::closeDescriptor() noexcept {
    return ::close(std::exchange(descriptor_, -1)) == 0 ? 0 : errno;
}

}  // namespace VexaTouch::Tools
