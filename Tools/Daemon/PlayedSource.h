#pragma once

#include "Tools/Daemon/DeviceSource.h"
#include "Tools/ObservedDevice.h"

#include <memory>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

/// A surface that is this device, and takes the settings that come with it. `name` is what it is
/// called where nothing else names it; `moreHooks` are those of the device that are not the
/// setter's.
PluggedSurface surfaceOf(std::string name, std::shared_ptr<ObservedDevice> device,
                         DeviceHooks moreHooks = {});

/// Made-up surfaces that are plugged in from the beginning to the end.
class PlayedSource final : public DeviceSource {
public:
    void add(std::string name, std::shared_ptr<ObservedDevice> device);

    [[nodiscard]] int descriptor() const noexcept override { return -1; }
    [[nodiscard]] std::vector<PlugChange> takeChanges() override;

private:
    std::vector<PlugChange> changes_;
    int last_ = 0;
};

}  // namespace VexaTouch::Tools::Daemon
