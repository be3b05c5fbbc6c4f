#include "Tools/TraceText.h"

#include "Algorithm/StateFields.h"
#include "Platform/Json.h"
#include "Platform/ShortestText.h"

#include <array>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <string_view>
#include <type_traits>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kClassifierScore = "_svm._score";

template <typename Number>
void appendInteger(std::string& text, Number value) {
    std::array<char, 24> digits{};
    const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), value).ptr;
    text.append(digits.data(), end);
}

template <typename Field>
void appendField(std::string& text, const Field& field) {
    if constexpr (std::is_same_v<Field, bool>) {
        text += field ? "true" : "false";
    } else if constexpr (std::is_same_v<Field, float>) {
        const bool quoted = !std::isfinite(field);
        text += quoted ? "\"" : "";
        Vexa::appendShortest(text, field);
        text += quoted ? "\"" : "";
    } else if constexpr (std::is_integral_v<Field>) {
        appendInteger(text, field);
    } else {
        text += '[';
        for (const auto& element : field) {
            appendField(text, element);
            text += ',';
        }
        text.back() = ']';
    }
}

void appendMember(std::string& text, std::string_view name) {
    text += '"';
    text += name;
    text += "\":";
}

/// Appends the members of an object, each with a comma behind it.
struct MemberWriter {
    std::string& text;

    template <typename Field>
    void operator()(std::string_view name, const Field& field) const {
        if (name == kClassifierScore) {
            text += "\"_svm\":{\"_score\":";
            appendField(text, field);
            text += "},";
            return;
        }
        appendMember(text, name);
        appendField(text, field);
        text += ',';
    }
};

void appendPixels(std::string& text, const Algs& algs) {
    appendMember(text, "pixels");
    text += '[';
    for (const Pixel& pixel : algs.touchPixels()) {
        text += '{';
        forEachPixelField(pixel, MemberWriter{text});
        text.back() = '}';
        text += ',';
    }
    text.back() = ']';
}

void appendVirtualPixels(std::string& text, const Algs& algs) {
    appendMember(text, "virtual");
    text += '[';
    for (const VirtualPixel& pixel : algs.virtualPixels()) {
        text += '{';
        forEachPixelField(pixel, MemberWriter{text});
        appendMember(text, "_name");
        text += '"';
        text += pixel._name;
        text += "\"},";
    }
    text.back() = ']';
}

void appendEvents(std::string& text, std::span<const EventRecord> events) {
    appendMember(text, "events");
    text += '[';
    for (const EventRecord& event : events) {
        appendEventJson(text, event);
        text += ',';
    }
    if (events.empty()) {
        text += ']';
    } else {
        text.back() = ']';
    }
}

}  // namespace

const std::string& TraceText::line(const PlayedFrame& played, const Algs& algs) {
    line_ = "{\"index\":";
    appendInteger(line_, played.index);
    line_ += ",\"time_ns\":";
    appendInteger(line_, played.frame->timestamp);
    line_ += ",\"type\":\"";
    line_ += playedTypeName(played.type);
    line_ += "\",";
    if (played.type == PlayedType::Image) {
        MemberWriter{line_}("frame", played.image.frameNumber);
        MemberWriter{line_}("device_ms", played.image.timestampMs);
    }
    appendEvents(line_, played.events);
    line_ += ',';
    appendPixels(line_, algs);
    line_ += ',';
    appendVirtualPixels(line_, algs);
    line_ += ',';
    appendMember(line_, "hand");
    line_ += '{';
    forEachHandStatsField(algs.handStats(), MemberWriter{line_});
    line_.back() = '}';
    line_ += ',';
    MemberWriter{line_}("lastDispatchedPhase", algs.lastDispatchedPhase());
    appendStats(algs.eventStats());
    line_ += "}\n";
    return line_;
}

void TraceText::appendStats(const EventStats& stats) {
    if (lastStats_.empty() || !(lastCounters_ == stats._stats)) {
        lastCounters_ = stats._stats;
        lastStats_ = Vexa::writeJson(stats.statsDictionary(), Vexa::JsonWriter::Style::Compact);
    }
    appendMember(line_, "stats");
    line_ += lastStats_;
}

}  // namespace VexaTouch::Tools
