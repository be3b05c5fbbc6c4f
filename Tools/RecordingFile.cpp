#include "Tools/RecordingFile.h"

#include "Pipeline/ContainerReader.h"
#include "Pipeline/ContainerWriter.h"
#include "Tools/OutputFile.h"
#include "Tools/Progress.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <exception>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::size_t kPieceSize = std::size_t{1} << 18;

/// The bytes of a file, or of the input stream for "-", in pieces.
class ByteSource {
public:
    ByteSource(const std::string& path, Streams& streams)
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
    ~ByteSource() {
        if (descriptor_ >= 0) {
            close(descriptor_);
        }
    }
    ByteSource(const ByteSource&) = delete;
    ByteSource& operator=(const ByteSource&) = delete;

    /// The next piece, empty at the end. It lives until the next call.
    std::string_view next() {
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

    [[nodiscard]] const std::string& name() const noexcept { return name_; }
    /// In bytes; 0 when it is not known.
    [[nodiscard]] std::uint64_t size() const noexcept { return size_; }

private:
    [[noreturn]] void fail(std::string_view what, int error) const {
        throw Failure(name_ + ": " + std::string(what) + ": " +
                      std::generic_category().message(error));
    }

    std::string name_;
    std::vector<char> piece_;
    std::istream* stream_ = nullptr;
    int descriptor_ = -1;
    std::uint64_t size_ = 0;
};

/// Feeds the whole source, or as much of it as is well formed; gives the bytes that were read.
std::uint64_t feed(ContainerReader& reader, ByteSource& source, Streams& streams) {
    Progress progress(streams, "reading " + source.name(), source.size(), 16);
    std::uint64_t bytes = 0;
    for (std::string_view piece = source.next(); !piece.empty(); piece = source.next()) {
        bytes += piece.size();
        if (!reader.write(piece)) {
            break;
        }
        progress.update(bytes);
    }
    return bytes;
}

/// What is wrong with the text and where, around the reader's own words.
std::string faultText(const ContainerReader& reader, std::uint64_t bytes,
                      const std::exception& fault) {
    if (bytes == 0) {
        return std::string("is empty: ") + fault.what();
    }
    const std::string syntax = reader.syntaxError();
    if (!syntax.empty()) {
        const std::uint64_t offset = reader.errorOffset().value_or(bytes);
        const std::string where = offset >= bytes
                                      ? "cut off after " + std::to_string(bytes) + " bytes"
                                      : "no JSON at byte " + std::to_string(offset);
        return where + ": " + fault.what() + " (" + syntax + ")";
    }
    if (const auto frame = reader.errorFrame()) {
        return "frame " + std::to_string(*frame) + ": " + fault.what();
    }
    return fault.what();
}

}  // namespace

RecordingFile readRecording(const std::string& path, Streams& streams) {
    ByteSource source(path, streams);
    ContainerReader reader;
    RecordingFile file;
    file.name = source.name();
    file.textBytes = feed(reader, source, streams);
    try {
        file.frames = reader.finish();
    } catch (const std::bad_alloc&) {
        throw;
    } catch (const std::exception& fault) {
        throw Failure(file.name + ": " + faultText(reader, file.textBytes, fault));
    }
    file.version = reader.version().value_or(0);
    return file;
}

void writeRecording(const std::list<PipelineRecording::Frame>& frames, const std::string& path,
                    Streams& streams) {
    OutputFile file(path, streams);
    ContainerWriter writer([&file](std::string_view piece) { file.write(piece); });
    Progress progress(streams, "writing " + file.name(), frames.size());
    std::uint64_t written = 0;
    for (const PipelineRecording::Frame& frame : frames) {
        writer.write(frame);
        progress.update(++written);
    }
    writer.finish();
    file.commit();
}

}  // namespace VexaTouch::Tools
