#include "Tools/PeakMemory.h"

#include <charconv>
#include <fstream>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

std::optional<std::uint64_t> peakMemoryBytes() {
    // Not getrusage: that counts what the process had before it became this program.
    constexpr std::string_view name = "VmHWM:";
    constexpr std::uint64_t bytesPerKb = 1024;
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);) {
        if (line.starts_with(name)) {
            const std::size_t digits = line.find_first_of("0123456789");
            std::uint64_t kb = 0;
            if (digits != std::string::npos &&
                std::from_chars(line.data() + digits, line.data() + line.size(), kb).ec ==
                    std::errc()) {
                return kb * bytesPerKb;
            }
        }
    }
    return std::nullopt;
}

}  // namespace VexaTouch::Tools
