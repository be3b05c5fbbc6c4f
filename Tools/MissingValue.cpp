#include "Tools/MissingValue.h"

#include <algorithm>
#include <array>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<std::string_view, 3> kReadFromDevice = {
    "FirmwareVersion", "FactoryResetHoldDuration", "CriticalErrors"};

}  // namespace

bool isReadFromDevice(std::string_view key) noexcept {
    return std::ranges::find(kReadFromDevice, key) != kReadFromDevice.end();
}

std::string missingValueText(std::string_view key) {
    return std::string(key) +
           (isReadFromDevice(key)
                ? ": the device gives no value: it refuses, does not answer in time or answers "
                  "with too few bytes; the log says which"
                : ": there is no such property, or it has no value");
}

}  // namespace VexaTouch::Tools
