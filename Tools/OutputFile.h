#pragma once

#include "Tools/Streams.h"

#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// A file that is written whole or not at all: text goes into a temporary file beside it, which
/// takes the file's name when it is committed and is removed when it is not. Once it is whole it
/// stays: where it cannot take the name (that of a mount point, or of another user's file in a
/// folder that protects it), or the disk does not confirm it, both files are there. "-" is the
/// result stream; what is no regular file (a pipe, a device) is written as it is. Not thread safe.
class OutputFile {
public:
    /// What would be lost with it.
    enum class Content : std::uint8_t {
        Unique,     ///< it survives the machine's end once it is committed
        Derivable,  ///< can be made again: waits for the disk only where it replaces a file
    };

    /// Throws Failure when the file cannot be made there.
    OutputFile(const std::string& path, Streams& streams, Content content = Content::Unique);
    ~OutputFile();
    OutputFile(const OutputFile&) = delete;
    OutputFile& operator=(const OutputFile&) = delete;

    /// Throws Failure.
    void write(std::string_view text);
    /// Makes everything written so far the content of the file. Throws Failure, which names the
    /// temporary file where that stays.
    void commit();

    /// The name for messages.
    [[nodiscard]] const std::string& name() const noexcept { return name_; }

private:
    void writeThrough(std::string_view text);
    [[nodiscard]] int closeDescriptor() noexcept;
    [[noreturn]] void fail(int error) const;

    std::string name_;
    std::ostream* stream_ = nullptr;  // for "-"
    int descriptor_ = -1;
    bool waitsForDisk_ = false;
    std::filesystem::path target_;
    std::filesystem::path temporary_;  // empty when the target is written directly
    std::string buffer_;
};

}  // namespace VexaTouch::Tools
