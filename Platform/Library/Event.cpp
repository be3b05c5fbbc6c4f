#include "Platform/Library/DescriptionText.h"
#include "Platform/Library/LiveObjects.h"

#include <vexa/event.h>
#include <atomic>
#include <charconv>
#include <concepts>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

namespace Vexa::Library {

namespace {

struct VendorContent {
    explicit VendorContent(const vexa_vendor_record& given)
        : record(given), payload(given.payload, given.payload + given.payload_length) {
        record.payload = payload.data();
    }
    VendorContent(const VendorContent&) = delete;
    VendorContent& operator=(const VendorContent&) = delete;
    ~VendorContent() = default;

    vexa_vendor_record record;
    std::vector<std::uint8_t> payload;
};

}  // namespace

}  // namespace Vexa::Library

struct vexa_event final : private Vexa::Library::Counted<VEXA_OBJECT_EVENT> {
    template <class Record>
    vexa_event(std::in_place_type_t<Record> type, const auto& record) : content(type, record) {}

    std::atomic<std::size_t> references = 1;
    std::uint32_t phase = VEXA_EVENT_PHASE_NONE;
    std::int64_t frameNumber = 0;  // digitizer events only
    std::variant<vexa_digitizer_record, Vexa::Library::VendorContent> content;
};

namespace Vexa::Library {

namespace {

const vexa_digitizer_record* digitizerOf(const vexa_event* event) noexcept {
    return event ? std::get_if<vexa_digitizer_record>(&event->content) : nullptr;
}

const vexa_vendor_record* vendorOf(const vexa_event* event) noexcept {
    const auto* content = event ? std::get_if<VendorContent>(&event->content) : nullptr;
    return content ? &content->record : nullptr;
}

/// Writes "name=value" for each field that is not at its default.
class FieldText {
public:
    explicit FieldText(std::string_view kind) : text_(kind) {}

    void number(std::string_view name, std::integral auto value) {
        if (value == 0) return;
        begin(name);
        text_ += std::to_string(value);
    }
    void mask(std::string_view name, std::uint32_t value) {
        if (value == 0) return;
        begin(name);
        char digits[8];
        const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value, 16);
        text_.append("0x").append(digits, end);
    }
    void real(std::string_view name, double value) {
        if (value == 0) return;
        begin(name);
        appendNumber(text_, value);
    }
    void flag(std::string_view name, bool value) {
        if (value) text_.append(" ").append(name);
    }
    void word(std::string_view name, std::string_view value) {
        begin(name);
        text_ += value;
    }
    void bytes(std::string_view name, std::span<const std::uint8_t> value) {
        if (value.empty()) return;
        begin(name);
        appendBytes(text_, value);
    }
    std::string take() { return std::move(text_); }

private:
    void begin(std::string_view name) { text_.append(" ").append(name).append("="); }

    std::string text_;
};

void describePhase(FieldText& text, std::uint32_t phase) {
    switch (phase) {
        case VEXA_EVENT_PHASE_BEGAN:
            return text.word("phase", "began");
        case VEXA_EVENT_PHASE_CHANGED:
            return text.word("phase", "changed");
        case VEXA_EVENT_PHASE_ENDED:
            return text.word("phase", "ended");
        case VEXA_EVENT_PHASE_CANCELLED:
            return text.word("phase", "cancelled");
        case VEXA_EVENT_PHASE_MAY_BEGIN:
            return text.word("phase", "may-begin");
        default:
            return text.number("phase", phase);
    }
}

std::string describe(const vexa_event& event, const vexa_digitizer_record& record) {
    FieldText text("digitizer");
    text.number("timestamp", record.timestamp);
    describePhase(text, event.phase);
    text.number("frameNumber", event.frameNumber);
    text.number("transducerType", record.transducer_type);
    text.number("index", record.index);
    text.number("identity", record.identity);
    text.mask("eventMask", record.event_mask);
    text.mask("buttonMask", record.button_mask);
    text.real("x", record.x);
    text.real("y", record.y);
    text.real("z", record.z);
    text.real("tipPressure", record.tip_pressure);
    text.real("barrelPressure", record.barrel_pressure);
    text.flag("inRange", record.in_range);
    text.flag("touching", record.touching);
    text.mask("options", record.options);
    return text.take();
}

std::string describe(const vexa_event& event, const vexa_vendor_record& record) {
    FieldText text("vendor-defined");
    text.number("timestamp", record.timestamp);
    describePhase(text, event.phase);
    text.mask("usagePage", record.usage_page);
    text.mask("usage", record.usage);
    text.number("version", record.version);
    text.bytes("payload", {record.payload, record.payload_length});
    text.mask("options", record.options);
    return text.take();
}

std::string describe(const vexa_event* event) {
    if (const auto* record = digitizerOf(event)) return describe(*event, *record);
    if (const auto* record = vendorOf(event)) return describe(*event, *record);
    return "no event";
}

/// A new event that holds a `Content`; null when there is no memory.
template <class Content>
vexa_event* makeEvent(const auto& record) noexcept {
    try {
        return std::make_unique<vexa_event>(std::in_place_type<Content>, record).release();
    } catch (...) {
        return nullptr;
    }
}

}  // namespace

}  // namespace Vexa::Library

