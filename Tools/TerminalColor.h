#pragma once

#include "Tools/Streams.h"

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// How many colours the terminal shows.
enum class ColorDepth : std::uint8_t { None, Colors256, TrueColor };

struct Rgb {
    std::uint8_t red = 0;
    std::uint8_t green = 0;
    std::uint8_t blue = 0;

    friend bool operator==(const Rgb&, const Rgb&) = default;
};

/// What `never`, `256` and `truecolor` say; no value for `auto` and for anything else.
std::optional<ColorDepth> colorDepthFromText(std::string_view text) noexcept;

/// What the result stream can show, from the environment: none unless it is a terminal, and none
/// when NO_COLOR is set or TERM is dumb.
ColorDepth detectColorDepth(const Streams& streams);

/// Appends the sequence that sets the background, and a text colour that can be read on it. Nothing
/// without colours.
void appendBackground(std::string& text, ColorDepth depth, Rgb color);
/// Appends the sequence that ends all colours and attributes. Nothing without colours.
void appendPlain(std::string& text, ColorDepth depth);
/// Appends the sequence for bold or faint text. Nothing without colours.
void appendBold(std::string& text, ColorDepth depth);
void appendFaint(std::string& text, ColorDepth depth);

}  // namespace VexaTouch::Tools
