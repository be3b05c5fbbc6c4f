#include "Pipeline/FrameScanner.h"

#include "Pipeline/ContainerFormat.h"
#include "Shared/Util.h"

#include <array>
#include <cstring>

namespace VexaTouch {

namespace {

constexpr unsigned kSeenType = 1;
constexpr unsigned kSeenTimestamp = 2;
constexpr unsigned kSeenReport = 4;
constexpr unsigned kSeenAll = kSeenType | kSeenTimestamp | kSeenReport;

bool isSpace(char c) noexcept {
    return c == ' ' || c == '\n' || c == '\r' || c == '\t';
}

bool isDigit(char c) noexcept {
    return c >= '0' && c <= '9';
}

}  // namespace

/// The text as it stands; its length is known when this is compiled, so it is compared in place.
template <const std::string_view& expected>
bool FrameScanner::skipText() noexcept {
    if (text_.size() - next_ < expected.size() ||
        std::memcmp(text_.data() + next_, expected.data(), expected.size()) != 0) {
        return false;
    }
    next_ += expected.size();
    return true;
}

bool FrameScanner::skipQuote() noexcept {
    if (next_ == text_.size() || text_[next_] != '"') {
        return false;
    }
    ++next_;
    return true;
}

bool FrameScanner::scan(RecordedFrame& frame) {
    next_ = position_;
    frame.type = RecordedFrame::Type::InputReport;
    if (!skip('{') || !scanMembers(frame) || !skip('}') || !skip(',')) {
        return false;
    }
    position_ = next_;
    return true;
}

bool FrameScanner::scanMembers(RecordedFrame& frame) {
    unsigned seen = 0;
    return scanMember(frame, seen) && skip(',') && scanMember(frame, seen) && skip(',') &&
           scanMember(frame, seen) && seen == kSeenAll;
}

bool FrameScanner::scanMember(RecordedFrame& frame, unsigned& seen) {
    if (!skip('"')) {
        return false;
    }
    // A member that comes twice leaves another one out, so the set of those seen is not whole.
    if (skipText<Container::Timestamp>()) {
        seen |= kSeenTimestamp;
        return skipQuote() && skip(':') && scanNumber(frame.timestamp);
    }
    if (skipText<Container::Type>()) {
        seen |= kSeenType;
        return skipQuote() && skip(':') && skip('"') && skipText<Container::TypeInputReport>() &&
               skipQuote();
    }
    if (skipText<Container::Report>()) {
        seen |= kSeenReport;
        return skipQuote() && skip(':') && skip('"') && scanReport(frame.report);
    }
    return false;
}

/// White space, then the character.
bool FrameScanner::skip(char expected) noexcept {
    while (next_ < text_.size() && isSpace(text_[next_])) {
        ++next_;
    }
    if (next_ == text_.size() || text_[next_] != expected) {
        return false;
    }
    ++next_;
    return true;
}

/// An integer of at most 19 digits, which always fits.
bool FrameScanner::scanNumber(std::uint64_t& number) noexcept {
    while (next_ < text_.size() && isSpace(text_[next_])) {
        ++next_;
    }
    constexpr std::size_t kMostDigits = 19;
    const std::size_t first = next_;
    number = 0;
    while (next_ < text_.size() && isDigit(text_[next_]) && next_ - first <= kMostDigits) {
        number = number * 10 + static_cast<std::uint64_t>(text_[next_] - '0');
        ++next_;
    }
    const std::size_t digits = next_ - first;
    // What else a number may have (a point, an exponent) is none of the characters that follow.
    return digits >= 1 && digits <= kMostDigits && (text_[first] != '0' || digits == 1);
}

/// The rest of a string, its closing quote included. A report of more bytes than any device sends
/// is not plain.
bool FrameScanner::scanReport(std::vector<std::uint8_t>& report) {
    std::array<std::uint8_t, 128> bytes;
    const std::size_t count = Util::readPlainHexBytes(text_.substr(next_), bytes);
    next_ += 3 * count;
    if (!skipQuote()) {
        return false;
    }
    report.assign(bytes.data(), bytes.data() + count);
    return true;
}

}  // namespace VexaTouch
