#include "Tools/RecordingCut.h"

#include "Pipeline/Pipeline.h"
#include "Pipeline/TrimRule.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <iterator>

namespace VexaTouch::Tools {
namespace {

using Frame = PipelineRecording::Frame;

template <class Number>
std::optional<Number> numberFromText(std::string_view text) {
    Number value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (error != std::errc() || end != text.data() + text.size()) {
        return std::nullopt;
    }
    return value;
}

}  // namespace

std::optional<CutPlace> CutPlace::fromText(std::string_view text) {
    constexpr double kNsPerMs = 1e6;
    constexpr double kNsPerSecond = 1e9;
    constexpr double kMost = 9e18;  // fits 64 bits
    double unit = kNsPerSecond;
    if (text.ends_with("ms")) {
        unit = kNsPerMs;
        text.remove_suffix(2);
    } else if (text.ends_with('s')) {
        text.remove_suffix(1);
    } else {
        const auto frames = numberFromText<std::uint64_t>(text);
        return frames ? std::optional(CutPlace{Unit::Frames, *frames}) : std::nullopt;
    }
    const auto time = numberFromText<double>(text);
    if (!time || std::signbit(*time) || !(*time * unit < kMost)) {
        return std::nullopt;
    }
    return CutPlace{Unit::Nanoseconds, static_cast<std::uint64_t>(std::llround(*time * unit))};
}

std::uint64_t frameAt(const FrameList& frames, CutPlace place) {
    if (place.unit == CutPlace::Unit::Frames) {
        return std::min<std::uint64_t>(place.value, frames.size());
    }
    if (frames.empty()) {
        return 0;
    }
    const std::uint64_t start = frames.front().timestamp;
    const auto found = std::ranges::find_if(frames, [&](const Frame& frame) {
        return frame.timestamp >= start && frame.timestamp - start >= place.value;
    });
    return static_cast<std::uint64_t>(std::distance(frames.begin(), found));
}

bool cutFrames(FrameList& frames, std::uint64_t begin, std::uint64_t end) {
    const bool midTouch = touchesAfter(frames, begin);
    TrimRule matters(0);
    std::uint64_t index = frames.size();
    frames.retain([&](const Frame& frame) {
        --index;
        return index < end && (index >= begin || matters(frame));
    });
    return midTouch;
}

bool keepNewestReports(FrameList& frames, std::uint64_t count) {
    std::uint64_t begin = frames.size();
    std::uint64_t kept = 0;
    for (auto frame = frames.rbegin(); frame != frames.rend() && kept < count; ++frame) {
        --begin;
        kept += frame->type == Frame::Type::InputReport ? 1 : 0;
    }
    const bool midTouch = touchesAfter(frames, begin);
    PipelineRecording::trimFrames(frames, count);
    return midTouch;
}

bool touchesAfter(const FrameList& frames, std::uint64_t count) {
    Pipeline pipeline;
    for (const Frame& frame : frames) {
        if (count == 0) {
            break;
        }
        --count;
        if (frame.type == Frame::Type::InputReport) {
            pipeline.handleInputReport(frame.report.data(), frame.report.size());
        } else if (frame.type == Frame::Type::State) {
            pipeline.setState(frame.key, frame.value);
        }
    }
    return pipeline.algs().handStats()._isTouching;
}

}  // namespace VexaTouch::Tools
