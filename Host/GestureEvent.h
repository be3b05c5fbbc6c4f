#pragma once

#include "Platform/HidEvent.h"

#include <cstdint>
#include <optional>
#include <string_view>

namespace VexaTouch::Host {

enum class EventKind : std::uint8_t {
    MayBegin,
    HoldStart,
    HoldChange,
    HoldEnd,
    Tap,
    Cancel,
    FirmwareReset,
};

/// "may-begin", "hold-start", "hold-change", "hold-end", "tap", "cancel", "firmware-reset".
std::string_view eventKindName(EventKind kind) noexcept;
std::optional<EventKind> eventKindFromName(std::string_view name) noexcept;

/// What a delivered event tells its host. Any thread.
struct GestureEvent {
    EventKind kind = EventKind::MayBegin;
    /// 1 play, 2 volume down, 3 volume up; 0 none.
    std::uint32_t region = 0;

    /// A vendor-defined event is the notice of a firmware reset. What no service of ours makes does
    /// least: a phase that is not known counts as cancelled, a coordinate that is no number of a
    /// region as none.
    static GestureEvent of(const Vexa::HidEvent& event) noexcept;

    friend bool operator==(const GestureEvent&, const GestureEvent&) = default;
};

}  // namespace VexaTouch::Host