using namespace Vexa::Library;

extern "C" {

vexa_event* vexa_event_create_digitizer(const vexa_digitizer_record* record) noexcept {
    return record ? makeEvent<vexa_digitizer_record>(*record) : nullptr;
}

vexa_event* vexa_event_create_vendor_defined(const vexa_vendor_record* record) noexcept {
    if (!record || (!record->payload && record->payload_length > 0)) return nullptr;
    return makeEvent<VendorContent>(*record);
}

vexa_event* vexa_event_retain(vexa_event* event) noexcept {
    if (event) event->references.fetch_add(1, std::memory_order_relaxed);
    return event;
}

void vexa_event_release(vexa_event* event) noexcept {
    if (event && event->references.fetch_sub(1, std::memory_order_acq_rel) == 1) {
        const std::unique_ptr<vexa_event> last(event);
    }
}

uint32_t vexa_event_get_type(const vexa_event* event) noexcept {
    if (!event) return 0;
    return digitizerOf(event) ? VEXA_EVENT_TYPE_DIGITIZER : VEXA_EVENT_TYPE_VENDOR_DEFINED;
}

uint64_t vexa_event_get_timestamp(const vexa_event* event) noexcept {
    if (const auto* record = digitizerOf(event)) return record->timestamp;
    if (const auto* record = vendorOf(event)) return record->timestamp;
    return 0;
}

uint32_t vexa_event_get_phase(const vexa_event* event) noexcept {
    return event ? event->phase : VEXA_EVENT_PHASE_NONE;
}

int64_t vexa_event_get_integer(const vexa_event* event, uint32_t field) noexcept {
    return event && field == VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER ? event->frameNumber : 0;
}

bool vexa_event_get_digitizer(const vexa_event* event, vexa_digitizer_record* out) noexcept {
    const auto* record = digitizerOf(event);
    if (record) *out = *record;
    return record != nullptr;
}

bool vexa_event_get_vendor_defined(const vexa_event* event, vexa_vendor_record* out) noexcept {
    const auto* record = vendorOf(event);
    if (record) *out = *record;
    return record != nullptr;
}

vexa_value* vexa_event_create_description(const vexa_event* event) noexcept {
    try {
        const std::string text = describe(event);
        return vexa_value_create_string(text.data(), text.size());
    } catch (...) {
        return nullptr;
    }
}

void vexa_event_set_timestamp(vexa_event* event, uint64_t ticks) noexcept {
    if (!event) return;
    if (auto* digitizer = std::get_if<vexa_digitizer_record>(&event->content)) {
        digitizer->timestamp = ticks;
    } else if (auto* vendor = std::get_if<VendorContent>(&event->content)) {
        vendor->record.timestamp = ticks;
    }
}

void vexa_event_set_phase(vexa_event* event, uint32_t phase) noexcept {
    if (event) event->phase = phase;
}

void vexa_event_set_integer(vexa_event* event, uint32_t field, int64_t value) noexcept {
    if (field == VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER && digitizerOf(event)) {
        event->frameNumber = value;
    }
}

}  // extern "C"
