#pragma once

#include "Tools/Daemon/Bus.h"
#include "Tools/Daemon/CallerRights.h"

#include <functional>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

/// The daemon on the bus: org.vexatouch.Touch1.Manager, and the object manager of all below it. On
/// the bus's thread.
class ManagerObject {
public:
    /// `paths` gives those of the devices. Everything given must outlive it.
    ManagerObject(Bus& bus, CallerRights& rights, std::function<std::vector<std::string>()> paths);
    ~ManagerObject() = default;
    ManagerObject(const ManagerObject&) = delete;
    ManagerObject(ManagerObject&&) = delete;
    ManagerObject& operator=(const ManagerObject&) = delete;
    ManagerObject& operator=(ManagerObject&&) = delete;

    /// While the device's object is on the bus.
    void announceAdded(const std::string& path);
    void announceRemoved(const std::string& path);

    /// Comes before each method. Throws BusError (Busy).
    void admit(BusMessage& call) { rights_.admit(call); }
    // A method of the interface.
    void listDevices(const BusMessage& call);

private:
    Bus& bus_;
    CallerRights& rights_;
    std::function<std::vector<std::string>()> paths_;
    BusSlot objects_;
    BusSlot slot_;
};

}  // namespace VexaTouch::Tools::Daemon
