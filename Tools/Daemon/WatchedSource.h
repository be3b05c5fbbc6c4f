#pragma once

#include "Host/SurfaceMatch.h"
#include "Host/SurfaceWatch.h"
#include "Tools/Daemon/DeviceSource.h"

#include <utility>
#include <vector>

namespace VexaTouch::Tools::Daemon {

/// The surfaces of this machine, as the kernel has them.
class WatchedSource final : public DeviceSource {
public:
    /// Throws HostFailure.
    explicit WatchedSource(Host::SurfaceMatch match) : watch_(std::move(match)) {}

    [[nodiscard]] int descriptor() const noexcept override { return watch_.descriptor(); }
    [[nodiscard]] std::vector<PlugChange> takeChanges() override;

private:
    Host::SurfaceWatch watch_;
};

}  // namespace VexaTouch::Tools::Daemon
