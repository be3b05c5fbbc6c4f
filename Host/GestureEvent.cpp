#include "Host/GestureEvent.h"

#include <algorithm>
#include <array>
#include <limits>

namespace VexaTouch::Host {
namespace {

struct KindEntry {
    EventKind kind;
    std::string_view name;
};

constexpr std::array<KindEntry, 7> kKinds = {{
    {EventKind::MayBegin, "may-begin"},
    {EventKind::HoldStart, "hold-start"},
    {EventKind::HoldChange, "hold-change"},
    {EventKind::HoldEnd, "hold-end"},
    {EventKind::Tap, "tap"},
    {EventKind::Cancel, "cancel"},
    {EventKind::FirmwareReset, "firmware-reset"},
}};

EventKind kindOfDigitizerPhase(Vexa::HidEventPhase phase) noexcept {
    switch (phase) {
        case Vexa::HidEventPhase::MayBegin:
            return EventKind::MayBegin;
        case Vexa::HidEventPhase::Began:
            return EventKind::HoldStart;
        case Vexa::HidEventPhase::Changed:
            return EventKind::HoldChange;
        case Vexa::HidEventPhase::Ended:
            return EventKind::HoldEnd;
        case Vexa::HidEventPhase::Cancelled:
            return EventKind::Cancel;
        case Vexa::HidEventPhase::None:
            return EventKind::Tap;
    }
    return EventKind::Cancel;
}

}  // namespace

std::string_view eventKindName(EventKind kind) noexcept {
    return std::ranges::find(kKinds, kind, &KindEntry::kind)->name;
}

std::optional<EventKind> eventKindFromName(std::string_view name) noexcept {
    const auto found = std::ranges::find(kKinds, name, &KindEntry::name);
    if (found == kKinds.end()) {
        return std::nullopt;
    }
    return found->kind;
}

GestureEvent GestureEvent::of(const Vexa::HidEvent& event) noexcept {
    const auto digitizer = event.digitizerRecord();
    if (!digitizer) {
        return {.kind = EventKind::FirmwareReset};
    }
    GestureEvent gesture{.kind = kindOfDigitizerPhase(event.phase())};
    // The regions are told apart by the vertical coordinate. It comes from a plug-in, so it may be
    // anything, not-a-number included.
    if (digitizer->y >= 0.0 && digitizer->y <= std::numeric_limits<std::uint32_t>::max()) {
        gesture.region = static_cast<std::uint32_t>(digitizer->y);
    }
    return gesture;
}

}  // namespace VexaTouch::Host
