#pragma once

#include <array>
#include <cstdint>
#include <string_view>

/// How the surface presents itself as a HID device.
namespace VexaTouch::Tools {

// Identifiers of our own choice: "VX" and "TT" in ASCII. They are assigned to nobody, so the device
// is announced on the virtual bus, where no vendor's driver looks for its hardware.
inline constexpr std::uint16_t kHidBusVirtual = 0x06;
inline constexpr std::uint16_t kHidVendorId = 0x5658;
inline constexpr std::uint16_t kHidProductId = 0x5454;
inline constexpr std::string_view kHidDeviceName = "Vexa Touch";

/// The report descriptor: one vendor-defined application with the two input and the three feature
/// reports, field by field. The kernel accepts it and makes a hidraw device of it, nothing else.
inline constexpr std::array<std::uint8_t, 105> kHidReportDescriptor = {
    0x06, 0x60, 0xFF,                    // Usage Page (vendor-defined 0xFF60)
    0x09, 0x01,                          // Usage (1: touch surface)
    0xA1, 0x01,                          // Collection (Application)
    0x15, 0x00,                          //   Logical Minimum (0)
    0x85, 0x01,                          //   Report ID (1): touch image
    0x27, 0xFF, 0xFF, 0xFF, 0xFF,        //     Logical Maximum (4294967295)
    0x75, 0x20, 0x95, 0x02,              //     Report Size (32), Report Count (2)
    0x09, 0x10, 0x09, 0x11, 0x81, 0x02,  //     frame number, milliseconds: Input (Variable)
    0x26, 0xFF, 0x00,                    //     Logical Maximum (255)
    0x75, 0x08, 0x95, 0x04,              //     Report Size (8), Report Count (4)
    0x09, 0x12, 0x81, 0x02,              //     reserved: Input (Variable)
    0x27, 0xFF, 0xFF, 0x00, 0x00,        //     Logical Maximum (65535)
    0x75, 0x10, 0x95, 0x0F,              //     Report Size (16), Report Count (15)
    0x09, 0x13, 0x81, 0x02,              //     unsigned pixels: Input (Variable)
    0x16, 0x00, 0x80, 0x26, 0xFF, 0x7F,  //     Logical Minimum (-32768), Maximum (32767)
    0x09, 0x14, 0x81, 0x02,              //     signed pixels: Input (Variable)
    0x15, 0x00, 0x26, 0xFF, 0x00,        //   Logical Minimum (0), Maximum (255)
    0x85, 0x02,                          //   Report ID (2): firmware event
    0x75, 0x08, 0x95, 0x09,              //     Report Size (8), Report Count (9)
    0x09, 0x20, 0x81, 0x02,              //     code and data: Input (Variable)
    0x85, 0x04,                          //   Report ID (4): firmware version
    0x95, 0x02, 0x09, 0x30, 0xB1, 0x02,  //     Report Count (2): Feature (Variable)
    0x27, 0xFF, 0xFF, 0xFF, 0xFF,        //   Logical Maximum (4294967295)
    0x75, 0x20, 0x95, 0x01,              //   Report Size (32), Report Count (1)
    0x85, 0x1F,                          //   Report ID (31): factory-reset hold duration
    0x09, 0x31, 0xB1, 0x02,              //     Feature (Variable)
    0x85, 0x3F,                          //   Report ID (63): critical errors
    0x09, 0x32, 0xB1, 0x02,              //     Feature (Variable)
    0xC0,                                // End Collection
};

}  // namespace VexaTouch::Tools
