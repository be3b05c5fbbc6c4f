#pragma once

#include "Tools/EventRecord.h"

#include <cstdint>
#include <span>
#include <string>

namespace VexaTouch::Tools {

/// How two lists of events differ, for a person.
struct EventDifference {
    std::uint64_t differences = 0;  ///< lines that are not the same on both sides
    std::string text;  ///< both lists side by side around each difference; empty when there is none
};

/// Compares what was expected with what came. In the text | stands between events that differ, <
/// and > point to the side on which an event stands alone.
EventDifference compareEvents(std::span<const EventRecord> expected,
                              std::span<const EventRecord> actual);

}  // namespace VexaTouch::Tools
