#pragma once

#include <cstddef>
#include <filesystem>
#include <iterator>

namespace VexaTouch::Testing {

/// How many descriptors this process has open, the one that it counts them through included.
inline std::size_t descriptorCount() {
    const std::filesystem::directory_iterator descriptors("/proc/self/fd");
    return static_cast<std::size_t>(std::distance(begin(descriptors), end(descriptors)));
}

}  // namespace VexaTouch::Testing
