#pragma once

#include "Host/HostSession.h"
#include "Tools/ObservedDevice.h"

#include <chrono>
#include <optional>

namespace VexaTouch::Tools {

/// Waits for the reports that a device sent before it was unplugged: the kernel keeps them readable
/// until they were read, and closing the device would throw them away. One thread.
class LastReports {
public:
    using Time = std::chrono::steady_clock::time_point;
    /// How often to look.
    static constexpr std::chrono::milliseconds kInterval{1};

    /// `patience` is how long a service that is stuck is waited for. Both must outlive this.
    LastReports(const ObservedDevice& device, const Host::HostSession& session,
                std::chrono::nanoseconds patience) noexcept
        : device_(device), session_(session), patience_(patience) {}

    /// Whether there is nothing more to wait for: the service, whose device was unplugged, has read
    /// to the device's end and handled everything, or the patience since the first look is over.
    [[nodiscard]] bool areTaken();

private:
    const ObservedDevice& device_;
    const Host::HostSession& session_;
    const std::chrono::nanoseconds patience_;
    std::optional<Time> first_;
};

}  // namespace VexaTouch::Tools
