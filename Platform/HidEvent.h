#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace Vexa {

/// The event types that the host tells apart; the upper half of a field code names the type.
enum class HidEventType : std::uint32_t {
    VendorDefined = 1,
    Digitizer = 11,
};

/// Phase codes of an event, as the host stores them.
enum class HidEventPhase : std::uint16_t {
    None = 0,
    Began = 1,
    Changed = 2,
    Ended = 4,
    Cancelled = 8,
    MayBegin = 128,
};

/// Codes of the integer fields: event type in the upper 16 bits, field number in the lower.
enum class HidEventField : std::uint32_t {
    /// The number of the sensing frame that caused a digitizer event.
    DigitizerFrameNumber = 0x000B001B,
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

/// An event object of the host: a counted reference, copied by sharing.
///
/// Like every host object it is written through the reference, so a setter called on one copy is
/// seen by all of them; the owner finishes writing before it hands the event to another thread.
class HidEvent {
public:
    /// May throw std::bad_alloc.
    static HidEvent digitizer(const DigitizerEventRecord& record);
    static HidEvent vendorDefined(const VendorEventRecord& record);

    [[nodiscard]] HidEventType type() const noexcept;

    /// Host ticks.
    [[nodiscard]] std::uint64_t timestamp() const noexcept;
    void setTimestamp(std::uint64_t ticks) const noexcept;

    [[nodiscard]] HidEventPhase phase() const noexcept;
    void setPhase(HidEventPhase phase) const noexcept;

    /// The value of an integer field; 0 when it was never set or the event has no such field.
    [[nodiscard]] std::int64_t integerField(HidEventField field) const noexcept;
    /// Ignored when the event's type has no such field.
    void setIntegerField(HidEventField field, std::int64_t value) const noexcept;

    /// The record of a digitizer event, null for any other type. Its timestamp is the current one.
    [[nodiscard]] const DigitizerEventRecord* digitizerRecord() const noexcept;
    /// The record of a vendor-defined event, null for any other type.
    [[nodiscard]] const VendorEventRecord* vendorRecord() const noexcept;

    /// A readable one-line text with every field that is not at its default.
    [[nodiscard]] std::string description() const;

    /// Same object.
    friend bool operator==(const HidEvent&, const HidEvent&) = default;

private:
    struct State;
    explicit HidEvent(std::shared_ptr<State> state) noexcept : state_(std::move(state)) {}

    std::shared_ptr<State> state_;
};

}  // namespace Vexa
