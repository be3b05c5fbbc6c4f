#include "Tools/CsvExport.h"

#include "Platform/Json.h"

#include <array>
#include <cstdio>
#include <span>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::size_t kFlushSize = std::size_t{64} * 1024;
constexpr std::string_view kRowEnd = "\r\n";

struct FlagColumn {
    std::string_view name;
    bool HandStats::* flag;
};

constexpr std::array<FlagColumn, 8> kFlagColumns = {{
    {"above_noise", &HandStats::_isAboveNoiseLevel},
    {"touching", &HandStats::_isTouching},
    {"holding", &HandStats::_isHolding},
    {"hold_suppressed", &HandStats::_isHoldSuppressed},
    {"would_be_holding", &HandStats::_wouldBeIsHolding},
    {"maybe_tap", &HandStats::_maybeTap},
    {"tap", &HandStats::_isTap},
    {"tap_suppressed", &HandStats::_isTapSuppressed},
}};

// A row, field by field.
class Row {
public:
    explicit Row(std::string& text) : text_(text) {}

    void number(std::int64_t value) { plain(std::to_string(value)); }
    void number(std::uint64_t value) { plain(std::to_string(value)); }
    void shortest(float value) {
        separate();
        Vexa::appendShortest(text_, value);
    }
    void empty() { separate(); }

    // Text that needs no quotes.
    void plain(std::string_view value) {
        separate();
        text_ += value;
    }

    void quoted(std::string_view value) {
        if (value.find_first_of(",\"\r\n") == std::string_view::npos) {
            plain(value);
            return;
        }
        separate();
        text_ += '"';
        for (const char c : value) {
            text_ += c;
            if (c == '"') {
                text_ += '"';
            }
        }
        text_ += '"';
    }

    void end() { text_ += kRowEnd; }

private:
    void separate() {
        if (!first_) {
            text_ += ',';
        }
        first_ = false;
    }

    std::string& text_;
    bool first_ = true;
};

void appendHeader(std::string& text) {
    Row row(text);
    for (const std::string_view name :
         {"index", "type", "time_ns", "time_ms", "device_ms", "frame"}) {
        row.plain(name);
    }
    for (const std::string_view prefix : {"signed_", "unsigned_"}) {
        for (char letter = 'A'; letter <= 'O'; ++letter) {
            row.plain(std::string(prefix) + letter);
        }
    }
    for (const FlagColumn& column : kFlagColumns) {
        row.plain(column.name);
    }
    for (const std::string_view name :
         {"region", "touch_score", "tap_score", "events", "key", "value"}) {
        row.plain(name);
    }
    row.end();
}

// Milliseconds from the first frame with all their nanoseconds; a clock that stepped back below
// the first frame gives a negative time.
std::string milliseconds(std::uint64_t timeNs, std::uint64_t startNs) {
    constexpr std::uint64_t kNsPerMs = 1'000'000;
    const bool negative = timeNs < startNs;
    const std::uint64_t distance = negative ? startNs - timeNs : timeNs - startNs;
    std::array<char, 32> text{};
    const int length = std::snprintf(text.data(), text.size(), "%s%llu.%06llu", negative ? "-" : "",
                                     static_cast<unsigned long long>(distance / kNsPerMs),
                                     static_cast<unsigned long long>(distance % kNsPerMs));
    return {text.data(), static_cast<std::size_t>(length)};
}

void addImage(Row& row, const PlayedFrame& played) {
    if (played.type != PlayedType::Image) {
        for (std::size_t i = 0; i < 2 + 2 * kPixelCount; ++i) {
            row.empty();
        }
        return;
    }
    row.number(std::uint64_t{played.image.timestampMs});
    row.number(std::uint64_t{played.image.frameNumber});
    for (const std::int16_t value : played.image.signedPixels) {
        row.number(std::int64_t{value});
    }
    for (const std::uint16_t value : played.image.unsignedPixels) {
        row.number(std::uint64_t{value});
    }
}

void addHand(Row& row, const HandStats& hand) {
    for (const FlagColumn& column : kFlagColumns) {
        row.plain(hand.*column.flag ? "1" : "0");
    }
    row.number(std::int64_t{hand._activeRegion});
    row.shortest(hand._touch_score);
    row.shortest(hand._tap_svm_score);
}

// "hold-end 2; firmware-reset 0"
std::string eventsText(std::span<const EventRecord> events) {
    std::string text;
    for (const EventRecord& event : events) {
        text += text.empty() ? "" : "; ";
        text += eventKindName(event.kind);
        text += ' ';
        text += std::to_string(event.region);
    }
    return text;
}

}  // namespace

CsvExport::CsvExport(Sink sink) : sink_(std::move(sink)) {
    appendHeader(text_);
}

void CsvExport::write(const PlayedFrame& played, const Algs& algs) {
    const std::uint64_t timeNs = played.frame->timestamp;
    if (!startNs_) {
        startNs_ = timeNs;
    }
    Row row(text_);
    row.number(played.index);
    row.plain(playedTypeName(played.type));
    row.number(timeNs);
    row.plain(milliseconds(timeNs, *startNs_));
    addImage(row, played);
    addHand(row, algs.handStats());
    row.plain(eventsText(played.events));
    if (played.type == PlayedType::State) {
        row.quoted(played.frame->key);
        row.quoted(Vexa::writeJson(played.frame->value, Vexa::JsonWriter::Style::Compact));
    } else {
        row.empty();
        row.empty();
    }
    row.end();
    if (text_.size() >= kFlushSize) {
        flush();
    }
}

void CsvExport::finish() {
    flush();
}

void CsvExport::flush() {
    if (!text_.empty()) {
        sink_(text_);
        text_.clear();
    }
}

}  // namespace VexaTouch::Tools
