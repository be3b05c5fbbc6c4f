#include "Tools/Daemon/ManagerObject.h"

#include "Tools/Daemon/BusNames.h"
#include "VexaVersion.h"

#include <systemd/sd-bus.h>

#include <string_view>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

int listDevices(sd_bus_message* call, void* context, sd_bus_error* /*error*/) {
    return Bus::serve(call, [context](BusMessage message) {
        auto& object = *static_cast<ManagerObject*>(context);
        object.admit(message);
        object.listDevices(message);
    });
}

int readProperty(sd_bus* /*bus*/, const char* /*path*/, const char* /*interface*/,
                 const char* property, sd_bus_message* reply, void* /*context*/,
                 sd_bus_error* /*error*/) {
    return Bus::writeProperty(reply, [property](BusMessage& answer) {
        if (std::string_view(property) == "ApiVersion") {
            answer.number32(BusNames::kApiVersion);
        } else {
            answer.string(versionText);
        }
    });
}

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wpedantic"
#pragma GCC diagnostic ignored "-Wmissing-field-initializers"
const sd_bus_vtable kTable[] = {
    SD_BUS_VTABLE_START(0),
    SD_BUS_PROPERTY("ApiVersion", "u", readProperty, 0, SD_BUS_VTABLE_PROPERTY_CONST),
    SD_BUS_PROPERTY("Version", "s", readProperty, 0, SD_BUS_VTABLE_PROPERTY_CONST),
    SD_BUS_METHOD_WITH_ARGS("ListDevices", SD_BUS_NO_ARGS, SD_BUS_RESULT("ao", paths), listDevices,
                            SD_BUS_VTABLE_UNPRIVILEGED),
    SD_BUS_SIGNAL_WITH_ARGS("DeviceAdded", SD_BUS_ARGS("o", path), 0),
    SD_BUS_SIGNAL_WITH_ARGS("DeviceRemoved", SD_BUS_ARGS("o", path), 0),
    SD_BUS_VTABLE_END,
};
#pragma GCC diagnostic pop

}  // namespace

ManagerObject::ManagerObject(Bus& bus, CallerRights& rights,
                             std::function<std::vector<std::string>()> paths)
    : bus_(bus),
      rights_(rights),
      paths_(std::move(paths)),
      objects_(bus.addObjectManager(BusNames::kManagerPath)),
      slot_(bus.addObject(BusNames::kManagerPath, BusNames::kManager, kTable, this)) {}

void ManagerObject::announceAdded(const std::string& path) {
    bus_.announceAdded(path, BusNames::kDevice);
    BusMessage signal = bus_.signal(BusNames::kManagerPath, BusNames::kManager, "DeviceAdded");
    signal.objectPath(path);
    static_cast<void>(bus_.send(signal));
}

void ManagerObject::announceRemoved(const std::string& path) {
    bus_.announceRemoved(path, BusNames::kDevice);
    BusMessage signal = bus_.signal(BusNames::kManagerPath, BusNames::kManager, "DeviceRemoved");
    signal.objectPath(path);
    static_cast<void>(bus_.send(signal));
}

void ManagerObject::listDevices(const BusMessage& call) {
    rights_.demand(call, Right::Watch, [this, call](const Caller&) {
        Bus::reply(call, [this](BusMessage& reply) {
            reply.open('a', "o");
            for (const std::string& path : paths_()) {
                reply.objectPath(path);
            }
            reply.close();
        });
    });
}

}  // namespace VexaTouch::Tools::Daemon
