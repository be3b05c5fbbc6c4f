#pragma once

#include "Platform/DeviceBackend.h"
#include "Platform/PropertyValue.h"
#include "Platform/ScriptedDevice.h"
#include "Platform/SerialQueue.h"
#include "Tests/Support/EventCollector.h"

#include <dlfcn.h>
#include <vexa/plugin.h>
#include <cstdint>
#include <memory>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {

/// The plug-in's shared object, loaded.
class LoadedPlugin {
public:
    explicit LoadedPlugin(const std::string& file)
        : library_(::dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL)) {
        if (!library_) throw std::runtime_error(::dlerror());
        factory_ =
            reinterpret_cast<vexa_plugin_factory>(::dlsym(library_, VEXA_PLUGIN_FACTORY_NAME));
        if (!factory_) throw std::runtime_error("no factory in " + file);
    }
    ~LoadedPlugin() { ::dlclose(library_); }
    LoadedPlugin(const LoadedPlugin&) = delete;
    LoadedPlugin(LoadedPlugin&&) = delete;
    LoadedPlugin& operator=(const LoadedPlugin&) = delete;
    LoadedPlugin& operator=(LoadedPlugin&&) = delete;

    [[nodiscard]] void* make(vexa_identifier type = VEXA_HID_SERVICE_PLUGIN_TYPE) const {
        return factory_(nullptr, type);
    }

private:
    void* library_;
    vexa_plugin_factory factory_ = nullptr;
};

/// A service as a host has it: two interface references and what can be called through them.
class ServiceUnderTest {
public:
    /// Takes over the host's reference, of a factory or of a test.
    explicit ServiceUnderTest(void* plugin)
        : plugin_(static_cast<vexa_plugin_interface**>(plugin)) {
        void* service = nullptr;
        if (!plugin_ ||
            (*plugin_)->QueryInterface(plugin_, VEXA_SERVICE_INTERFACE, &service) != 0) {
            throw std::runtime_error("no service interface");
        }
        service_ = static_cast<vexa_service_interface**>(service);
    }
    ~ServiceUnderTest() {
        (*service_)->Release(service_);
        (*plugin_)->Release(plugin_);
    }
    ServiceUnderTest(const ServiceUnderTest&) = delete;
    ServiceUnderTest(ServiceUnderTest&&) = delete;
    ServiceUnderTest& operator=(const ServiceUnderTest&) = delete;
    ServiceUnderTest& operator=(ServiceUnderTest&&) = delete;

    [[nodiscard]] vexa_plugin_interface** plugin() const { return plugin_; }
    [[nodiscard]] vexa_service_interface** service() const { return service_; }

    [[nodiscard]] vexa_status probe(std::uint32_t service, std::int32_t* score,
                                    const Vexa::PropertyValue& properties = {}) const {
        return (*plugin_)->Probe(plugin_, properties.handle(), service, score);
    }
    [[nodiscard]] vexa_status start(std::uint32_t service,
                                    const Vexa::PropertyValue& properties = {}) const {
        return (*plugin_)->Start(plugin_, properties.handle(), service);
    }
    // NOLINTNEXTLINE(modernize-use-nodiscard): it never fails
    vexa_status stop() const { return (*plugin_)->Stop(plugin_); }
    [[nodiscard]] bool open(std::uint32_t options = 0) const {
        return (*service_)->open(service_, options);
    }
    void close(std::uint32_t options = 0) const { (*service_)->close(service_, options); }
    [[nodiscard]] Vexa::PropertyValue get(const Vexa::PropertyValue& key) const {
        return Vexa::PropertyValue::adopt((*service_)->copyProperty(service_, key.handle()));
    }
    // NOLINTNEXTLINE(modernize-use-nodiscard): many a test knows
    bool set(const Vexa::PropertyValue& key, const Vexa::PropertyValue& value) const {
        return (*service_)->setProperty(service_, key.handle(), value.handle());
    }
    void setEventCallback(vexa_event_callback callback, void* target, void* refcon) const {
        (*service_)->setEventCallback(service_, callback, target, refcon);
    }
    void schedule(const Vexa::SerialQueue& queue) const {
        (*service_)->scheduleWithDispatchQueue(service_, queue.get());
    }
    void unschedule(const Vexa::SerialQueue& queue) const {
        (*service_)->unscheduleFromDispatchQueue(service_, queue.get());
    }
    /// Of another thread's references.
    [[nodiscard]] std::uint32_t references() const {
        const std::uint32_t count = (*plugin_)->AddRef(plugin_) - 1;
        (*plugin_)->Release(plugin_);
        return count;
    }

private:
    vexa_plugin_interface** plugin_;
    vexa_service_interface** service_ = nullptr;
};

/// The real plug-in's service with a scripted device before it and a queue behind it, as a host
/// puts them together.
class ServiceStand {
public:
    explicit ServiceStand(const std::string& pluginFile) : plugin_(pluginFile) {}
    /// Events that are on their way hold the queue themselves, and are for `events`.
    ~ServiceStand() { queue.drain(); }
    ServiceStand(const ServiceStand&) = delete;
    ServiceStand(ServiceStand&&) = delete;
    ServiceStand& operator=(const ServiceStand&) = delete;
    ServiceStand& operator=(ServiceStand&&) = delete;

    /// Takes the service as far as reports and events flow. Throws when a step fails.
    void startUp() {
        std::int32_t score = 0;
        if (service.probe(registration.service(), &score) != 0 ||
            service.start(registration.service()) != 0) {
            throw std::runtime_error("the service does not start");
        }
        service.setEventCallback(&EventCollector::callback, &events, nullptr);
        service.schedule(queue);
        if (!service.open()) throw std::runtime_error("the service does not open its device");
    }
    void tearDown() {
        service.close();
        service.unschedule(queue);
        service.stop();
    }

    /// Sends the reports and waits until the service has handled each of them, and the host's queue
    /// all events. False when that takes a minute.
    [[nodiscard]] bool feed(const std::vector<std::vector<std::uint8_t>>& reports) {
        for (const auto& report : reports) {
            ++sent_;
            if (!device->sendReport(report) || !device->waitUntilHandled(sent_)) return false;
        }
        queue.drain();
        return true;
    }

private:
    LoadedPlugin plugin_;
    std::uint64_t sent_ = 0;

public:
    std::shared_ptr<Vexa::ScriptedDevice> device = std::make_shared<Vexa::ScriptedDevice>();
    Vexa::DeviceRegistration registration{device};
    EventCollector events;
    Vexa::SerialQueue queue{"events"};
    ServiceUnderTest service{plugin_.make()};
};

}  // namespace VexaTouch::Testing
