#include "Host/PluginInstance.h"

#include "Host/HostFailure.h"
#include "Host/StatusText.h"

#include <initializer_list>

namespace VexaTouch::Host {
namespace {

constexpr std::uint16_t kKnownVersion = 1;

struct Slot {
    const char* name;
    bool filled;
};

/// Throws for the first slot that is empty: a call through it would end the process.
void requireSlots(const std::string& file, const char* table, std::initializer_list<Slot> slots) {
    for (const Slot& slot : slots) {
        if (!slot.filled) {
            throw HostFailure(file + ": the slot " + slot.name + " of its " + table +
                              " interface is empty");
        }
    }
}

void requireTable(const std::string& file, const vexa_plugin_interface& table) {
    if (table.version != kKnownVersion) {
        throw HostFailure(file + ": its plug-in interface has version " +
                          std::to_string(table.version) + ", this host knows version " +
                          std::to_string(kKnownVersion));
    }
    requireSlots(file, "plug-in",
                 {{"QueryInterface", table.QueryInterface != nullptr},
                  {"AddRef", table.AddRef != nullptr},
                  {"Probe", table.Probe != nullptr},
                  {"Start", table.Start != nullptr},
                  {"Stop", table.Stop != nullptr}});
}

void requireTable(const std::string& file, const vexa_service_interface& table) {
    requireSlots(file, "service",
                 {{"QueryInterface", table.QueryInterface != nullptr},
                  {"AddRef", table.AddRef != nullptr},
                  {"open", table.open != nullptr},
                  {"close", table.close != nullptr},
                  {"copyProperty", table.copyProperty != nullptr},
                  {"setProperty", table.setProperty != nullptr},
                  {"setEventCallback", table.setEventCallback != nullptr},
                  {"scheduleWithDispatchQueue", table.scheduleWithDispatchQueue != nullptr},
                  {"unscheduleFromDispatchQueue", table.unscheduleFromDispatchQueue != nullptr},
                  {"copyEvent", table.copyEvent != nullptr},
                  {"setOutputEvent", table.setOutputEvent != nullptr}});
}

/// Takes over a reference that a plug-in gave out. Without Release it can only be left alone.
template <typename Table>
InterfaceReference<Table> adopted(const std::string& file, const char* table, void* reference) {
    const Table* const* self = static_cast<Table**>(reference);
    if (*self == nullptr) {
        throw HostFailure(file + ": its " + table + " interface has no table");
    }
    requireSlots(file, table, {{"Release", (*self)->Release != nullptr}});
    auto owned = InterfaceReference<Table>::adopt(reference);
    requireTable(file, **self);
    return owned;
}

}  // namespace

PluginInstance::PluginInstance(const PluginLibrary& library) : file_(library.file()) {
    void* reference = library.factory()(nullptr, VEXA_HID_SERVICE_PLUGIN_TYPE);
    if (reference == nullptr) {
        throw HostFailure(file_ + ": its factory makes no HID service");
    }
    reference_ = adopted<vexa_plugin_interface>(file_, "plug-in", reference);
}

ServiceReference PluginInstance::service() const {
    void* reference = nullptr;
    const vexa_status status =
        reference_->QueryInterface(reference_.self(), VEXA_SERVICE_INTERFACE, &reference);
    if (status != VEXA_STATUS_SUCCESS || reference == nullptr) {
        throw HostFailure(file_ + ": QueryInterface gives no service interface: status " +
                          statusText(status));
    }
    return ServiceReference(adopted<vexa_service_interface>(file_, "service", reference));
}

}  // namespace VexaTouch::Host
