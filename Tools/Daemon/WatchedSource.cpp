#include "Tools/Daemon/WatchedSource.h"

#include "Tools/HidrawSource.h"

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
        return std::make_shared<HidrawSource>(node, sysPath);
    };
    return surface;
}

PlugChange::Kind kindOf(Host::SurfaceChange::Kind kind) {
    switch (kind) {
        case Host::SurfaceChange::Kind::Added:
            return PlugChange::Kind::Added;
        case Host::SurfaceChange::Kind::Removed:
            return PlugChange::Kind::Removed;
        case Host::SurfaceChange::Kind::Changed:
            break;
    }
    return PlugChange::Kind::Changed;
}

}  // namespace

std::vector<PlugChange> WatchedSource::takeChanges() {
    std::vector<PlugChange> changes;
    for (const Host::SurfaceChange& change : watch_.takeChanges()) {
        changes.push_back({.kind = kindOf(change.kind), .surface = pluggedSurface(change.surface)});
    }
    return changes;
}

}  // namespace VexaTouch::Tools::Daemon
