#include "Platform/HidEvent.h"

#include "Platform/PropertyValue.h"

#include <new>

namespace Vexa {

namespace {

vexa_event* madeOrThrow(vexa_event* made) {
    if (!made) throw std::bad_alloc();
    return made;
}

}  // namespace

HidEvent HidEvent::digitizer(const DigitizerEventRecord& record) {
    const vexa_digitizer_record given{.timestamp = record.timestamp,
                                      .transducer_type = record.transducerType,
                                      .index = record.index,
                                      .identity = record.identity,
                                      .event_mask = record.eventMask,
                                      .button_mask = record.buttonMask,
                                      .x = record.x,
                                      .y = record.y,
                                      .z = record.z,
                                      .tip_pressure = record.tipPressure,
                                      .barrel_pressure = record.barrelPressure,
                                      .in_range = record.inRange,
                                      .touching = record.touching,
                                      .options = record.options};
    return adopt(madeOrThrow(vexa_event_create_digitizer(&given)));
}

HidEvent HidEvent::vendorDefined(const VendorEventRecord& record) {
    const vexa_vendor_record given{.timestamp = record.timestamp,
                                   .usage_page = record.usagePage,
                                   .usage = record.usage,
                                   .version = record.version,
                                   .payload = record.payload.data(),
                                   .payload_length = record.payload.size(),
                                   .options = record.options};
    return adopt(madeOrThrow(vexa_event_create_vendor_defined(&given)));
}

std::optional<DigitizerEventRecord> HidEvent::digitizerRecord() const noexcept {
    vexa_digitizer_record record;
    if (!vexa_event_get_digitizer(handle(), &record)) return std::nullopt;
    return DigitizerEventRecord{.timestamp = record.timestamp,
                                .transducerType = record.transducer_type,
                                .index = record.index,
                                .identity = record.identity,
                                .eventMask = record.event_mask,
                                .buttonMask = record.button_mask,
                                .x = record.x,
                                .y = record.y,
                                .z = record.z,
                                .tipPressure = record.tip_pressure,
                                .barrelPressure = record.barrel_pressure,
                                .inRange = record.in_range,
                                .touching = record.touching,
                                .options = record.options};
}

std::optional<VendorEventRecord> HidEvent::vendorRecord() const {
    vexa_vendor_record record;
    if (!vexa_event_get_vendor_defined(handle(), &record)) return std::nullopt;
    return VendorEventRecord{.timestamp = record.timestamp,
                             .usagePage = record.usage_page,
                             .usage = record.usage,
                             .version = record.version,
                             .payload = {record.payload, record.payload + record.payload_length},
                             .options = record.options};
}

std::string HidEvent::description() const {
    const PropertyValue text = PropertyValue::adopt(vexa_event_create_description(handle()));
    if (!text) throw std::bad_alloc();
    return std::string(text.asString().value());
}

}  // namespace Vexa
