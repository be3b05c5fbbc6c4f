#pragma once

#include "Tools/ForwardingDevice.h"
#include "Tools/ObservedDevice.h"

namespace VexaTouch::Tools::Daemon {

/// A device that can be unplugged: its service can be asked whether it still reads it.
class LiveDevice final : public ForwardingDevice {
public:
    using ForwardingDevice::ForwardingDevice;

    /// The library asks no device that was read to its end.
    Vexa::PropertyValue property(const Vexa::PropertyValue& key) noexcept override {
        return key.asString() == ObservedDevice::kReadsOnKey ? Vexa::PropertyValue(true)
                                                             : ForwardingDevice::property(key);
    }
};

}  // namespace VexaTouch::Tools::Daemon
