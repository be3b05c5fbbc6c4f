#pragma once

#include "Host/GestureEvent.h"
#include "Platform/HidEvent.h"

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Tools {

using Host::EventKind;
using Host::eventKindFromName;
using Host::eventKindName;

/// One event of a replay, flat.
struct EventRecord {
    std::uint64_t index = 0;   ///< of the recorded frame that caused it, from 0, all types counted
    std::uint64_t timeNs = 0;  ///< recorded timestamp of that frame
    std::uint32_t deviceMs = 0;  ///< device clock of the image; 0 for events of a firmware report
    std::uint32_t frame = 0;     ///< frame number carried by the event
    EventKind kind = EventKind::MayBegin;
    std::uint32_t region = 0;
    std::uint32_t phase = 0;
    std::uint32_t mask = 0;

    friend bool operator==(const EventRecord&, const EventRecord&) = default;
};

/// The record of an event that a pipeline made. Index, time and device clock are the caller's.
EventRecord eventRecordFromHidEvent(const Vexa::HidEvent& event);

/// What the region of such an event means to a person: "play/pause", "volume decrement", ...;
/// "none" for region 0.
std::string_view regionMeaning(EventKind kind, std::uint32_t region) noexcept;

/// Appends the members that say what happened, without braces:
/// "frame":..,"kind":"..","region":..,"phase":..,"mask":..
void appendEventMembers(std::string& text, const EventRecord& event);
/// Appends the event as one JSON object, without a line feed:
/// {"index":..,"time_ns":..,"device_ms":..,"frame":..,"kind":"..","region":..,"phase":..,"mask":..}
void appendEventJson(std::string& text, const EventRecord& event);
std::string eventJson(const EventRecord& event);

/// The event of such a line, members in any order. Throws Failure with what is missing or wrong.
EventRecord eventFromJson(std::string_view line);

/// Reads an expected-events file: one event a line as appendEventJson writes it; empty lines and
/// lines that begin with # are left out. Throws Failure that names file and line.
std::vector<EventRecord> readExpectedEvents(const std::string& path);

}  // namespace VexaTouch::Tools
