#pragma once

#include "Tools/Daemon/Bus.h"
#include "Tools/Daemon/CallerRights.h"
#include "Tools/Daemon/RecordStreams.h"
#include "Tools/Daemon/SurfaceInstance.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

namespace VexaTouch::Tools::Daemon {

/// One surface on the bus: org.vexatouch.Touch1.Device. On the bus's thread.
class DeviceObject {
public:
    /// Everything given must outlive it.
    DeviceObject(Bus& bus, CallerRights& rights, RecordStreams& streams, SurfaceInstance& instance,
                 const std::string& path);
    ~DeviceObject() = default;
    DeviceObject(const DeviceObject&) = delete;
    DeviceObject(DeviceObject&&) = delete;
    DeviceObject& operator=(const DeviceObject&) = delete;
    DeviceObject& operator=(DeviceObject&&) = delete;

    /// Takes the object from the bus; calls that wait are still answered.
    void withdraw();

    [[nodiscard]] const std::string& path() const noexcept { return path_; }
    [[nodiscard]] const SurfaceInstance& instance() const noexcept { return instance_; }

    /// Tells the bus that the state is another one.
    void announceState();
    void announceGestures(const Gestures& gestures);

    /// Comes before each method. Throws BusError (Busy).
    void admit(BusMessage& call) { rights_.admit(call); }
    // Methods of the interface; each answers the call now or later.
    void get(BusMessage call);
    void set(BusMessage call);
    void getRecording(const BusMessage& call);
    void recordStream(const BusMessage& call);
    void reset(const BusMessage& call);
    void getStatistics(const BusMessage& call);

private:
    /// Calls `granted` if the caller has the right and this object is still on the bus then.
    void demand(const BusMessage& call, Right right,
                std::function<void(const Caller& caller)> granted);
    [[nodiscard]] Vexa::PropertyValue statistics(
        const Vexa::PropertyValue::Dictionary& counters) const;
    void sayLost();

    Bus& bus_;
    CallerRights& rights_;
    RecordStreams& streams_;
    SurfaceInstance& instance_;
    std::string path_;
    std::uint64_t dropped_ = 0;  // gestures that did not go to the bus
    std::uint64_t untold_ = 0;   // of those, what was not told yet
    std::shared_ptr<bool> isOnBus_;
    BusSlot slot_;
};

}  // namespace VexaTouch::Tools::Daemon
