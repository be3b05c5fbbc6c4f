#include "Tools/ReportTap.h"

#include <algorithm>

namespace VexaTouch::Tools {

ReportTap::ReportTap() : slots_(std::make_unique<std::array<Slot, kCapacity>>()) {}

void ReportTap::put(std::span<const std::uint8_t> report) noexcept {
    const std::uint64_t next = put_.load(std::memory_order_relaxed);
    if (next - taken_.load(std::memory_order_acquire) >= kCapacity) {
        lost_.fetch_add(1);
        return;
    }
    Slot& slot = (*slots_)[next % kCapacity];
    slot.length = std::min(report.size(), kLongestReport);
    std::copy_n(report.begin(), slot.length, slot.bytes.begin());
    put_.store(next + 1, std::memory_order_release);
}

std::size_t ReportTap::drain(
    const std::function<void(std::span<const std::uint8_t> report)>& take) {
    const std::uint64_t first = taken_.load(std::memory_order_relaxed);
    const std::uint64_t end = put_.load(std::memory_order_acquire);
    for (std::uint64_t next = first; next < end; ++next) {
        const Slot& slot = (*slots_)[next % kCapacity];
        take(std::span(slot.bytes).first(slot.length));
        taken_.store(next + 1, std::memory_order_release);
    }
    return static_cast<std::size_t>(end - first);
}

}  // namespace VexaTouch::Tools
