#pragma once

#include "Algorithm/Algs.h"
#include "Tools/Replay.h"
#include "Tools/SurfacePicture.h"
#include "Tools/TerminalColor.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace VexaTouch::Tools {

/// A played frame as a screenful of text: what it is and when, the surface, the region, the touch's
/// phase, the scores and the events.
class FrameView {
public:
    /// `startNs` is the recorded time of the first frame, from which times are counted. A
    /// `frameCount` of 0 is one that is not known.
    FrameView(ColorDepth depth, std::size_t columns, std::uint64_t startNs,
              std::uint64_t frameCount);

    /// Lines of a view, always as many.
    static constexpr std::size_t kLines = SurfacePicture::kRows + 6;

    /// Takes note of a played frame. Every frame up to the one that is shown must be seen.
    void see(const PlayedFrame& played) noexcept;

    /// The view of the frame that was seen last, without line feeds, no line wider than the
    /// terminal. A frame that is no image is shown over the surface as the last image left it.
    [[nodiscard]] std::vector<std::string> lines(const PlayedFrame& played, const Algs& algs) const;

    /// One event with its time: "  1.234 s  tap         volume up".
    [[nodiscard]] std::string eventLine(const EventRecord& event) const;

private:
    [[nodiscard]] std::string heading(const PlayedFrame& played) const;
    [[nodiscard]] std::string labelled(std::string_view label, std::string_view text) const;

    ColorDepth depth_;
    std::size_t columns_;
    std::uint64_t startNs_;
    std::uint64_t frameCount_;
    SurfacePicture picture_;
    std::uint32_t deviceMs_ = 0;  // of the last image
};

/// Nanoseconds since another time as "1.234 s", negative when the time is before it.
std::string secondsText(std::uint64_t timeNs, std::uint64_t startNs);

}  // namespace VexaTouch::Tools
