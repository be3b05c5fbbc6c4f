#include "Service/VexaHIDService.h"

#include "Service/VexaIUnknown.h"

#include <memory>
#include <utility>

namespace VexaTouch {

namespace {

vexa_plugin_interface pluginTable(VexaHIDService* owner) noexcept {
    vexa_plugin_interface table{};
    table._reserved = owner;
    table.QueryInterface = &VexaIUnknown::QueryInterface;
    table.AddRef = &VexaIUnknown::AddRef;
    table.Release = &VexaIUnknown::Release;
    table.version = 1;
    table.revision = 0;
    table.Probe = &VexaIUnknown::Probe;
    table.Start = &VexaIUnknown::Start;
    table.Stop = &VexaIUnknown::Stop;
    return table;
}

vexa_service_interface serviceTable(VexaHIDService* owner) noexcept {
    vexa_service_interface table{};
    table._reserved = owner;
    table.QueryInterface = &VexaIUnknown::QueryInterface;
    table.AddRef = &VexaIUnknown::AddRef;
    table.Release = &VexaIUnknown::Release;
    table.open = &VexaIUnknown::open;
    table.close = &VexaIUnknown::close;
    table.copyProperty = &VexaIUnknown::copyProperty;
    table.setProperty = &VexaIUnknown::setProperty;
    table.setEventCallback = &VexaIUnknown::setEventCallback;
    table.scheduleWithDispatchQueue = &VexaIUnknown::scheduleWithDispatchQueue;
    table.unscheduleFromDispatchQueue = &VexaIUnknown::unscheduleFromDispatchQueue;
    table.copyEvent = &VexaIUnknown::copyEvent;
    table.setOutputEvent = &VexaIUnknown::setOutputEvent;
    return table;
}

}  // namespace

bool VexaHIDService::init() noexcept {
    try {
        auto plugin = std::make_unique<vexa_plugin_interface>(pluginTable(this));
        auto service = std::make_unique<vexa_service_interface>(serviceTable(this));
        _pluginInterface = plugin.release();
        _serviceInterface = service.release();
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

void VexaHIDService::dealloc() noexcept {
    std::unique_ptr<vexa_service_interface>(std::exchange(_serviceInterface, nullptr)).reset();
    std::unique_ptr<vexa_plugin_interface>(std::exchange(_pluginInterface, nullptr)).reset();
}

void VexaHIDService::retain() noexcept {
    retainCount_.fetch_add(1, std::memory_order_relaxed);
}

void VexaHIDService::release() noexcept {
    // Whoever releases last sees all that the others did.
    if (retainCount_.fetch_sub(1, std::memory_order_acq_rel) == 1) {
        dealloc();
        delete this;
    }
}

std::uint32_t VexaHIDService::retainCount() const noexcept {
    return retainCount_.load(std::memory_order_relaxed);
}

vexa_status VexaHIDService::probeWithService(std::uint32_t, const Vexa::PropertyValue&,
                                             std::int32_t*) {
    return VEXA_STATUS_UNSUPPORTED;
}

vexa_status VexaHIDService::startWithService(std::uint32_t, const Vexa::PropertyValue&) {
    return VEXA_STATUS_UNSUPPORTED;
}

vexa_status VexaHIDService::stop() {
    return VEXA_STATUS_UNSUPPORTED;
}

bool VexaHIDService::openWithOptions(std::uint32_t) {
    return false;
}

void VexaHIDService::closeWithOptions(std::uint32_t) {}

Vexa::PropertyValue VexaHIDService::getPropertyForKey(const Vexa::PropertyValue&) {
    return {};
}

bool VexaHIDService::setPropertyForKey(const Vexa::PropertyValue&, const Vexa::PropertyValue&) {
    return false;
}

void VexaHIDService::setEventCallback(vexa_event_callback, void*, void*) {}

void VexaHIDService::scheduleWithDispatchQueue(const Vexa::SerialQueue&) {}

void VexaHIDService::unscheduleWithDispatchQueue(const Vexa::SerialQueue&) {}

std::optional<Vexa::HidEvent> VexaHIDService::copyEventWithType(std::uint32_t,
                                                                const Vexa::HidEvent&,
                                                                std::uint32_t) {
    return std::nullopt;
}

vexa_status VexaHIDService::setOutputEvent(const Vexa::HidEvent&) {
    return VEXA_STATUS_UNSUPPORTED;
}

}  // namespace VexaTouch
