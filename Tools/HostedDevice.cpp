#include "Tools/HostedDevice.h"

#include "Host/RegisteredDevice.h"
#include "Tools/Failure.h"

#include <string>
#include <utility>

namespace VexaTouch::Tools {

HostedDevice::HostedDevice(std::shared_ptr<ObservedDevice> device,
                           Host::HostSession::EventSink sink, std::chrono::nanoseconds patience)
    : device_(std::move(device)),
      patience_(patience),
      registration_(Host::registeredDevice(device_)),
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

void HostedDevice::waitUntilPlayed() {
    ReportWatch watch(*device_, patience_);
    while (!finished_.try_acquire_for(watch.interval())) {
        if (watch.look()) {
            throw Failure(ReportWatch::kFault);
        }
    }
}

}  // namespace VexaTouch::Tools
