#include "Tools/FrameFeed.h"

#include "Platform/Json.h"

#include <algorithm>
#include <bit>
#include <cstring>
#include <stdexcept>
#include <string>
#include <utility>

namespace VexaTouch::Tools {
namespace {

// The first bytes of every feed: what it is, and the version of what follows.
constexpr std::string_view kBeginning = "VXFRAME1";

// Each record: the length of its payload, its type, its time; then the payload. In the machine's
// byte order, since a feed never leaves the machine.
struct Header {
    std::uint32_t length = 0;
    std::uint32_t type = 0;
    std::uint64_t timestampNs = 0;
};
static_assert(sizeof(Header) == 16);

enum RecordType : std::uint32_t {
    kReport = 1,  // its bytes
    kState = 2,   // the length of the key in 32 bits, the key, the value as JSON
    kGap = 3,     // lost reports, lost settings, 64 bits each
    kEnd = 4,     // nothing comes any more
};

constexpr std::size_t kGapBytes = sizeof(Header) + sizeof(FrameGap);
constexpr std::size_t kEndBytes = kGapBytes + sizeof(Header);
// More than any feed has room for.
constexpr std::uint32_t kLongestPayload = std::uint32_t{1} << 28U;

template <typename T>
std::span<const std::uint8_t> bytesOf(const T& value) noexcept {
    return {reinterpret_cast<const std::uint8_t*>(&value), sizeof value};
}

std::span<const std::uint8_t> bytesOf(std::string_view text) noexcept {
    return {reinterpret_cast<const std::uint8_t*>(text.data()), text.size()};
}

std::string_view textOf(std::span<const std::uint8_t> bytes) noexcept {
    return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

template <typename T>
T valueAt(std::span<const std::uint8_t> bytes) noexcept {
    T value{};
    std::memcpy(&value, bytes.data(), sizeof value);
    return value;
}

[[noreturn]] void refuse(const char* what) {
    throw std::runtime_error(std::string("no feed of frames: ") + what);
}

std::size_t ringSize(std::size_t bytes) noexcept {
    return std::bit_ceil(std::max(bytes, FrameFeed::kFewestBytes));
}

}  // namespace

/// A header and the parts of its payload.
class FrameFeed::Record {
public:
    using Part = std::span<const std::uint8_t>;

    Record(RecordType type, std::uint64_t timestampNs, std::array<Part, 3> parts) noexcept
        : parts_(parts), header_{0, type, timestampNs} {
        std::size_t length = 0;
        for (const Part part : parts) {
            length += part.size();
        }
        size_ = sizeof header_ + length;
        header_.length = static_cast<std::uint32_t>(length);
    }

