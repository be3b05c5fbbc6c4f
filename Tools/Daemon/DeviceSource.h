#pragma once

#include "Platform/DeviceBackend.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace VexaTouch::Tools::Daemon {

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

    /// Whether the other one is this very device, plugged in another time: by its serial number if
    /// it has one, else by the place where it is plugged in.
    [[nodiscard]] std::string key() const {
        return std::to_string(vendor) + ':' + std::to_string(product) + ':' +
               (serial.empty() ? "at " + physicalPath : "no " + serial);
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
