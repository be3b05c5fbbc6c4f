#include "Host/RegisteredDevice.h"

#include "Host/HostFailure.h"

#include <new>
#include <utility>

namespace VexaTouch::Host {

Vexa::DeviceRegistration registeredDevice(std::shared_ptr<Vexa::DeviceBackend> backend) {
    try {
        return Vexa::DeviceRegistration(std::move(backend));
    } catch (const std::bad_alloc&) {
        throw HostFailure("the device cannot be registered: no memory for its service handle");
    }
}

}  // namespace VexaTouch::Host