    [[nodiscard]] const Header& header() const noexcept { return header_; }
    [[nodiscard]] const std::array<Part, 3>& parts() const noexcept { return parts_; }
    [[nodiscard]] std::size_t size() const noexcept { return size_; }

private:
    std::array<Part, 3> parts_;
    Header header_;
    std::size_t size_ = 0;
};

FrameFeed::FrameFeed(std::function<void()> wake, std::size_t bytes)
    : size_(ringSize(bytes)),
      forSettings_(size_ / 16),
      bytes_(new std::uint8_t[size_]),  // touched, and so taken from the system, as it is used
      wake_(std::move(wake)) {
    put_.store(copy(0, bytesOf(kBeginning)));
}

void FrameFeed::putReport(std::span<const std::uint8_t> report,
                          std::uint64_t timestampNs) noexcept {
    if (!tryPut(Record(kReport, timestampNs, {report, {}, {}}), kEndBytes + forSettings_)) {
        ++gap_.reports;
        lostReports_.fetch_add(1, std::memory_order_relaxed);
    }
}

void FrameFeed::putState(std::string_view key, std::string_view json,
                         std::uint64_t timestampNs) noexcept {
    const auto keyLength = static_cast<std::uint32_t>(key.size());
    const Record record(kState, timestampNs, {bytesOf(keyLength), bytesOf(key), bytesOf(json)});
    if (!tryPut(record, kEndBytes)) {
        ++gap_.settings;
        lostSettings_.fetch_add(1, std::memory_order_relaxed);
    }
}

void FrameFeed::close() noexcept {
    if (closed_.load()) {
        return;
    }
    // There is always room for both.
    std::uint64_t end = put_.load(std::memory_order_relaxed);
    if (gap_ != FrameGap{}) {
        end = append(end, Record(kGap, 0, {bytesOf(gap_), {}, {}}));
        gap_ = {};
    }
    publish(append(end, Record(kEnd, 0, {})));
    closed_.store(true);
    wake_();
}

bool FrameFeed::tryPut(const Record& record, std::size_t reserve) noexcept {
    const bool tellsGap = gap_ != FrameGap{};
    const std::uint64_t needed = record.size() + (tellsGap ? kGapBytes : 0);
    if (room(reserve) < needed) {
        return false;
    }
    std::uint64_t end = put_.load(std::memory_order_relaxed);
    if (tellsGap) {
        end = append(end, Record(kGap, record.header().timestampNs, {bytesOf(gap_), {}, {}}));
        gap_ = {};
    }
    publish(append(end, record));
    return true;
}

std::uint64_t FrameFeed::room(std::uint64_t reserve) const noexcept {
    const std::uint64_t used =
        put_.load(std::memory_order_relaxed) - taken_.load(std::memory_order_acquire) + reserve;
    return used < size_ ? size_ - used : 0;
}

std::uint64_t FrameFeed::append(std::uint64_t at, const Record& record) noexcept {
    at = copy(at, bytesOf(record.header()));
    for (const Record::Part part : record.parts()) {
        at = copy(at, part);
    }
    return at;
}

std::uint64_t FrameFeed::copy(std::uint64_t at, std::span<const std::uint8_t> bytes) noexcept {
    const std::size_t begin = at & (size_ - 1);
    const std::size_t first = std::min(bytes.size(), size_ - begin);
    std::copy_n(bytes.begin(), first, bytes_.get() + begin);
    std::copy(bytes.begin() + static_cast<std::ptrdiff_t>(first), bytes.end(), bytes_.get());
    return at + bytes.size();
}

// Whoever takes looks at what was put after it has said what it took, and this looks at what was
// taken after it has said what it put, all in one order: one of the two sees the other.
void FrameFeed::publish(std::uint64_t end) noexcept {
    const std::uint64_t before = put_.load(std::memory_order_relaxed);
    put_.store(end);
    if (taken_.load() == before) {
        wake_();
    }
}

std::array<std::span<const std::uint8_t>, 2> FrameFeed::readable() const noexcept {
    const std::uint64_t taken = taken_.load(std::memory_order_relaxed);
    const std::size_t count = put_.load() - taken;
    const std::size_t begin = taken & (size_ - 1);
    const std::size_t first = std::min(count, size_ - begin);
    return {std::span(bytes_.get() + begin, first), std::span(bytes_.get(), count - first)};
}

void FrameFeed::consume(std::size_t count) noexcept {
    taken_.store(taken_.load(std::memory_order_relaxed) + count);
}

FrameGap FrameFeed::lost() const noexcept {
    return {.reports = lostReports_.load(), .settings = lostSettings_.load()};
}

std::string settingText(const Vexa::PropertyValue& value) {
    std::string text = Vexa::writeJson(value, Vexa::JsonWriter::Style::Compact);
    // In a container it stands in an object in an array in an object.
    return Vexa::readJson("[[[" + text + "]]]") ? text : "null";
}

FrameDecoder::FrameDecoder(Sink sink) : sink_(std::move(sink)) {}

void FrameDecoder::write(std::span<const std::uint8_t> bytes) {
    // Only a record that comes in pieces is copied.
    std::span<const std::uint8_t> left = bytes;
    const bool hadPending = !pending_.empty();
    if (hadPending) {
        pending_.insert(pending_.end(), bytes.begin(), bytes.end());
        left = pending_;
    }
    while (const std::size_t taken = takeOne(left)) {
        left = left.subspan(taken);
    }
    if (hadPending) {
        pending_.erase(pending_.begin(), pending_.end() - static_cast<std::ptrdiff_t>(left.size()));
    } else {
        pending_.assign(left.begin(), left.end());
    }
}

// How many bytes the record in front has; 0 when it is not whole.
std::size_t FrameDecoder::takeOne(std::span<const std::uint8_t> bytes) {
    if (!begun_) {
        const std::size_t there = std::min(bytes.size(), kBeginning.size());
        if (textOf(bytes.first(there)) != kBeginning.substr(0, there)) {
            refuse("it begins with something else");
        }
        begun_ = there == kBeginning.size();
        return begun_ ? there : 0;
    }
    if (bytes.size() < sizeof(Header)) {
        return 0;
    }
    const auto header = valueAt<Header>(bytes);
    if (header.length > kLongestPayload) {
        refuse("a record is too long");
    }
    if (bytes.size() - sizeof header < header.length) {
        return 0;
    }
    take(header.type, header.timestampNs, bytes.subspan(sizeof header, header.length));
    return sizeof header + header.length;
}

void FrameDecoder::take(std::uint32_t type, std::uint64_t timestampNs,
                        std::span<const std::uint8_t> payload) {
    frame_.timestamp = timestampNs;
    if (type == kReport) {
        frame_.type = RecordedFrame::Type::InputReport;
        frame_.key.clear();
        frame_.value = {};
        frame_.report.assign(payload.begin(), payload.end());
        sink_.onFrame(frame_);
    } else if (type == kState) {
        std::uint32_t keyLength = 0;
        if (payload.size() < sizeof keyLength) {
            refuse("a setting is too short");
        }
        keyLength = valueAt<std::uint32_t>(payload);
        payload = payload.subspan(sizeof keyLength);
        if (payload.size() < keyLength) {
            refuse("a setting is too short");
        }
        frame_.type = RecordedFrame::Type::State;
        frame_.key = textOf(payload.first(keyLength));
        frame_.value = Vexa::readJson(textOf(payload.subspan(keyLength)));
        frame_.report.clear();
        if (!frame_.value) {
            refuse("a setting's value is no JSON");
        }
        sink_.onFrame(frame_);
    } else if (type == kGap && payload.size() == sizeof(FrameGap)) {
        sink_.onGap(valueAt<FrameGap>(payload));
    } else if (type == kEnd && payload.empty()) {
        isAtEnd_ = true;
    } else {
        refuse("a record is of no known type");
    }
}

bool drain(FrameFeed& feed, FrameDecoder& decoder) {
    const auto readable = feed.readable();
    for (const std::span<const std::uint8_t> bytes : readable) {
        decoder.write(bytes);
        feed.consume(bytes.size());
    }
    return !readable.front().empty();
}

}  // namespace VexaTouch::Tools
