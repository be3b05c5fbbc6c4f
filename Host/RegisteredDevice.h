#pragma once

#include "Platform/DeviceBackend.h"

#include <memory>

namespace VexaTouch::Host {

/// Registers a device's back-end for as long as the result lives. Throws HostFailure.
[[nodiscard]] Vexa::DeviceRegistration registeredDevice(
    std::shared_ptr<Vexa::DeviceBackend> backend);

}  // namespace VexaTouch::Host
