#pragma once

#include "Tools/Streams.h"

#include <filesystem>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// A file that is written whole or not at all: text goes into a temporary file beside it, which
/// takes the file's name when it is committed and is removed when it is not. "-" is the result
/// stream; what is no regular file (a pipe, a device) is written as it is. Not thread safe.
class OutputFile {
public:
    /// Throws Failure when the file cannot be made there.
    OutputFile(const std::string& path, Streams& streams);
    ~OutputFile();
    OutputFile(const OutputFile&) = delete;
    OutputFile& operator=(const OutputFile&) = delete;

    /// Throws Failure.
    void write(std::string_view text);
    /// Makes everything written so far the content of the file. Throws Failure.
    void commit();

    /// The name for messages.
    [[nodiscard]] const std::string& name() const noexcept { return name_; }

private:
    void writeThrough(std::string_view text);
    [[noreturn]] void fail(int error) const;

    std::string name_;
    std::ostream* stream_ = nullptr;  // for "-"
    int descriptor_ = -1;
    std::filesystem::path target_;
    std::filesystem::path temporary_;  // empty when the target is written directly
    std::string buffer_;
};

}  // namespace VexaTouch::Tools
