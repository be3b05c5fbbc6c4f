#include "Tools/Daemon/PlayedSource.h"

#include <cstdint>
#include <utility>

namespace VexaTouch::Tools::Daemon {

PluggedSurface surfaceOf(std::string name, std::shared_ptr<ObservedDevice> device,
                         DeviceHooks moreHooks) {
    const auto text = [&](const char* key) {
        const Vexa::PropertyValue value = device->property(key);
        return std::string(value.asString().value_or(""));
    };
    PluggedSurface surface;
    surface.name = std::move(name);
    surface.vendor = static_cast<std::uint16_t>(device->property("VendorID").toUnsigned64());
    surface.product = static_cast<std::uint16_t>(device->property("ProductID").toUnsigned64());
    surface.serial = text("SerialNumber");
    surface.physicalPath = text("PhysicalPath");
    surface.useSetter = [device, hooks = std::move(moreHooks)](PluggedSurface::Setter set) {
        DeviceHooks all = hooks;
        all.onStateFrame = std::move(set);
        device->setHooks(std::move(all));
    };
    surface.open = [device = std::move(device)] { return device; };
    return surface;
}

void PlayedSource::add(std::string name, std::shared_ptr<ObservedDevice> device) {
    PluggedSurface surface = surfaceOf(std::move(name), std::move(device));
    surface.id = std::to_string(++last_);
    surface.physicalPath = surface.id;
    changes_.push_back({.kind = PlugChange::Kind::Added, .surface = std::move(surface)});
}

std::vector<PlugChange> PlayedSource::takeChanges() {
    return std::exchange(changes_, {});
}

}  // namespace VexaTouch::Tools::Daemon
