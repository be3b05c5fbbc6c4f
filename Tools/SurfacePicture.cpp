#include "Tools/SurfacePicture.h"

#include <algorithm>
#include <cmath>
#include <optional>

namespace VexaTouch::Tools {
namespace {

// In surface units; a row of text is two of them high.
constexpr int kLeft = -15;
constexpr int kRight = 15;
constexpr int kTop = -12;
constexpr int kRowHeight = 2;

constexpr std::size_t kWidePad = 9;
constexpr std::size_t kNarrowPad = 8;

struct ColorStop {
    float progress = 0;
    Rgb color;
};

// The step at 1.0 is where a pixel becomes active.
constexpr std::array<ColorStop, 5> kColors = {{
    {0.2F, {12, 18, 48}},
    {1.0F, {30, 140, 200}},
    {1.0F, {250, 220, 70}},
    {2.0F, {245, 130, 30}},
    {3.5F, {215, 30, 45}},
}};

// No colour at all where next to nothing is felt (or what is felt is no number). In steps that the
// eye hardly sees, so that neighbouring places often share a colour.
std::optional<Rgb> colorOfProgress(float exactProgress) {
    constexpr float kSteps = 16;
    if (!(exactProgress >= kColors.front().progress)) {
        return std::nullopt;
    }
    const float progress =
        std::ceil(std::min(exactProgress, kColors.back().progress) * kSteps) / kSteps;
    for (std::size_t i = 1; i < kColors.size(); ++i) {
        const ColorStop& low = kColors[i - 1];
        const ColorStop& high = kColors[i];
        if (progress <= high.progress && low.progress < high.progress) {
            const float part = (progress - low.progress) / (high.progress - low.progress);
            const auto mix = [part](std::uint8_t from, std::uint8_t to) {
                return static_cast<std::uint8_t>(static_cast<float>(from) +
                                                 part * static_cast<float>(to - from));
            };
            return Rgb{mix(low.color.red, high.color.red), mix(low.color.green, high.color.green),
                       mix(low.color.blue, high.color.blue)};
        }
    }
    return kColors.back().color;
}

// "[A   350]": letter and value; what the pixel is shows around them.
std::string padText(char letter, const Pixel& pixel, std::size_t width) {
    std::string value = std::to_string(pixel._value);
    const std::size_t room = width - 3;  // letter and both ends
    if (value.size() < room) {
        value.insert(0, room - value.size(), ' ');
    }
    char open = ' ';
    char close = ' ';
    if (pixel._isActive) {
        open = '[';
        close = ']';
    } else if (pixel._isAboveNoise) {
        open = '(';
        close = ')';
    }
    std::string text = open + (letter + value) + close;
    text.resize(width);
    return text;
}

}  // namespace

struct SurfacePicture::Row {
    std::string text;
    std::vector<bool> bold;
};

SurfacePicture::SurfacePicture(ColorDepth depth, std::size_t columns) : depth_(depth) {
    constexpr std::size_t kUnits = kRight - kLeft;
    const bool wide = columns >= 2 * kUnits + kWidePad;
    columnsPerUnit_ = wide ? 2 : 1;
    padWidth_ = wide ? kWidePad : kNarrowPad;
    width_ = kUnits * columnsPerUnit_ + padWidth_;
    if (depth_ == ColorDepth::None) {
        return;
    }
    // A finger's pressure fades within about the distance of two neighbouring pads.
    constexpr float kFade = 2.6F;
    reach_.resize(kRows * width_);
    for (std::size_t place = 0; place < reach_.size(); ++place) {
        const float x =
            (static_cast<float>(place % width_) - static_cast<float>(padWidth_ - 1) / 2) /
                static_cast<float>(columnsPerUnit_) +
            kLeft;
        const float y = static_cast<float>(kRowHeight * static_cast<int>(place / width_) + kTop);
        for (std::size_t pad = 0; pad < kSurfacePads.size(); ++pad) {
            const float dx = x - static_cast<float>(kSurfacePads[pad].x);
            const float dy = y - static_cast<float>(kSurfacePads[pad].y);
            reach_[place][pad] = std::exp(-(dx * dx + dy * dy) / (2 * kFade * kFade));
        }
    }
}

std::vector<std::string> SurfacePicture::lines(const Algs& algs) const {
    std::vector<std::string> lines;
    lines.reserve(kRows);
    for (std::size_t row = 0; row < kRows; ++row) {
        lines.push_back(line(algs, row));
    }
    return lines;
}

std::string SurfacePicture::line(const Algs& algs, std::size_t row) const {
    Row content{std::string(width_, ' '), std::vector<bool>(width_)};
    for (const SurfacePad& pad : kSurfacePads) {
        if (pad.y != kRowHeight * static_cast<int>(row) + kTop) {
            continue;
        }
        const Pixel& pixel = algs.touchPixels()[pad.pixel()];
        const std::string text = padText(pad.letter, pixel, padWidth_);
        const auto column = static_cast<std::size_t>(pad.x - kLeft) * columnsPerUnit_;
        content.text.replace(column, text.size(), text);
        std::fill_n(content.bold.begin() + static_cast<std::ptrdiff_t>(column), text.size(),
                    pixel._isActive);
    }
    if (depth_ == ColorDepth::None) {
        content.text.erase(content.text.find_last_not_of(' ') + 1);
        return content.text;
    }
    std::string line;
    std::optional<Rgb> shown;
    bool shownBold = false;
    for (std::size_t column = 0; column < width_; ++column) {
        const auto color = colorOfProgress(glow(algs, row, column));
        const bool bold = content.bold[column];
        const bool mustEnd = (shown && !color) || (shownBold && !bold);
        if (mustEnd) {
            appendPlain(line, depth_);
        }
        if (color && (mustEnd || color != shown)) {
            appendBackground(line, depth_, *color);
        }
        if (bold && (mustEnd || !shownBold)) {
            appendBold(line, depth_);
        }
        shown = color;
        shownBold = bold;
        line += content.text[column];
    }
    if (shown || shownBold) {
        appendPlain(line, depth_);
    }
    return line;
}

float SurfacePicture::glow(const Algs& algs, std::size_t row, std::size_t column) const {
    const auto& reach = reach_[row * width_ + column];
    float strongest = 0;
    for (std::size_t pad = 0; pad < kSurfacePads.size(); ++pad) {
        const float strength = reach[pad] * algs.touchPixels()[kSurfacePads[pad].pixel()]._progress;
        strongest = std::max(strongest, strength);
    }
    return strongest;
}

}  // namespace VexaTouch::Tools
