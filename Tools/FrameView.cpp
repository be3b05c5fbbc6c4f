#include "Tools/FrameView.h"

#include "Platform/Json.h"
#include "Tools/TerminalText.h"

#include <array>
#include <cstdio>
#include <utility>

namespace VexaTouch::Tools {
namespace {

std::string decimals(float value) {
    std::array<char, 64> text{};
    std::snprintf(text.data(), text.size(), "%.2f", static_cast<double>(value));
    return text.data();
}

// Cut to the width of the terminal, and without anything that it would act on.
std::string fitted(std::string text, std::size_t columns) {
    text = forTerminal(std::move(text));
    if (text.size() > columns) {
        text.resize(columns);
        // No half of a character in UTF-8.
        while (!text.empty() && (static_cast<unsigned char>(text.back()) & 0xC0U) == 0x80U) {
            text.pop_back();
        }
        if (!text.empty() && (static_cast<unsigned char>(text.back()) & 0x80U) != 0) {
            text.pop_back();
        }
    }
    return text;
}

std::string whatText(const PlayedFrame& played) {
    switch (played.type) {
        case PlayedType::Image:
            return "image " + std::to_string(played.image.frameNumber) + " at " +
                   std::to_string(played.image.timestampMs) + " ms";
        case PlayedType::Firmware:
            return "firmware event " + std::to_string(played.firmware.code) +
                   (played.firmware.code == 0 ? " (reset)" : "");
        case PlayedType::Invalid:
            return "invalid report of " + std::to_string(played.frame->report.size()) + " bytes";
        case PlayedType::State:
            break;
    }
    return played.frame->key + " = " +
           Vexa::writeJson(played.frame->value, Vexa::JsonWriter::Style::Compact);
}

std::string eventText(const EventRecord& event) {
    std::string text(eventKindName(event.kind));
    if (event.region != 0) {
        text += " ";
        text += regionMeaning(event.kind, event.region);
    }
    return text;
}

std::string regionText(PixelRegion region) {
    return std::to_string(region) + " " +
           std::string(regionMeaning(EventKind::MayBegin, static_cast<std::uint32_t>(region)));
}

std::string scoresText(const HandStats& hand) {
    return "touch " + decimals(hand._touch_score) + " (hold from " +
           decimals(hand._touch_score_threshold) + ")   tap " + decimals(hand._tap_svm_score) +
           (hand._isTapSuppressed ? " (suppressed)" : "");
}

}  // namespace

FrameView::FrameView(ColorDepth depth, std::size_t columns, std::uint64_t startNs,
                     std::uint64_t frameCount)
    : depth_(depth),
      columns_(columns),
      startNs_(startNs),
      frameCount_(frameCount),
      picture_(depth, columns) {}

void FrameView::see(const PlayedFrame& played) noexcept {
    if (played.type == PlayedType::Image) {
        deviceMs_ = played.image.timestampMs;
    } else if (played.type == PlayedType::Firmware && played.firmware.code == 0) {
        deviceMs_ = 0;  // a reset is an image of nothing at time 0
    }
}

std::vector<std::string> FrameView::lines(const PlayedFrame& played, const Algs& algs) const {
    const HandStats& hand = algs.handStats();
    std::vector<std::string> lines = {heading(played), std::string()};
    for (std::string& line : picture_.lines(algs)) {
        lines.push_back(std::move(line));
    }
    std::string events;
    for (const EventRecord& event : played.events) {
        events += (events.empty() ? "" : ", ") + eventText(event);
    }
    lines.push_back(labelled("region", regionText(hand._activeRegion)));
    lines.push_back(labelled("phase", algs.phaseDescription(deviceMs_)));
    lines.push_back(labelled("score", scoresText(hand)));
    lines.push_back(labelled("events", events));
    return lines;
}

std::string FrameView::eventLine(const EventRecord& event) const {
    const std::string time = secondsText(event.timeNs, startNs_);
    constexpr std::size_t kTimeWidth = 12;
    return fitted(std::string(time.size() < kTimeWidth ? kTimeWidth - time.size() : 0, ' ') + time +
                      "  " + eventText(event),
                  columns_);
}

std::string FrameView::heading(const PlayedFrame& played) const {
    std::string text;
    appendBold(text, depth_);
    const std::string count = frameCount_ != 0 ? " of " + std::to_string(frameCount_) : "";
    text += fitted("frame " + std::to_string(played.index) + count + "   " +
                       secondsText(played.frame->timestamp, startNs_) + "   " + whatText(played),
                   columns_);
    appendPlain(text, depth_);
    return text;
}

std::string FrameView::labelled(std::string_view label, std::string_view text) const {
    constexpr std::size_t kLabelWidth = 8;
    std::string line;
    appendFaint(line, depth_);
    line += label;
    appendPlain(line, depth_);
    if (!text.empty()) {
        line.append(kLabelWidth - label.size(), ' ');
        line += fitted(std::string(text), columns_ > kLabelWidth ? columns_ - kLabelWidth : 0);
    }
    return line;
}

std::string secondsText(std::uint64_t timeNs, std::uint64_t startNs) {
    constexpr std::uint64_t kNsPerMs = 1'000'000;
    const bool negative = timeNs < startNs;
    const std::uint64_t ms = (negative ? startNs - timeNs : timeNs - startNs) / kNsPerMs;
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%s%llu.%03llu s", negative ? "-" : "",
                  static_cast<unsigned long long>(ms / 1000),
                  static_cast<unsigned long long>(ms % 1000));
    return text.data();
}

}  // namespace VexaTouch::Tools
