#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string_view>

namespace VexaTouch::Tools {

/// A place on the surface in 1/256 of a surface unit, x to the right and y down, (0, 0) the middle
/// of pixel K. A surface unit is one column of the picture of an image; a row of it is two units.
struct SurfacePlace {
    static constexpr std::int32_t kUnit = 256;

    std::int32_t x = 0;
    std::int32_t y = 0;

    friend bool operator==(const SurfacePlace&, const SurfacePlace&) = default;
};

/// One sensing pad: the letter of the pixel it belongs to and its place in whole surface units.
struct SurfacePad {
    char letter;
    std::int32_t x;
    std::int32_t y;

    [[nodiscard]] constexpr SurfacePlace place() const noexcept {
        return {x * SurfacePlace::kUnit, y * SurfacePlace::kUnit};
    }
    /// Index of the pixel, 0 to 14.
    [[nodiscard]] constexpr std::size_t pixel() const noexcept {
        return static_cast<std::size_t>(letter - 'A');
    }
};

/// All pads in reading order. The pixels A to F, J and L have two pads each, on opposite sides,
/// which are sensed as one; so the members of the group "ADEF" are neighbours at the left edge and
/// those of "BCEF" at the right.
inline constexpr std::array<SurfacePad, 23> kSurfacePads = {{
    {'H', -5, -12}, {'G', 5, -12},  //
    {'I', 0, -10},                  //
    {'B', -11, -8}, {'A', 11, -8},  //
    {'J', -7, -6},  {'J', 7, -6},   //
    {'F', -11, -4}, {'E', 11, -4},  //
    {'A', -15, -2}, {'B', 15, -2},  //
    {'K', 0, 0},                    //
    {'D', -15, 2},  {'C', 15, 2},   //
    {'E', -11, 4},  {'F', 11, 4},   //
    {'L', -7, 6},   {'L', 7, 6},    //
    {'C', -11, 8},  {'D', 11, 8},   //
    {'M', 0, 10},                   //
    {'N', -5, 12},  {'O', 5, 12},   //
}};

/// A place with a name of its own, in whole surface units.
struct NamedPlace {
    std::string_view name;
    std::int32_t x;
    std::int32_t y;
    std::string_view meaning;
};

inline constexpr std::array<NamedPlace, 3> kNamedPlaces = {{
    {"play", -13, 0, "play/pause: between A, D, E and F at the left edge"},
    {"vol+", 0, -11, "volume up: among G, H and I at the top"},
    {"vol-", 0, 11, "volume down: among M, N and O at the bottom"},
}};

/// The grid: columns A to G from left to right and rows 1 to 7 from top to bottom, so that D4 is
/// the middle. Spacing in surface units.
inline constexpr std::int32_t kGridSize = 7;
inline constexpr std::int32_t kGridColumnSpacing = 5;
inline constexpr std::int32_t kGridRowSpacing = 4;

/// Places in coordinates reach this many surface units from the middle.
inline constexpr std::int32_t kSurfaceReach = 20;

/// Reads a place: a name (`play`, `vol+`, `vol-`), a pixel letter (its upper pad if it has two), a
/// grid place such as `B3`, or coordinates in whole surface units such as `-10,4`.
/// No value for anything else.
std::optional<SurfacePlace> placeFromText(std::string_view text);

}  // namespace VexaTouch::Tools
