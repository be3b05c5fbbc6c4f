#pragma once

#include "Platform/Handle.h"
#include "Platform/HidEvent.h"
#include "Platform/PropertyValue.h"
#include "Platform/SerialQueue.h"

#include <vexa/plugin.h>
#include <atomic>
#include <concepts>
#include <cstdint>
#include <new>
#include <optional>

namespace VexaTouch {

/// The shell of a HID service plug-in: the two interface tables by which a host reaches the object,
/// its count of references, and an operation for each slot that refuses or does nothing. Derive
/// from it and override what the service can do.
///
/// An object is made in two steps, construction and init, and ends in two, dealloc and destruction;
/// makeService and the last release go through them. References may be counted on any thread; the
/// operations come from the host, whose order and threads <vexa/plugin.h> gives.
class VexaHIDService {
public:
    /// One reference, which the maker owns, and no tables yet.
    VexaHIDService() noexcept = default;
    VexaHIDService(const VexaHIDService&) = delete;
    VexaHIDService(VexaHIDService&&) = delete;
    VexaHIDService& operator=(const VexaHIDService&) = delete;
    VexaHIDService& operator=(VexaHIDService&&) = delete;

    /// Builds the tables; false when there is no memory. An override calls this one first.
    [[nodiscard]] virtual bool init() noexcept;

    void retain() noexcept;
    /// The last one runs dealloc and deletes the object.
    void release() noexcept;
    /// For information: another thread may change it at once.
    [[nodiscard]] std::uint32_t retainCount() const noexcept;

    /// The interface references: each is the address of a field that points at a table, good from
    /// init to dealloc.
    [[nodiscard]] vexa_plugin_interface** getPluginInterface() noexcept {
        return &_pluginInterface;
    }
    [[nodiscard]] vexa_service_interface** getServiceInterface() noexcept {
        return &_serviceInterface;
    }

    // The operations, by the host's names. They may throw std::bad_alloc.

    /// May raise or lower `*outScore`, how well the service fits. UNSUPPORTED unless overridden.
    virtual vexa_status probeWithService(std::uint32_t service,
                                         const Vexa::PropertyValue& properties,
                                         std::int32_t* outScore);
    virtual vexa_status startWithService(std::uint32_t service,
                                         const Vexa::PropertyValue& properties);
    virtual vexa_status stop();
    /// False unless overridden.
    virtual bool openWithOptions(std::uint32_t options);
    virtual void closeWithOptions(std::uint32_t options);
    /// No value unless overridden.
    virtual Vexa::PropertyValue getPropertyForKey(const Vexa::PropertyValue& key);
    /// False unless overridden.
    virtual bool setPropertyForKey(const Vexa::PropertyValue& value,
                                   const Vexa::PropertyValue& key);
    virtual void setEventCallback(vexa_event_callback callback, void* target, void* refcon);
    virtual void scheduleWithDispatchQueue(const Vexa::SerialQueue& queue);
    virtual void unscheduleWithDispatchQueue(const Vexa::SerialQueue& queue);
    /// No event unless overridden.
    virtual std::optional<Vexa::HidEvent> copyEventWithType(std::uint32_t type,
                                                            const Vexa::HidEvent& matching,
                                                            std::uint32_t options);
    /// UNSUPPORTED unless overridden.
    virtual vexa_status setOutputEvent(const Vexa::HidEvent& event);

protected:
    virtual ~VexaHIDService() = default;

    /// Frees the tables. An override gives back what it holds and then calls this one.
    virtual void dealloc() noexcept;

private:
    // The host reads the tables through the addresses of these two, so they are plain pointers;
    // init makes what they point at, dealloc frees it.
    vexa_plugin_interface* _pluginInterface = nullptr;
    vexa_service_interface* _serviceInterface = nullptr;
    std::atomic<std::uint32_t> retainCount_{1};
};

namespace Detail {

inline void retainService(VexaHIDService* service) noexcept {
    service->retain();
}
inline void releaseService(VexaHIDService* service) noexcept {
    service->release();
}

}  // namespace Detail

/// A counted reference to a service, or none.
template <std::derived_from<VexaHIDService> Service>
using ServiceReference = Vexa::Handle<Service, &Detail::retainService, &Detail::releaseService>;

/// A new service, ready for the host; none when there is no memory.
template <std::derived_from<VexaHIDService> Service>
ServiceReference<Service> makeService() noexcept {
    try {
        auto service = ServiceReference<Service>::adopt(new Service);
        if (service.get()->init()) return service;
    } catch (const std::bad_alloc&) {
        return {};
    }
    return {};
}

}  // namespace VexaTouch
