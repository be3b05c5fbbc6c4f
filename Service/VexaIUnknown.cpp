#include "Service/VexaIUnknown.h"

#include "Platform/HidEvent.h"
#include "Platform/PropertyValue.h"
#include "Platform/SerialQueue.h"
#include "Service/Identifier.h"
#include "Service/VexaHIDService.h"

#include <cstddef>
#include <cstring>
#include <new>
#include <optional>

namespace VexaTouch {

namespace {

static_assert(offsetof(vexa_plugin_interface, _reserved) == 0);
static_assert(offsetof(vexa_service_interface, _reserved) == 0);

/// The object behind either interface reference: reference -> field -> table -> reserved slot.
VexaHIDService& owner(void* self) noexcept {
    void* table = nullptr;
    std::memcpy(&table, self, sizeof table);
    void* object = nullptr;
    std::memcpy(&object, table, sizeof object);
    return *static_cast<VexaHIDService*>(object);
}

/// What `operation` answers, or `failure` when there is no memory for it.
template <typename Answer, typename Operation>
Answer answer(Answer failure, const Operation& operation) noexcept {
    try {
        return operation();
    } catch (const std::bad_alloc&) {
        return failure;
    }
}

}  // namespace

vexa_status VexaIUnknown::QueryInterface(void* self, vexa_identifier identifier,
                                         void** out) noexcept {
    const auto service = ServiceReference<VexaHIDService>::share(&owner(self));
    const Identifier requested(identifier);
    if (requested == Identifier(VEXA_PLUGIN_INTERFACE)) {
        *out = service.get()->getPluginInterface();
    } else if (requested == Identifier(VEXA_SERVICE_INTERFACE)) {
        *out = service.get()->getServiceInterface();
    } else {
        return VEXA_STATUS_NO_INTERFACE;
    }
    service.get()->retain();
    return VEXA_STATUS_SUCCESS;
}

std::uint32_t VexaIUnknown::AddRef(void* self) noexcept {
    VexaHIDService& service = owner(self);
    const std::uint32_t count = service.retainCount();
    service.retain();
    return count + 1;
}

std::uint32_t VexaIUnknown::Release(void* self) noexcept {
    VexaHIDService& service = owner(self);
    const std::uint32_t count = service.retainCount();
    service.release();
    return count - 1;
}

vexa_status VexaIUnknown::Probe(void* self, const vexa_value* properties, std::uint32_t service,
                                std::int32_t* score) noexcept {
    return answer(VEXA_STATUS_NO_RESOURCES, [&] {
        return owner(self).probeWithService(service, Vexa::PropertyValue::share(properties), score);
    });
}

vexa_status VexaIUnknown::Start(void* self, const vexa_value* properties,
                                std::uint32_t service) noexcept {
    return answer(VEXA_STATUS_NO_RESOURCES, [&] {
        return owner(self).startWithService(service, Vexa::PropertyValue::share(properties));
    });
}

vexa_status VexaIUnknown::Stop(void* self) noexcept {
    return answer(VEXA_STATUS_NO_RESOURCES, [&] { return owner(self).stop(); });
}

bool VexaIUnknown::open(void* self, std::uint32_t options) noexcept {
    return answer(false, [&] { return owner(self).openWithOptions(options); });
}

void VexaIUnknown::close(void* self, std::uint32_t options) noexcept {
    owner(self).closeWithOptions(options);
}

vexa_value* VexaIUnknown::copyProperty(void* self, const vexa_value* key) noexcept {
    return answer(static_cast<vexa_value*>(nullptr), [&] {
        return owner(self).getPropertyForKey(Vexa::PropertyValue::share(key)).detach();
    });
}

bool VexaIUnknown::setProperty(void* self, const vexa_value* key,
                               const vexa_value* value) noexcept {
    return answer(false, [&] {
        return owner(self).setPropertyForKey(Vexa::PropertyValue::share(value),
                                             Vexa::PropertyValue::share(key));
    });
}

void VexaIUnknown::setEventCallback(void* self, vexa_event_callback callback, void* target,
                                    void* refcon) noexcept {
    owner(self).setEventCallback(callback, target, refcon);
}

void VexaIUnknown::scheduleWithDispatchQueue(void* self, vexa_queue* queue) noexcept {
    owner(self).scheduleWithDispatchQueue(Vexa::SerialQueue::share(queue));
}

void VexaIUnknown::unscheduleFromDispatchQueue(void* self, vexa_queue* queue) noexcept {
    owner(self).unscheduleWithDispatchQueue(Vexa::SerialQueue::share(queue));
}

vexa_event* VexaIUnknown::copyEvent(void* self, std::uint32_t type, vexa_event* matching,
                                    std::uint32_t options) noexcept {
    return answer(static_cast<vexa_event*>(nullptr), [&]() -> vexa_event* {
        std::optional<Vexa::HidEvent> event =
            owner(self).copyEventWithType(type, Vexa::HidEvent::share(matching), options);
        return event ? event->detach() : nullptr;
    });
}

vexa_status VexaIUnknown::setOutputEvent(void* self, vexa_event* event) noexcept {
    return answer(VEXA_STATUS_NO_RESOURCES,
                  [&] { return owner(self).setOutputEvent(Vexa::HidEvent::share(event)); });
}

}  // namespace VexaTouch
