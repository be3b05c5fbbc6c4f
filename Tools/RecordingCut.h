#pragma once

#include "Pipeline/PipelineRecording.h"

#include <cstdint>
#include <optional>
#include <string_view>

namespace VexaTouch::Tools {

/// A place in a recording where it can be cut: before a frame, by number or by recorded time since
/// the first frame.
struct CutPlace {
    enum class Unit : std::uint8_t { Frames, Nanoseconds };

    Unit unit = Unit::Frames;
    std::uint64_t value = 0;

    friend bool operator==(const CutPlace&, const CutPlace&) = default;

    /// Reads "120" (frames), "1500ms" or "1.5s"; no value for anything else.
    static std::optional<CutPlace> fromText(std::string_view text);
};

/// The index of the frame at that place: the first one recorded at or after that time, or the
/// number of frames if there is none.
std::uint64_t frameAt(const FrameList& frames, CutPlace place);

/// Leaves the frames [begin, end) and, before them, the newest state frame of each key from the
/// frames that were cut away in front, so that the settings in force are kept. Other state of the
/// algorithm is lost: true if a finger was on the surface where the cut begins.
bool cutFrames(FrameList& frames, std::uint64_t begin, std::uint64_t end);

/// Keeps the newest `count` input reports as a bounded recording does (PipelineRecording's
/// trimFrames). True if a finger was on the surface where the oldest of them begins.
bool keepNewestReports(FrameList& frames, std::uint64_t count);

/// Whether a finger is on the surface after the first `count` frames.
bool touchesAfter(const FrameList& frames, std::uint64_t count);

}  // namespace VexaTouch::Tools
