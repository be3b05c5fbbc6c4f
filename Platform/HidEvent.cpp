#include "Platform/HidEvent.h"

#include "Platform/ShortestText.h"

#include <charconv>
#include <string_view>
#include <utility>
#include <variant>

namespace Vexa {

struct HidEvent::State {
    std::variant<DigitizerEventRecord, VendorEventRecord> record;
    HidEventPhase phase = HidEventPhase::None;
    std::int64_t frameNumber = 0;  // digitizer events only
};

namespace {

void appendHexadecimal(std::string& out, std::uint32_t value) {
    char digits[8];
    const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value, 16);
    out.append("0x").append(digits, end);
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
        appendHexadecimal(text_, value);
    }
    void real(std::string_view name, double value) {
        if (value == 0) return;
        begin(name);
        appendShortest(text_, value);
    }
    void flag(std::string_view name, bool value) {
        if (value) text_.append(" ").append(name);
    }
    void word(std::string_view name, std::string_view value) {
        begin(name);
        text_ += value;
    }
    std::string take() { return std::move(text_); }

private:
    void begin(std::string_view name) { text_.append(" ").append(name).append("="); }

    std::string text_;
};

void describePhase(FieldText& text, HidEventPhase phase) {
    switch (phase) {
        case HidEventPhase::None:
            return;
        case HidEventPhase::Began:
            return text.word("phase", "began");
        case HidEventPhase::Changed:
            return text.word("phase", "changed");
        case HidEventPhase::Ended:
            return text.word("phase", "ended");
        case HidEventPhase::Cancelled:
            return text.word("phase", "cancelled");
        case HidEventPhase::MayBegin:
            return text.word("phase", "may-begin");
    }
    text.number("phase", static_cast<std::uint16_t>(phase));
}

std::string bytesText(const std::vector<std::uint8_t>& bytes) {
    constexpr std::string_view kDigits = "0123456789abcdef";
    std::string text = "<";
    for (const std::uint8_t byte : bytes) {
        text += kDigits[byte >> 4];
        text += kDigits[byte & 15];
    }
    return text += ">";
}

}  // namespace

HidEvent HidEvent::digitizer(const DigitizerEventRecord& record) {
    return HidEvent(std::make_shared<State>(State{.record = record}));
}

HidEvent HidEvent::vendorDefined(const VendorEventRecord& record) {
    return HidEvent(std::make_shared<State>(State{.record = record}));
}

HidEventType HidEvent::type() const noexcept {
    return digitizerRecord() ? HidEventType::Digitizer : HidEventType::VendorDefined;
}

std::uint64_t HidEvent::timestamp() const noexcept {
    const DigitizerEventRecord* digitizer = digitizerRecord();
    return digitizer ? digitizer->timestamp : vendorRecord()->timestamp;
}

void HidEvent::setTimestamp(std::uint64_t ticks) const noexcept {
    if (auto* digitizer = std::get_if<DigitizerEventRecord>(&state_->record)) {
        digitizer->timestamp = ticks;
    } else if (auto* vendor = std::get_if<VendorEventRecord>(&state_->record)) {
        vendor->timestamp = ticks;
    }
}

HidEventPhase HidEvent::phase() const noexcept {
    return state_->phase;
}

void HidEvent::setPhase(HidEventPhase phase) const noexcept {
    state_->phase = phase;
}

std::int64_t HidEvent::integerField(HidEventField field) const noexcept {
    return field == HidEventField::DigitizerFrameNumber ? state_->frameNumber : 0;
}

void HidEvent::setIntegerField(HidEventField field, std::int64_t value) const noexcept {
    if (field == HidEventField::DigitizerFrameNumber && digitizerRecord()) {
        state_->frameNumber = value;
    }
}

const DigitizerEventRecord* HidEvent::digitizerRecord() const noexcept {
    return std::get_if<DigitizerEventRecord>(&state_->record);
}

const VendorEventRecord* HidEvent::vendorRecord() const noexcept {
    return std::get_if<VendorEventRecord>(&state_->record);
}

std::string HidEvent::description() const {
    if (const DigitizerEventRecord* record = digitizerRecord()) {
        FieldText text("digitizer");
        text.number("timestamp", record->timestamp);
        describePhase(text, phase());
        text.number("frameNumber", state_->frameNumber);
        text.number("transducerType", record->transducerType);
        text.number("index", record->index);
        text.number("identity", record->identity);
        text.mask("eventMask", record->eventMask);
        text.mask("buttonMask", record->buttonMask);
        text.real("x", record->x);
        text.real("y", record->y);
        text.real("z", record->z);
        text.real("tipPressure", record->tipPressure);
        text.real("barrelPressure", record->barrelPressure);
        text.flag("inRange", record->inRange);
        text.flag("touching", record->touching);
        text.mask("options", record->options);
        return text.take();
    }
    const VendorEventRecord& record = *vendorRecord();
    FieldText text("vendor-defined");
    text.number("timestamp", record.timestamp);
    describePhase(text, phase());
    text.mask("usagePage", record.usagePage);
    text.mask("usage", record.usage);
    text.number("version", record.version);
    if (!record.payload.empty()) text.word("payload", bytesText(record.payload));
    text.mask("options", record.options);
    return text.take();
}

}  // namespace Vexa
