#pragma once

#include <atomic>
#include <cstdint>
#include <optional>
#include <span>

namespace VexaTouch::Tools {

/// Watches the frame numbers of a device's images and counts what is missing between them: a reader
/// that is too slow loses reports without being told, since the kernel keeps only 64 for it.
///
/// A number that goes back, as after a reset of the firmware, or far ahead is a gap (and the
/// service counts it) in which no frame can be said to be lost.
class FrameGaps {
public:
    /// Frames that may be missing at one place, nearly three hours of them; beyond that the numbers
    /// have jumped and nothing was lost.
    static constexpr std::uint32_t kMostLost = 1'000'000;

    /// The next report of the device; what is no image is passed over. Whether there is a gap
    /// before it. One thread at a time; never blocks or allocates.
    bool see(std::span<const std::uint8_t> report) noexcept;

    // Any thread. Ask for the gaps first: what was lost in them is counted by then.
    [[nodiscard]] std::uint64_t gaps() const noexcept { return gaps_.load(); }
    [[nodiscard]] std::uint64_t framesLost() const noexcept { return framesLost_.load(); }

private:
    std::optional<std::uint32_t> last_;
    std::atomic<std::uint64_t> gaps_{0};
    std::atomic<std::uint64_t> framesLost_{0};
};

}  // namespace VexaTouch::Tools
