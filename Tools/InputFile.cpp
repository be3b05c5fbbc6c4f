#include "Tools/InputFile.h"

#include "Tools/Failure.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace VexaTouch::Tools {
namespace {

constexpr std::size_t kPieceSize = std::size_t{1} << 18;

}  // namespace

InputFile::InputFile(const std::string& path, Streams& streams)
    : name_(path == "-" ? "standard input" : path), piece_(kPieceSize) {
    if (path == "-") {
        stream_ = &streams.in;
        return;
    }
    descriptor_ = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (descriptor_ < 0) {
        fail("cannot open", errno);
    }
    struct stat status{};
    if (fstat(descriptor_, &status) == 0) {
        if (S_ISDIR(status.st_mode)) {
            close(descriptor_);
            throw Failure(name_ + ": is a folder, not a recording");
        }
        size_ = status.st_size > 0 ? static_cast<std::uint64_t>(status.st_size) : 0;
    }
}

InputFile::~InputFile() {
    if (descriptor_ >= 0) {
        close(descriptor_);
    }
}

std::string_view InputFile::next() {
    if (stream_ != nullptr) {
        stream_->read(piece_.data(), static_cast<std::streamsize>(piece_.size()));
        if (stream_->bad()) {
            fail("cannot read", EIO);
        }
        return {piece_.data(), static_cast<std::size_t>(stream_->gcount())};
    }
    ssize_t got = 0;
    do {
        got = read(descriptor_, piece_.data(), piece_.size());
    } while (got < 0 && errno == EINTR);
    if (got < 0) {
        fail("cannot read", errno);
    }
    return {piece_.data(), static_cast<std::size_t>(got)};
}

std::string InputFile::rest() {
    std::string text;
    text.reserve(size_);
    for (std::string_view piece = next(); !piece.empty(); piece = next()) {
        text += piece;
    }
    return text;
}

void InputFile::fail(std::string_view what, int error) const {
    throw Failure(name_ + ": " + std::string(what) + ": " + std::generic_category().message(error));
}

}  // namespace VexaTouch::Tools
