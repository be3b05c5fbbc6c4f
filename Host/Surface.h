#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace VexaTouch::Host {

/// A HID device as the system lists it, without having been opened.
struct Surface {
    std::string node = {};  ///< "/dev/hidraw0"
    /// "/sys/devices/.../hidraw/hidraw0", never given to a second device.
    std::string sysPath = {};
    std::string name = {};
    std::string physicalPath = {};
    std::string serial = {};  ///< empty when it has none
    std::uint16_t vendor = 0;
    std::uint16_t product = 0;
    std::uint32_t bus = 0;  ///< 3 USB, 5 Bluetooth, 6 virtual
    std::vector<std::uint8_t> reportDescriptor = {};

    friend bool operator==(const Surface&, const Surface&) = default;
};

}  // namespace VexaTouch::Host
