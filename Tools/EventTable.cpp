#include "Tools/EventTable.h"

#include <array>
#include <cinttypes>
#include <cstdio>

namespace VexaTouch::Tools {
namespace {

constexpr std::uint64_t kNsPerUs = 1000;
constexpr std::uint64_t kUsPerMs = 1000;

/// Milliseconds with three decimals. A frame may be older than the first one.
std::string hostMs(std::uint64_t timeNs, std::uint64_t startNs) {
    const bool before = timeNs < startNs;
    const std::uint64_t us = (before ? startNs - timeNs : timeNs - startNs) / kNsPerUs;
    std::array<char, 48> text{};
    const int length = std::snprintf(text.data(), text.size(), "%s%" PRIu64 ".%03" PRIu64,
                                     before ? "-" : "", us / kUsPerMs, us % kUsPerMs);
    return {text.data(), static_cast<std::size_t>(length)};
}

}  // namespace

std::string EventTable::heading() {
    return "   index       host ms   device ms       frame  event           region\n";
}

std::string EventTable::line(const EventRecord& event) const {
    std::array<char, 160> text{};
    const std::string kind(eventKindName(event.kind));
    const std::string meaning(regionMeaning(event.kind, event.region));
    const int length =
        std::snprintf(text.data(), text.size(),
                      "%8" PRIu64 "  %12s  %10" PRIu32 "  %10" PRIu32 "  %-14s  %" PRIu32 " %s\n",
                      event.index, hostMs(event.timeNs, startNs_).c_str(), event.deviceMs,
                      event.frame, kind.c_str(), event.region, meaning.c_str());
    return {text.data(), static_cast<std::size_t>(length)};
}

}  // namespace VexaTouch::Tools
