#include "Tools/SurfaceLayout.h"

#include <charconv>

namespace VexaTouch::Tools {

namespace {

constexpr SurfacePlace placeAt(std::int32_t x, std::int32_t y) {
    return {x * SurfacePlace::kUnit, y * SurfacePlace::kUnit};
}

std::optional<std::int32_t> coordinateFromText(std::string_view text) {
    std::int32_t value = 0;
    const char* end = text.data() + text.size();
    const auto [read, error] = std::from_chars(text.data(), end, value);
    if (error != std::errc{} || read != end || value < -kSurfaceReach || value > kSurfaceReach) {
        return std::nullopt;
    }
    return value;
}

std::optional<SurfacePlace> padFromLetter(char letter) {
    for (const SurfacePad& pad : kSurfacePads) {
        if (pad.letter == letter) {
            return pad.place();
        }
    }
    return std::nullopt;
}

std::optional<SurfacePlace> gridPlace(char column, char row) {
    const std::int32_t x = column - 'A';
    const std::int32_t y = row - '1';
    if (x < 0 || x >= kGridSize || y < 0 || y >= kGridSize) {
        return std::nullopt;
    }
    constexpr std::int32_t kMiddle = kGridSize / 2;
    return placeAt((x - kMiddle) * kGridColumnSpacing, (y - kMiddle) * kGridRowSpacing);
}

}  // namespace

std::optional<SurfacePlace> placeFromText(std::string_view text) {
    for (const NamedPlace& named : kNamedPlaces) {
        if (named.name == text) {
            return placeAt(named.x, named.y);
        }
    }
    if (text.size() == 1) {
        return padFromLetter(text[0]);
    }
    if (const std::size_t comma = text.find(','); comma != std::string_view::npos) {
        const auto x = coordinateFromText(text.substr(0, comma));
        const auto y = coordinateFromText(text.substr(comma + 1));
        return x && y ? std::optional(placeAt(*x, *y)) : std::nullopt;
    }
    return text.size() == 2 ? gridPlace(text[0], text[1]) : std::nullopt;
}

}  // namespace VexaTouch::Tools
