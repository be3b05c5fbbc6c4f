#include "Tools/Daemon/PlayedSource.h"

#include <cstdint>
#include <utility>

namespace VexaTouch::Tools::Daemon {

void PlayedSource::add(std::string name, std::shared_ptr<ObservedDevice> device) {
    PluggedSurface surface;
    surface.id = std::to_string(++last_);
    surface.physicalPath = surface.id;
    surface.name = std::move(name);
    surface.vendor = static_cast<std::uint16_t>(device->property("VendorID").toUnsigned64());
    surface.product = static_cast<std::uint16_t>(device->property("ProductID").toUnsigned64());
    if (const auto serial = device->property("SerialNumber").asString()) {
        surface.serial = *serial;
    }
    surface.useSetter = [device](PluggedSurface::Setter set) {
        DeviceHooks hooks;
        hooks.onStateFrame = std::move(set);
        device->setHooks(std::move(hooks));
    };
    surface.open = [device = std::move(device)] { return device; };
    changes_.push_back({.added = true, .surface = std::move(surface)});
}

std::vector<PlugChange> PlayedSource::takeChanges() {
    return std::exchange(changes_, {});
}

}  // namespace VexaTouch::Tools::Daemon
