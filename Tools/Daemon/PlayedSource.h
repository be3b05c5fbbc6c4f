#pragma once

#include "Tools/Daemon/DeviceSource.h"
#include "Tools/ObservedDevice.h"

#include <memory>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

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
