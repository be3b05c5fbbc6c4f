#pragma once

#include "Host/InterfaceReference.h"
#include "Host/PluginLibrary.h"
#include "Host/ServiceReference.h"
#include "Platform/PropertyValue.h"

#include <vexa/plugin.h>
#include <cstdint>
#include <string>

namespace VexaTouch::Host {

/// A service as its factory made it, seen through its plug-in interface: a typed call for each slot
/// of that table. The order and the threads of the calls are those of <vexa/plugin.h>. The library
/// must outlive it.
class PluginInstance {
public:
    /// No instance.
    PluginInstance() noexcept = default;
    /// Throws HostFailure when the factory makes none, or its table is not one that this host
    /// knows.
    explicit PluginInstance(const PluginLibrary& library);

    /// The other interface of the same service. Throws HostFailure.
    [[nodiscard]] ServiceReference service() const;

    /// `score` goes in as the host rates the plug-in and comes out as the plug-in does.
    vexa_status probe(const Vexa::PropertyValue& properties, std::uint32_t service,
                      std::int32_t& score) const {
        return reference_->Probe(reference_.self(), properties.handle(), service, &score);
    }
    vexa_status start(const Vexa::PropertyValue& properties, std::uint32_t service) const {
        return reference_->Start(reference_.self(), properties.handle(), service);
    }
    vexa_status stop() const { return reference_->Stop(reference_.self()); }

    /// Gives the reference back.
    void reset() noexcept { reference_.reset(); }
    explicit operator bool() const noexcept { return static_cast<bool>(reference_); }

private:
    InterfaceReference<vexa_plugin_interface> reference_;
    std::string file_;  // for messages
};

}  // namespace VexaTouch::Host
