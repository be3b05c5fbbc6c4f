#pragma once

#include "Tools/Streams.h"

#include <cstdint>
#include <istream>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

/// The bytes of a file, or of the input stream for "-", in pieces. Not thread safe.
class InputFile {
public:
    /// Throws Failure, with the system's own text, when there is no such file to read.
    InputFile(const std::string& path, Streams& streams);
    ~InputFile();
    InputFile(const InputFile&) = delete;
    InputFile& operator=(const InputFile&) = delete;

    /// The next piece, empty at the end. It lives until the next call. Throws Failure.
    std::string_view next();
    /// All that is left. Throws Failure.
    std::string rest();

    /// The name for messages: the path, or "standard input".
    [[nodiscard]] const std::string& name() const noexcept { return name_; }
    /// In bytes; 0 when it is not known.
    [[nodiscard]] std::uint64_t size() const noexcept { return size_; }

private:
    [[noreturn]] void fail(std::string_view what, int error) const;

    std::string name_;
    std::vector<char> piece_;
    std::istream* stream_ = nullptr;  // for "-"
    int descriptor_ = -1;
    std::uint64_t size_ = 0;
};

}  // namespace VexaTouch::Tools
