#pragma once

#include "Platform/PropertyValue.h"
#include "Tools/Validate/CheckRun.h"
#include "Tools/Validate/LoadedPlugin.h"

#include <vexa/plugin.h>
#include <cstdint>

namespace VexaTouch::Tools {

/// A service of the plug-in with one reference through each interface. Each operation tells its
/// step and calls the slot; those that must succeed fail the check when they do not.
class CheckedService {
public:
    CheckedService(CheckRun& run, const LoadedPlugin& plugin);
    CheckedService(const CheckedService&) = delete;
    CheckedService(CheckedService&&) = delete;
    CheckedService& operator=(const CheckedService&) = delete;
    CheckedService& operator=(CheckedService&&) = delete;
    /// Releases what is still held.
    ~CheckedService();

    /// The interface references; NULL once released.
    [[nodiscard]] vexa_plugin_interface** plugin() const noexcept { return plugin_; }
    [[nodiscard]] vexa_service_interface** service() const noexcept { return service_; }

    void probe(std::uint32_t service) const;
    /// Must succeed.
    void start(std::uint32_t service) const;
    [[nodiscard]] vexa_status tryStart(std::uint32_t service) const;
    /// Must succeed.
    void stop() const;
    [[nodiscard]] vexa_status tryStop() const;
    void setEventCallback(vexa_event_callback callback, void* target, void* refcon) const;
    void schedule(vexa_queue* queue) const;
    void unschedule(vexa_queue* queue) const;
    /// Must succeed.
    void open(std::uint32_t options = 0) const;
    [[nodiscard]] bool tryOpen(std::uint32_t options = 0) const;
    void close(std::uint32_t options = 0) const;
    /// These two tell no step, as they are called on other threads, too.
    [[nodiscard]] Vexa::PropertyValue property(const Vexa::PropertyValue& key) const;
    [[nodiscard]] bool setProperty(const Vexa::PropertyValue& key,
                                   const Vexa::PropertyValue& value) const;
    /// Gives both references back.
    void release();
    /// The check gave them back itself.
    void forget() noexcept {
        plugin_ = nullptr;
        service_ = nullptr;
    }

private:
    CheckRun& run_;
    vexa_plugin_interface** plugin_ = nullptr;
    vexa_service_interface** service_ = nullptr;
};

/// What the host tells a service about its device.
Vexa::PropertyValue serviceProperties();

}  // namespace VexaTouch::Tools
