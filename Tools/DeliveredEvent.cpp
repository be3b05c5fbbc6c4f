#include "Tools/DeliveredEvent.h"

#include "Shared/Util.h"

#include <array>
#include <cinttypes>
#include <cstdio>

namespace VexaTouch::Tools {
namespace {

constexpr double kNsPerMs = 1e6;
constexpr double kNsPerUs = 1e3;

double since(std::uint64_t timeNs, std::uint64_t startNs) {
    // Apart, since a time may stand before the start and the difference is exact either way.
    return timeNs < startNs ? -static_cast<double>(startNs - timeNs)
                            : static_cast<double>(timeNs - startNs);
}

}  // namespace

DeliveredEvent DeliveredEvent::of(const Vexa::HidEvent& event, std::uint64_t arrivedTicks,
                                  std::uint64_t nowTicks) {
    DeliveredEvent delivered;
    delivered.record = eventRecordFromHidEvent(event);
    delivered.record.timeNs = Util::nanosecondsFromMachTime(event.timestamp());
    delivered.latencyNs =
        nowTicks > arrivedTicks ? Util::nanosecondsFromMachTime(nowTicks - arrivedTicks) : 0;
    return delivered;
}

std::string deliveredEventJson(const DeliveredEvent& event) {
    std::string text = "{\"time_ns\":" + std::to_string(event.record.timeNs) +
                       ",\"latency_ns\":" + std::to_string(event.latencyNs) + ',';
    appendEventMembers(text, event.record);
    text += '}';
    return text;
}

std::string deliveredEventHeading() {
    return "     host ms  latency us  event           region\n";
}

std::string deliveredEventLine(const DeliveredEvent& event, std::uint64_t startNs) {
    std::array<char, 160> text{};
    const std::string kind(eventKindName(event.record.kind));
    const std::string meaning(regionMeaning(event.record.kind, event.record.region));
    const int length =
        std::snprintf(text.data(), text.size(), "%12.3f  %10.1f  %-14s  %" PRIu32 " %s\n",
                      since(event.record.timeNs, startNs) / kNsPerMs,
                      static_cast<double>(event.latencyNs) / kNsPerUs, kind.c_str(),
                      event.record.region, meaning.c_str());
    return {text.data(), static_cast<std::size_t>(length)};
}

}  // namespace VexaTouch::Tools
