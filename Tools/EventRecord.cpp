#include "Tools/EventRecord.h"

#include "Platform/Json.h"
#include "Platform/PropertyValue.h"
#include "Tools/Failure.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <limits>

namespace VexaTouch::Tools {
namespace {

/// What each region does, by region number.
struct RegionEntry {
    std::string_view onTap;
    std::string_view onHold;
    std::string_view either;
};

constexpr std::array<RegionEntry, 4> kRegions = {{
    {"none", "none", "none"},
    {"play/pause", "voice-assistant call", "play/pause or voice-assistant call"},
    {"volume down", "volume decrement", "volume down or decrement"},
    {"volume up", "volume increment", "volume up or increment"},
}};

void appendNumberMember(std::string& text, std::string_view name, std::uint64_t value) {
    text += ",\"";
    text += name;
    text += "\":";
    text += std::to_string(value);
}

std::uint64_t numberMember(const Vexa::PropertyValue& object, std::string_view name,
                           std::uint64_t most) {
    const Vexa::PropertyValue value = object.member(name);
    if (!value) {
        throw Failure("\"" + std::string(name) + "\" is missing");
    }
    std::uint64_t number = 0;
    if (const auto wide = value.asUnsigned()) {
        number = *wide;
    } else if (const auto narrow = value.asSigned(); narrow && *narrow >= 0) {
        number = static_cast<std::uint64_t>(*narrow);
    } else {
        throw Failure("\"" + std::string(name) + "\" is no unsigned integer");
    }
    if (number > most) {
        throw Failure("\"" + std::string(name) + "\" is above " + std::to_string(most));
    }
    return number;
}

EventKind kindMember(const Vexa::PropertyValue& object) {
    const Vexa::PropertyValue value = object.member("kind");
    const auto name = value.asString();
    if (!name) {
        throw Failure("\"kind\" is missing or no string");
    }
    const auto kind = eventKindFromName(*name);
    if (!kind) {
        throw Failure("\"kind\" is \"" + std::string(*name) + "\", which is no kind of event");
    }
    return *kind;
}

}  // namespace

EventRecord eventRecordFromHidEvent(const Vexa::HidEvent& event) {
    EventRecord record;
    const Host::GestureEvent gesture = Host::GestureEvent::of(event);
    record.kind = gesture.kind;
    record.region = gesture.region;
    const auto digitizer = event.digitizerRecord();
    if (!digitizer) {
        return record;
    }
    record.frame =
        static_cast<std::uint32_t>(event.integerField(Vexa::HidEventField::DigitizerFrameNumber));
    record.phase = static_cast<std::uint32_t>(event.phase());
    record.mask = digitizer->eventMask;
    return record;
}

std::string_view regionMeaning(EventKind kind, std::uint32_t region) noexcept {
    const RegionEntry& entry = region < kRegions.size() ? kRegions[region] : kRegions[0];
    switch (kind) {
        case EventKind::Tap:
            return entry.onTap;
        case EventKind::HoldStart:
        case EventKind::HoldChange:
        case EventKind::HoldEnd:
            return entry.onHold;
        default:
            return entry.either;
    }
}

void appendEventMembers(std::string& text, const EventRecord& event) {
    text += "\"frame\":";
    text += std::to_string(event.frame);
    text += ",\"kind\":\"";
    text += eventKindName(event.kind);
    text += '"';
    appendNumberMember(text, "region", event.region);
    appendNumberMember(text, "phase", event.phase);
    appendNumberMember(text, "mask", event.mask);
}

void appendEventJson(std::string& text, const EventRecord& event) {
    text += "{\"index\":";
    text += std::to_string(event.index);
    appendNumberMember(text, "time_ns", event.timeNs);
    appendNumberMember(text, "device_ms", event.deviceMs);
    text += ',';
    appendEventMembers(text, event);
    text += '}';
}

std::string eventJson(const EventRecord& event) {
    std::string text;
    appendEventJson(text, event);
    return text;
}

EventRecord eventFromJson(std::string_view line) {
    const Vexa::PropertyValue object = Vexa::readJson(line);
    const auto members = object.asDictionary();
    if (!members) {
        throw Failure("no JSON object");
    }
    constexpr auto max32 = std::numeric_limits<std::uint32_t>::max();
    const auto number32 = [&](std::string_view name) {
        return static_cast<std::uint32_t>(numberMember(object, name, max32));
    };
    EventRecord event;
    event.index = numberMember(object, "index", std::numeric_limits<std::uint64_t>::max());
    event.timeNs = numberMember(object, "time_ns", std::numeric_limits<std::uint64_t>::max());
    event.deviceMs = number32("device_ms");
    event.frame = number32("frame");
    event.kind = kindMember(object);
    event.region = number32("region");
    event.phase = number32("phase");
    event.mask = number32("mask");
    constexpr std::size_t memberCount = 8;
    if (members->size() > memberCount) {
        throw Failure("a member that no event has");
    }
    return event;
}

std::vector<EventRecord> readExpectedEvents(const std::string& path) {
    std::error_code notThere;
    if (std::filesystem::is_directory(path, notThere)) {
        throw Failure(path + ": is a folder, not a file of events");
    }
    errno = 0;
    std::ifstream file(path, std::ios::binary);
    if (!file) {
        throw Failure(path + ": cannot open: " + std::strerror(errno));
    }
    std::vector<EventRecord> events;
    std::string line;
    for (std::uint64_t number = 1; std::getline(file, line); ++number) {
        if (line.ends_with('\r')) {
            line.pop_back();
        }
        if (line.empty() || line.starts_with('#')) {
            continue;
        }
        try {
            events.push_back(eventFromJson(line));
        } catch (const Failure& failure) {
            throw Failure(path + ": line " + std::to_string(number) +
                          ": not an event: " + failure.what());
        }
    }
    return events;
}

}  // namespace VexaTouch::Tools
