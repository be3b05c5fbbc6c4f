#pragma once

#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// Whether the service asks the device for it, with a feature report, each time that it is read:
/// that it has no value then says something of the device and not of the key.
bool isReadFromDevice(std::string_view key) noexcept;

/// What a user is told of a property without a value, the key first.
std::string missingValueText(std::string_view key);

}  // namespace VexaTouch::Tools
