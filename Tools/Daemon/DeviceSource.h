#pragma once

#include "Platform/DeviceBackend.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

/// What tells one surface from another, over the time of its being plugged in.
struct SurfaceIdentity {
    std::uint16_t vendor = 0;
    std::uint16_t product = 0;
    std::string serial;  ///< empty when it has none
    std::string place;   ///< where it is plugged in

    /// Whether both have a serial number and it is the same.
    [[nodiscard]] bool hasNumberOf(const SurfaceIdentity& other) const {
        return vendor == other.vendor && product == other.product && !serial.empty() &&
               serial == other.serial;
    }
    friend bool operator==(const SurfaceIdentity&, const SurfaceIdentity&) = default;
};

/// A surface that is plugged in.
struct PluggedSurface {
    std::string id;    ///< for its source; no two that are plugged in at once have the same
    std::string node;  ///< "/dev/hidraw0"; empty when there is none
    std::string name;
    std::string serial;
    std::string physicalPath;
    std::uint16_t vendor = 0;
    std::uint16_t product = 0;
    /// Makes the back-end. Called once, on a thread that may wait. Throws std::exception.
    std::function<std::shared_ptr<Vexa::DeviceBackend>()> open;
    /// Writes a setting, by the key of a pipeline. Any thread, while the device is open.
    using Setter = std::function<void(const std::string& key, const Vexa::PropertyValue& value)>;
    /// Is given it before the device is opened, for surfaces that bring settings with them. May be
    /// empty.
    std::function<void(Setter set)> useSetter;

    [[nodiscard]] SurfaceIdentity identity() const {
        return {.vendor = vendor, .product = product, .serial = serial, .place = physicalPath};
    }
};

struct PlugChange {
    enum class Kind : std::uint8_t {
        Added,
        Removed,
        Changed,  ///< there is news of one that is there: what failed before may go now
    };

    Kind kind = Kind::Added;
    PluggedSurface surface;  ///< of one that was removed only the id counts
};

/// Where surfaces come from. One thread.
class DeviceSource {
public:
    DeviceSource() = default;
    virtual ~DeviceSource() = default;
    DeviceSource(const DeviceSource&) = delete;
    DeviceSource(DeviceSource&&) = delete;
    DeviceSource& operator=(const DeviceSource&) = delete;
    DeviceSource& operator=(DeviceSource&&) = delete;

    /// Readable when there are changes; -1 when there never are any but the first.
    [[nodiscard]] virtual int descriptor() const noexcept = 0;
    /// What has changed since the last time, the first time all that is there. Never blocks.
    [[nodiscard]] virtual std::vector<PlugChange> takeChanges() = 0;
};

}  // namespace VexaTouch::Tools::Daemon
