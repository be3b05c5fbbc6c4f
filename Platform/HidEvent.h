#pragma once

#include "Platform/Handle.h"

#include <vexa/event.h>
#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace Vexa {

/// The event types that the host tells apart; the upper half of a field code names the type.
enum class HidEventType : std::uint32_t {
    VendorDefined = VEXA_EVENT_TYPE_VENDOR_DEFINED,
    Digitizer = VEXA_EVENT_TYPE_DIGITIZER,
};

/// Phase codes of an event, as the host stores them.
enum class HidEventPhase : std::uint16_t {
    None = VEXA_EVENT_PHASE_NONE,
    Began = VEXA_EVENT_PHASE_BEGAN,
    Changed = VEXA_EVENT_PHASE_CHANGED,
    Ended = VEXA_EVENT_PHASE_ENDED,
    Cancelled = VEXA_EVENT_PHASE_CANCELLED,
    MayBegin = VEXA_EVENT_PHASE_MAY_BEGIN,
};

/// Codes of the integer fields: event type in the upper 16 bits, field number in the lower.
enum class HidEventField : std::uint32_t {
    /// The number of the sensing frame that caused a digitizer event.
    DigitizerFrameNumber = VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER,
};

/// The content of a digitizer event as it is created.
struct DigitizerEventRecord {
    std::uint64_t timestamp = 0;  ///< host ticks
    std::uint32_t transducerType = 0;
    std::uint32_t index = 0;
    std::uint32_t identity = 0;
    std::uint32_t eventMask = 0;
    std::uint32_t buttonMask = 0;
    double x = 0;
    double y = 0;
    double z = 0;
    double tipPressure = 0;
    double barrelPressure = 0;
    bool inRange = false;
    bool touching = false;
    std::uint32_t options = 0;

    friend bool operator==(const DigitizerEventRecord&, const DigitizerEventRecord&) = default;
};

/// The content of a vendor-defined event as it is created.
struct VendorEventRecord {
    std::uint64_t timestamp = 0;  ///< host ticks
    std::uint32_t usagePage = 0;
    std::uint32_t usage = 0;
    std::uint32_t version = 0;
    std::vector<std::uint8_t> payload;
    std::uint32_t options = 0;

    friend bool operator==(const VendorEventRecord&, const VendorEventRecord&) = default;
};

/// An event of libvexaplatform: a counted reference, the size of a pointer, copied by sharing.
///
/// It is written through the reference, so a setter called on one copy is seen by all of them; the
/// owner finishes writing before it hands the event to another thread. One that was moved from or
/// detached reads as 0 and none.
class HidEvent {
public:
    /// May throw std::bad_alloc.
    static HidEvent digitizer(const DigitizerEventRecord& record);
    static HidEvent vendorDefined(const VendorEventRecord& record);

    // For those who speak the C interface.

    /// Takes over a reference that the caller owns.
    static HidEvent adopt(vexa_event* owned) noexcept { return HidEvent(Handle::adopt(owned)); }
    /// Takes a reference of its own.
    static HidEvent share(vexa_event* borrowed) noexcept {
        return HidEvent(Handle::share(borrowed));
    }
    /// Borrowed, as long as this reference keeps the event.
    [[nodiscard]] vexa_event* handle() const noexcept { return handle_.get(); }
    /// Gives the reference to the caller.
    [[nodiscard]] vexa_event* detach() noexcept { return handle_.detach(); }

    [[nodiscard]] HidEventType type() const noexcept {
        return static_cast<HidEventType>(vexa_event_get_type(handle()));
    }

    /// Host ticks.
    [[nodiscard]] std::uint64_t timestamp() const noexcept {
        return vexa_event_get_timestamp(handle());
    }
    void setTimestamp(std::uint64_t ticks) const noexcept {
        vexa_event_set_timestamp(handle(), ticks);
    }

    [[nodiscard]] HidEventPhase phase() const noexcept {
        return static_cast<HidEventPhase>(vexa_event_get_phase(handle()));
    }
    void setPhase(HidEventPhase phase) const noexcept {
        vexa_event_set_phase(handle(), static_cast<std::uint32_t>(phase));
    }

    /// The value of an integer field; 0 when it was never set or the event has no such field.
    [[nodiscard]] std::int64_t integerField(HidEventField field) const noexcept {
        return vexa_event_get_integer(handle(), static_cast<std::uint32_t>(field));
    }
    /// Ignored when the event's type has no such field.
    void setIntegerField(HidEventField field, std::int64_t value) const noexcept {
        vexa_event_set_integer(handle(), static_cast<std::uint32_t>(field), value);
    }

    /// The record of a digitizer event, none for any other type. Its timestamp is the current one.
    [[nodiscard]] std::optional<DigitizerEventRecord> digitizerRecord() const noexcept;
    /// The record of a vendor-defined event, none for any other type. May throw std::bad_alloc.
    [[nodiscard]] std::optional<VendorEventRecord> vendorRecord() const;

    /// A readable one-line text with every field that is not at its default. May throw
    /// std::bad_alloc.
    [[nodiscard]] std::string description() const;

    /// Same object.
    friend bool operator==(const HidEvent&, const HidEvent&) = default;

private:
    using Handle = Vexa::Handle<vexa_event, vexa_event_retain, vexa_event_release>;

    explicit HidEvent(Handle handle) noexcept : handle_(std::move(handle)) {}

    Handle handle_;
};

static_assert(sizeof(HidEvent) == sizeof(void*));

}  // namespace Vexa
