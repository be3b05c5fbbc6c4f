#pragma once

#include "Tools/FileDescriptor.h"
#include "Tools/Streams.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// Where a text goes that grows for as long as a program runs. Errors are numbers of the system,
/// 0 for none. One thread.
class AppendTarget {
public:
    /// How much was written before it went wrong, if it did.
    struct Result {
        std::size_t written = 0;
        int error = 0;
    };

    AppendTarget() = default;
    virtual ~AppendTarget() = default;
    AppendTarget(const AppendTarget&) = delete;
    AppendTarget(AppendTarget&&) = delete;
    AppendTarget& operator=(const AppendTarget&) = delete;
    AppendTarget& operator=(AppendTarget&&) = delete;

    /// Whether what was written can be written over. Otherwise every offset is the end, and nothing
    /// is ever cut off.
    [[nodiscard]] virtual bool isRewritable() const noexcept = 0;
    /// Writes with as few calls of the system as it takes: one.
    virtual Result write(std::uint64_t offset, std::string_view text) noexcept = 0;
    /// Cuts everything from there on off.
    virtual int cut(std::uint64_t offset) noexcept = 0;
    /// To be called once what was written is worth a file: until then a target that is destroyed
    /// leaves everything as it was before it was opened.
    virtual int keep() noexcept { return 0; }
    /// Whether there is something that such an end leaves as it was.
    [[nodiscard]] virtual bool wasThere() const noexcept { return false; }
    /// The file in which what was written stays although keep() failed; empty where there is none.
    [[nodiscard]] virtual std::string beside() const { return {}; }
    /// Returns when what was written would survive the machine's end, once it is kept with its
    /// name.
    virtual int sync() noexcept = 0;
    virtual int close() noexcept = 0;
};

/// A file that is open to be written from its beginning, "-" for the result stream.
///
/// A regular file appears at once, empty. One that is there already and not empty is refused,
/// unless `replace`: then a new file takes its name when it is kept, and who has the old one open
/// keeps that. Until then the new one has no name, and goes with the program however that ends;
/// only where the file system knows no such files it is ".FILE.XXXXXX" from the beginning. Where it
/// cannot (the old one is a mount point, or another user's in a folder that protects it), both
/// files stay. What is no regular file (a pipe, a device) is written as it is. Throws Failure with
/// the name and why.
std::unique_ptr<AppendTarget> openAppendTarget(const std::string& path, bool replace,
                                               Streams& streams);

}  // namespace VexaTouch::Tools
