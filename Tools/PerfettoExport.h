#pragma once

#include "Algorithm/Algs.h"
#include "Platform/JsonWriter.h"
#include "Tools/Replay.h"

#include <array>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// Writes a replay as trace events in JSON, which the Perfetto viewer opens: a counter for each
/// pixel and for the scores, slices for touches and holds, instants for events, settings, firmware
/// events and reports that are none. A counter is written when it changes.
///
/// Trace time is recorded time since the first frame, in microseconds. It never runs back: what was
/// recorded by a clock that had stepped back is shown at the latest time before.
class PerfettoExport {
public:
    /// Called with each piece; what it throws leaves the operation that wrote.
    using Sink = std::function<void(std::string_view piece)>;

    explicit PerfettoExport(Sink sink);

    void write(const PlayedFrame& played, const Algs& algs);
    /// Closes what is still open and the document. Nothing may be written afterwards.
    void finish();

private:
    enum class Track : std::uint8_t;

    void beginEvent(std::string_view phase, std::string_view name);
    void endEvent();
    void nameTrack(Track track, std::string_view name);
    void counter(std::string_view name, double value);
    void instant(Track track, std::string_view name);
    void beginSlice(Track track, std::string_view name);
    void endSlice(Track track);
    void writeCounters(const PlayedFrame& played, const Algs& algs);
    void writeSlices(const HandStats& hand);
    void writeInstants(const PlayedFrame& played);
    void flush();

    Sink sink_;
    std::string text_;
    Vexa::JsonWriter json_;
    std::optional<std::uint64_t> startNs_;
    std::uint64_t timeNs_ = 0;  // since the start
    std::optional<std::array<std::int16_t, kPixelCount>> lastPixels_;
    std::optional<float> lastTouchScore_;
    std::optional<std::int32_t> lastRegion_;
    bool touching_ = false;
    bool holding_ = false;
};

}  // namespace VexaTouch::Tools
