#include "Tools/Daemon/WatchedSource.h"

#include "Platform/HidrawDevice.h"
#include "Tools/Daemon/LiveDevice.h"

#include <memory>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

PluggedSurface pluggedSurface(const Host::Surface& found) {
    PluggedSurface surface;
    surface.id = found.sysPath;
    surface.node = found.node;
    surface.name = found.name;
    surface.serial = found.serial;
    surface.physicalPath = found.physicalPath;
    surface.vendor = found.vendor;
    surface.product = found.product;
    surface.open = [node = found.node, sysPath = found.sysPath] {
        return std::make_shared<LiveDevice>(std::make_shared<Vexa::HidrawDevice>(node, sysPath));
    };
    return surface;
}

}  // namespace

std::vector<PlugChange> WatchedSource::takeChanges() {
    std::vector<PlugChange> changes;
    for (const Host::SurfaceChange& change : watch_.takeChanges()) {
        changes.push_back({.added = change.kind == Host::SurfaceChange::Kind::Added,
                           .surface = pluggedSurface(change.surface)});
    }
    return changes;
}

}  // namespace VexaTouch::Tools::Daemon
