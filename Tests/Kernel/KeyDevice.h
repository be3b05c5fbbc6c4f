#pragma once

#include "Tools/FileDescriptor.h"

#include <linux/input.h>

#include <chrono>
#include <string>

namespace VexaTouch::Testing {

/// An input device of the kernel, as a program reads it.
class KeyDevice {
public:
    /// Waits for the device of that name, which must have a node that may be read. Throws
    /// std::runtime_error after the limit.
    KeyDevice(const std::string& name, std::chrono::milliseconds limit);

    /// Blocks for the next event, with the time of the monotonic clock. False when the device is
    /// gone. Throws std::system_error when it cannot be read.
    [[nodiscard]] bool read(input_event& event) const;

    [[nodiscard]] const std::string& node() const noexcept { return node_; }

private:
    std::string node_;
    Tools::FileDescriptor descriptor_;
};

}  // namespace VexaTouch::Testing
