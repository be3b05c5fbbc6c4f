#pragma once

#include "Pipeline/RecordedFrame.h"

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

namespace VexaTouch {

/// Scans the frames of a container's text that are plain: objects of input reports with their three
/// members in any order, without escapes, every byte as two digits and a space. Nearly all of a
/// recording is of this form, and knowing it beforehand is faster than finding it out. Whatever is
/// of another form, good or bad, is left to the reader of JSON.
class FrameScanner {
public:
    /// `text` begins where an element of the array may begin.
    explicit FrameScanner(std::string_view text) noexcept : text_(text) {}

    /// Reads one plain frame and the comma behind it. False, with nothing read and `frame`
    /// unspecified, when there is none. Throws nothing but std::bad_alloc.
    bool scan(RecordedFrame& frame);

    /// Characters read so far.
    [[nodiscard]] std::size_t position() const noexcept { return position_; }

private:
    bool scanMembers(RecordedFrame& frame);
    bool scanMember(RecordedFrame& frame, unsigned& seen);
    bool skip(char expected) noexcept;
    template <const std::string_view& expected>
    bool skipText() noexcept;
    bool skipQuote() noexcept;
    bool scanNumber(std::uint64_t& number) noexcept;
    bool scanReport(std::vector<std::uint8_t>& report);

    std::string_view text_;
    std::size_t position_ = 0;
    std::size_t next_ = 0;
};

}  // namespace VexaTouch
