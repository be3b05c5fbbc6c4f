#include "Tools/Validate/CheckedService.h"

#include "Tools/Validate/CheckTexts.h"
#include "Tools/Validate/InterfaceSelf.h"

#include <utility>

namespace VexaTouch::Tools {

CheckedService::CheckedService(CheckRun& run, const LoadedPlugin& plugin) : run_(run) {
    run.step("calling the factory");
    plugin_ = plugin.make();
    run.require(plugin_ != nullptr && *plugin_ != nullptr,
                "the factory gives no service for the type of HID services");
    run.step("asking for the service interface");
    void* out = nullptr;
    const vexa_status status =
        (*plugin_)->QueryInterface(selfOf(plugin_), VEXA_SERVICE_INTERFACE, &out);
    run.require(status == VEXA_STATUS_SUCCESS && out != nullptr,
                "QueryInterface does not give the service interface: " + statusText(status));
    service_ = static_cast<vexa_service_interface**>(out);
}

CheckedService::~CheckedService() {
    release();
}

void CheckedService::release() {
    if (service_ != nullptr) {
        run_.step("releasing the service interface");
        (*service_)->Release(selfOf(std::exchange(service_, nullptr)));
    }
    if (plugin_ != nullptr) {
        run_.step("releasing the plug-in interface");
        (*plugin_)->Release(selfOf(std::exchange(plugin_, nullptr)));
    }
}

void CheckedService::probe(std::uint32_t service) const {
    run_.step("calling Probe");
    const Vexa::PropertyValue properties = serviceProperties();
    std::int32_t score = 0;
    const vexa_status status =
        (*plugin_)->Probe(selfOf(plugin_), properties.handle(), service, &score);
    run_.require(status == VEXA_STATUS_SUCCESS, "Probe gives " + statusText(status));
}

void CheckedService::start(std::uint32_t service) const {
    const vexa_status status = tryStart(service);
    run_.require(status == VEXA_STATUS_SUCCESS, "Start gives " + statusText(status));
}

vexa_status CheckedService::tryStart(std::uint32_t service) const {
    run_.step("calling Start");
    const Vexa::PropertyValue properties = serviceProperties();
    return (*plugin_)->Start(selfOf(plugin_), properties.handle(), service);
}

void CheckedService::stop() const {
    const vexa_status status = tryStop();
    run_.require(status == VEXA_STATUS_SUCCESS, "Stop gives " + statusText(status));
}

vexa_status CheckedService::tryStop() const {
    run_.step("calling Stop");
    return (*plugin_)->Stop(selfOf(plugin_));
}

void CheckedService::setEventCallback(vexa_event_callback callback, void* target,
                                      void* refcon) const {
    run_.step("setting the event callback");
    (*service_)->setEventCallback(selfOf(service_), callback, target, refcon);
}

void CheckedService::schedule(vexa_queue* queue) const {
    run_.step("scheduling");
    (*service_)->scheduleWithDispatchQueue(selfOf(service_), queue);
}

void CheckedService::unschedule(vexa_queue* queue) const {
    run_.step("unscheduling");
    (*service_)->unscheduleFromDispatchQueue(selfOf(service_), queue);
}

void CheckedService::open(std::uint32_t options) const {
    run_.require(tryOpen(options), "open gives false");
}

bool CheckedService::tryOpen(std::uint32_t options) const {
    run_.step("opening");
    return (*service_)->open(selfOf(service_), options);
}

void CheckedService::close(std::uint32_t options) const {
    run_.step("closing");
    (*service_)->close(selfOf(service_), options);
}

Vexa::PropertyValue CheckedService::property(const Vexa::PropertyValue& key) const {
    return Vexa::PropertyValue::adopt((*service_)->copyProperty(selfOf(service_), key.handle()));
}

bool CheckedService::setProperty(const Vexa::PropertyValue& key,
                                 const Vexa::PropertyValue& value) const {
    return (*service_)->setProperty(selfOf(service_), key.handle(), value.handle());
}

Vexa::PropertyValue serviceProperties() {
    return Vexa::PropertyValue(
        Vexa::PropertyValue::Dictionary{{"Product", "validator"}, {"ReportInterval", 10000}});
}

}  // namespace VexaTouch::Tools
