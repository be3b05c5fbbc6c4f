#pragma once

#include "Platform/HidEvent.h"
#include "Tools/EventRecord.h"

#include <cstdint>
#include <string>

namespace VexaTouch::Tools {

/// An event as a host's callback got it.
struct DeliveredEvent {
    /// Its time is the host time at which the service took up the report that caused the event;
    /// index and device clock are unknown to a host, and 0.
    EventRecord record;
    /// To the callback, in nanoseconds: from the reading of that report where this process reads
    /// the device, from its taking up where the daemon tells of the event.
    std::uint64_t latencyNs = 0;

    /// The event as it stands when the callback is called at `nowTicks`, its report having been
    /// read at `arrivedTicks`.
    static DeliveredEvent of(const Vexa::HidEvent& event, std::uint64_t arrivedTicks,
                             std::uint64_t nowTicks);
};

/// {"time_ns":..,"latency_ns":..,"frame":..,"kind":"..","region":..,"phase":..,"mask":..}, without
/// a line feed.
std::string deliveredEventJson(const DeliveredEvent& event);

/// The names of the columns, with line feed.
std::string deliveredEventHeading();
/// The event in aligned columns, with line feed. Times count from `startNs`, a host time.
std::string deliveredEventLine(const DeliveredEvent& event, std::uint64_t startNs);

}  // namespace VexaTouch::Tools
