#pragma once

#include <cstdint>
#include <optional>

namespace VexaTouch::Tools {

/// The most memory that this process ever had in use, in bytes; nothing where the system does not
/// say.
std::optional<std::uint64_t> peakMemoryBytes();

}  // namespace VexaTouch::Tools
