#include "Tools/PerfettoExport.h"

#include <algorithm>
#include <cmath>
#include <utility>

namespace VexaTouch::Tools {

// The tracks of the trace, in the order in which they are shown; each is a thread of the one
// process.
enum class PerfettoExport::Track : std::uint8_t { Touch = 1, Hold, Events, Firmware, Settings };

namespace {

constexpr std::size_t kFlushSize = std::size_t{64} * 1024;
constexpr std::uint64_t kProcess = 1;
constexpr std::uint64_t kNsPerMicrosecond = 1000;

// Regions of a touch have no name of their own before it is clear whether it is a tap or a hold.
std::string regionText(PixelRegion region) {
    return "region " + std::to_string(region);
}

}  // namespace

PerfettoExport::PerfettoExport(Sink sink)
    : sink_(std::move(sink)), json_(text_, Vexa::JsonWriter::Style::Compact) {
    json_.beginObject();
    json_.key("displayTimeUnit");
    json_.plainString("ms");
    json_.key("traceEvents");
    json_.beginArray();
    beginEvent("M", "process_name");
    json_.key("args");
    json_.beginObject();
    json_.key("name");
    json_.plainString("Vexa Touch");
    json_.endObject();
    endEvent();
    nameTrack(Track::Touch, "touch");
    nameTrack(Track::Hold, "hold");
    nameTrack(Track::Events, "events");
    nameTrack(Track::Firmware, "firmware");
    nameTrack(Track::Settings, "settings");
}

void PerfettoExport::write(const PlayedFrame& played, const Algs& algs) {
    const std::uint64_t recorded = played.frame->timestamp;
    if (!startNs_) {
        startNs_ = recorded;
    }
    if (recorded > *startNs_) {
        timeNs_ = std::max(timeNs_, recorded - *startNs_);
    }
    writeSlices(algs.handStats());
    writeInstants(played);
    writeCounters(played, algs);
    if (text_.size() >= kFlushSize) {
        flush();
    }
}

void PerfettoExport::finish() {
    if (holding_) {
        endSlice(Track::Hold);
    }
    if (touching_) {
        endSlice(Track::Touch);
    }
    json_.endArray();
    json_.endObject();
    text_ += '\n';
    flush();
}

// Each event is on a line of its own. The caller adds the members that the phase needs.
void PerfettoExport::beginEvent(std::string_view phase, std::string_view name) {
    text_ += '\n';
    json_.beginObject();
    json_.key("ph");
    json_.plainString(phase);
    json_.key("pid");
    json_.number(kProcess);
    if (phase != "M") {
        json_.key("ts");
        // A whole number as such: as a floating-point text it might get an exponent.
        if (timeNs_ % kNsPerMicrosecond == 0) {
            json_.number(timeNs_ / kNsPerMicrosecond);
        } else {
            json_.number(static_cast<double>(timeNs_) / kNsPerMicrosecond);
        }
    }
    if (!name.empty()) {
        json_.key("name");
        json_.string(name);
    }
}

void PerfettoExport::endEvent() {
    json_.endObject();
}

void PerfettoExport::nameTrack(Track track, std::string_view name) {
    for (const std::string_view member : {"thread_name", "thread_sort_index"}) {
        beginEvent("M", member);
        json_.key("tid");
        json_.number(static_cast<std::uint64_t>(track));
        json_.key("args");
        json_.beginObject();
        if (member == "thread_name") {
            json_.key("name");
            json_.plainString(name);
        } else {
            json_.key("sort_index");
            json_.number(static_cast<std::uint64_t>(track));
        }
        json_.endObject();
        endEvent();
    }
}

void PerfettoExport::counter(std::string_view name, double value) {
    if (!std::isfinite(value)) {
        return;  // a counter is a number
    }
    beginEvent("C", name);
    json_.key("args");
    json_.beginObject();
    json_.key("value");
    json_.number(value);
    json_.endObject();
    endEvent();
}

void PerfettoExport::instant(Track track, std::string_view name) {
    beginEvent("i", name);
    json_.key("tid");
    json_.number(static_cast<std::uint64_t>(track));
    json_.key("s");
    json_.plainString("t");
}

void PerfettoExport::beginSlice(Track track, std::string_view name) {
    beginEvent("B", name);
    json_.key("tid");
    json_.number(static_cast<std::uint64_t>(track));
    endEvent();
}

void PerfettoExport::endSlice(Track track) {
    beginEvent("E", {});
    json_.key("tid");
    json_.number(static_cast<std::uint64_t>(track));
    endEvent();
}

void PerfettoExport::writeCounters(const PlayedFrame& played, const Algs& algs) {
    const HandStats& hand = algs.handStats();
    if (lastRegion_ != hand._activeRegion) {
        counter("region", hand._activeRegion);
        lastRegion_ = hand._activeRegion;
    }
    if (lastTouchScore_ != hand._touch_score) {
        counter("touch score", hand._touch_score);
        lastTouchScore_ = hand._touch_score;
    }
    if (played.type != PlayedType::Image) {
        return;
    }
    for (std::size_t i = 0; i < kPixelCount; ++i) {
        const std::int16_t value = played.image.signedPixels[i];
        if (!lastPixels_ || (*lastPixels_)[i] != value) {
            counter(std::string("pixel ") + static_cast<char>('A' + i), value);
        }
    }
    lastPixels_ = played.image.signedPixels;
}

void PerfettoExport::writeSlices(const HandStats& hand) {
    if (holding_ && !hand._isHolding) {
        endSlice(Track::Hold);
    }
    if (touching_ && !hand._isTouching) {
        endSlice(Track::Touch);
    }
    const PixelRegion region = hand._activeRegion;
    if (!touching_ && hand._isTouching) {
        beginSlice(Track::Touch, "touch " + regionText(region));
    }
    if (!holding_ && hand._isHolding) {
        const auto number = static_cast<std::uint32_t>(region);
        beginSlice(Track::Hold, "hold " + std::string(regionMeaning(EventKind::HoldStart, number)));
    }
    touching_ = hand._isTouching;
    holding_ = hand._isHolding;
}

void PerfettoExport::writeInstants(const PlayedFrame& played) {
    for (const EventRecord& event : played.events) {
        std::string name(eventKindName(event.kind));
        if (event.region != 0) {
            name += ' ';
            name += regionMeaning(event.kind, event.region);
        }
        instant(Track::Events, name);
        json_.key("args");
        json_.beginObject();
        const std::pair<std::string_view, std::uint64_t> members[] = {
            {"index", event.index},   {"device_ms", event.deviceMs}, {"frame", event.frame},
            {"region", event.region}, {"phase", event.phase},        {"mask", event.mask}};
        for (const auto& [key, value] : members) {
            json_.key(key);
            json_.number(value);
        }
        json_.endObject();
        endEvent();
    }
    if (played.type == PlayedType::State) {
        instant(Track::Settings, played.frame->key);
        json_.key("args");
        json_.beginObject();
        json_.key("value");
        json_.value(played.frame->value);
        json_.endObject();
        endEvent();
    } else if (played.type == PlayedType::Firmware) {
        instant(Track::Firmware, "firmware event " + std::to_string(played.firmware.code));
        endEvent();
    } else if (played.type == PlayedType::Invalid) {
        instant(Track::Firmware, "invalid report");
        json_.key("args");
        json_.beginObject();
        json_.key("bytes");
        json_.number(std::uint64_t{played.frame->report.size()});
        json_.endObject();
        endEvent();
    }
}

void PerfettoExport::flush() {
    sink_(text_);
    text_.clear();
}

}  // namespace VexaTouch::Tools
