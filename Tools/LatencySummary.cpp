#include "Tools/LatencySummary.h"

#include <algorithm>

namespace VexaTouch::Tools {

LatencySummary LatencySummary::of(std::vector<std::uint64_t> latencies) {
    if (latencies.empty()) {
        return {};
    }
    std::ranges::sort(latencies);
    const std::size_t count = latencies.size();
    const auto atPerMille = [&](std::size_t perMille) {
        return latencies[(count * perMille + 999) / 1000 - 1];
    };
    return {.samples = count,
            .p50 = atPerMille(500),
            .p90 = atPerMille(900),
            .p99 = atPerMille(990),
            .p999 = atPerMille(999),
            .most = latencies.back()};
}

}  // namespace VexaTouch::Tools
