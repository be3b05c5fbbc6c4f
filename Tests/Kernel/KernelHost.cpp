// usage: KernelHost NODE
//
// A host at its smallest: the service on a hidraw device, an event a line as JSON, keys on the
// virtual keyboard; until the device is unplugged.

#include "Host/HostSession.h"
#include "Host/MediaKeys.h"
#include "Host/PluginLibrary.h"
#include "Host/VirtualKeyboard.h"
#include "Platform/HidrawDevice.h"
#include "Platform/HostClock.h"
#include "Tools/DeliveredEvent.h"

#include <poll.h>

#include <exception>
#include <iostream>
#include <memory>

namespace {

void host(const std::string& node) {
    using namespace VexaTouch;
    const Host::KeyMap map;
    Host::SharedKeyboard keyboard(std::make_unique<Host::VirtualKeyboard>(map.keys()));
    Host::MediaKeys keys(map, keyboard);
    const auto device = std::make_shared<Vexa::HidrawDevice>(node);
    const Vexa::DeviceRegistration registration(device);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    Host::HostSession session(library, registration.service(), [&](const Vexa::HidEvent& event) {
        keys.handle(event);
        std::cout << Tools::deliveredEventJson(
                         Tools::DeliveredEvent::of(event, Vexa::HostClock::system().now()))
                  << std::endl;
    });
    session.begin();
    pollfd plug{.fd = device->hangUpDescriptor(), .events = 0, .revents = 0};
    poll(&plug, 1, -1);
    session.end();
    keys.releaseAll();
}

}  // namespace

int main(int count, char** arguments) {
    try {
        host(count == 2 ? arguments[1] : "");
        return 0;
    } catch (const std::exception& fault) {
        std::cerr << "KernelHost: " << fault.what() << '\n';
        return 1;
    }
}
