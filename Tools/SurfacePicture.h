#pragma once

#include "Algorithm/Algs.h"
#include "Tools/SurfaceLayout.h"
#include "Tools/TerminalColor.h"

#include <array>
#include <cstddef>
#include <string>
#include <vector>

namespace VexaTouch::Tools {

/// The surface as rows of text for a terminal: each pad at its place with its pixel's letter and
/// value, in brackets when the pixel is active and in parentheses when it is above the noise. With
/// colours the surface glows: blue below the activation threshold, yellow to red above it.
class SurfacePicture {
public:
    static constexpr std::size_t kRows = 13;

    /// For a terminal of that many columns: the picture is 69 wide, or 38 when there is less room.
    SurfacePicture(ColorDepth depth, std::size_t columns);

    [[nodiscard]] std::size_t width() const noexcept { return width_; }

    /// The picture of the algorithm's pixels: kRows lines without line feeds.
    [[nodiscard]] std::vector<std::string> lines(const Algs& algs) const;

private:
    struct Row;

    [[nodiscard]] std::string line(const Algs& algs, std::size_t row) const;
    [[nodiscard]] float glow(const Algs& algs, std::size_t row, std::size_t column) const;

    ColorDepth depth_;
    std::size_t columnsPerUnit_;
    std::size_t padWidth_;
    std::size_t width_;
    // How much of each pad's strength reaches a place, place by place in reading order.
    std::vector<std::array<float, kSurfacePads.size()>> reach_;
};

}  // namespace VexaTouch::Tools
