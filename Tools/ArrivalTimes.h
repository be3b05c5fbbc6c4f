#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <optional>

namespace VexaTouch::Tools {

/// When the newest reports were read, so that an event, which only knows when the service took up
/// its report, finds the moment at which that report came. A service handles its reports one after
/// the other: an event's is the last that came until then.
///
/// Neither side blocks, allocates or locks. One thread puts, one asks.
class ArrivalTimes {
public:
    /// More than can have come while an event waits for its callback.
    static constexpr std::size_t kCapacity = 4096;

    /// The input thread: a report was read at this host tick, not before the one put last.
    void put(std::uint64_t ticks) noexcept {
        const std::uint64_t count = count_.load(std::memory_order_relaxed);
        ticks_[count % kCapacity].store(ticks, std::memory_order_release);
        count_.store(count + 1, std::memory_order_release);
    }

    /// The latest that is not after `ticks`; none when it is forgotten or there was none.
    [[nodiscard]] std::optional<std::uint64_t> latestUntil(std::uint64_t ticks) const noexcept {
        const std::uint64_t count = count_.load(std::memory_order_acquire);
        for (std::uint64_t back = 1; back <= kCapacity && back <= count; ++back) {
            // One that is overwritten meanwhile has become later, as have all before it.
            const std::uint64_t time =
                ticks_[(count - back) % kCapacity].load(std::memory_order_acquire);
            if (time <= ticks) {
                return time;
            }
        }
        return std::nullopt;
    }

private:
    std::array<std::atomic<std::uint64_t>, kCapacity> ticks_{};
    std::atomic<std::uint64_t> count_{0};
};

}  // namespace VexaTouch::Tools
