#include "Tools/TerminalColor.h"

#include <cstdlib>

namespace VexaTouch::Tools {
namespace {

std::string_view environment(const char* name) {
    const char* value = std::getenv(name);
    return value == nullptr ? std::string_view() : std::string_view(value);
}

void appendColor(std::string& text, ColorDepth depth, std::string_view layer, Rgb color) {
    text += "\x1B[";
    text += layer;
    if (depth == ColorDepth::TrueColor) {
        text += ";2;" + std::to_string(color.red) + ';' + std::to_string(color.green) + ';' +
                std::to_string(color.blue);
    } else {
        // The palette's cube of six levels a colour begins at 16.
        constexpr int kLevel = 256 / 6 + 1;
        text += ";5;" + std::to_string(16 + 36 * (color.red / kLevel) + 6 * (color.green / kLevel) +
                                       color.blue / kLevel);
    }
    text += 'm';
}

}  // namespace

std::optional<ColorDepth> colorDepthFromText(std::string_view text) noexcept {
    if (text == "never") {
        return ColorDepth::None;
    }
    if (text == "256") {
        return ColorDepth::Colors256;
    }
    if (text == "truecolor") {
        return ColorDepth::TrueColor;
    }
    return std::nullopt;
}

ColorDepth detectColorDepth(const Streams& streams) {
    const std::string_view terminal = environment("TERM");
    if (!streams.outIsTerminal || !environment("NO_COLOR").empty() || terminal.empty() ||
        terminal == "dumb") {
        return ColorDepth::None;
    }
    const std::string_view colors = environment("COLORTERM");
    return colors == "truecolor" || colors == "24bit" ||
                   terminal.find("direct") != std::string_view::npos
               ? ColorDepth::TrueColor
               : ColorDepth::Colors256;
}

void appendBackground(std::string& text, ColorDepth depth, Rgb color) {
    if (depth == ColorDepth::None) {
        return;
    }
    // Brightness as the eye weighs the colours, in thousandths of 255.
    const int brightness = 299 * color.red + 587 * color.green + 114 * color.blue;
    const bool bright = brightness > 500 * 255;
    appendColor(text, depth, "48", color);
    appendColor(text, depth, "38", bright ? Rgb{0, 0, 0} : Rgb{255, 255, 255});
}

void appendPlain(std::string& text, ColorDepth depth) {
    if (depth != ColorDepth::None) {
        text += "\x1B[0m";
    }
}

void appendBold(std::string& text, ColorDepth depth) {
    if (depth != ColorDepth::None) {
        text += "\x1B[1m";
    }
}

void appendFaint(std::string& text, ColorDepth depth) {
    if (depth != ColorDepth::None) {
        text += "\x1B[2m";
    }
}

}  // namespace VexaTouch::Tools
