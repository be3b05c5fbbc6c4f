#include "Host/ServiceReference.h"

namespace VexaTouch::Host {

Vexa::PropertyValue ServiceReference::property(std::string_view key) const {
    const Vexa::PropertyValue name(key);
    return Vexa::PropertyValue::adopt(reference_->copyProperty(reference_.self(), name.handle()));
}

bool ServiceReference::setProperty(std::string_view key, const Vexa::PropertyValue& value) const {
    const Vexa::PropertyValue name(key);
    return reference_->setProperty(reference_.self(), name.handle(), value.handle());
}

std::optional<Vexa::HidEvent> ServiceReference::copyEvent(std::uint32_t type,
                                                          const Vexa::HidEvent* matching,
                                                          std::uint32_t options) const {
    vexa_event* event = reference_->copyEvent(
        reference_.self(), type, matching != nullptr ? matching->handle() : nullptr, options);
    return event != nullptr ? std::optional(Vexa::HidEvent::adopt(event)) : std::nullopt;
}

vexa_status ServiceReference::setOutputEvent(const Vexa::HidEvent& event) const {
    return reference_->setOutputEvent(reference_.self(), event.handle());
}

}  // namespace VexaTouch::Host
