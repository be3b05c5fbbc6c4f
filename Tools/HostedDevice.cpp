#include "Tools/HostedDevice.h"

#include <string>
#include <utility>

namespace VexaTouch::Tools {

HostedDevice::HostedDevice(std::shared_ptr<ObservedDevice> device,
                           Host::HostSession::EventSink sink)
    : device_(std::move(device)),
      registration_(device_),
      library_(Host::PluginLibrary::loadDefault()),
      session_(library_, registration_.service(), std::move(sink)) {}

void HostedDevice::begin(DeviceHooks hooks) {
    hooks.onStateFrame = [this](const std::string& key, const Vexa::PropertyValue& value) {
        session_.setProperty("Pipeline." + key, value);
    };
    hooks.onFinished = [this] { finished_.release(); };
    device_->setHooks(std::move(hooks));
    static_cast<void>(finished_.try_acquire());  // left over from the last time
    session_.begin();
}

}  // namespace VexaTouch::Tools
