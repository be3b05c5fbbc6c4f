#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace VexaTouch::Tools {

/// What a lot of latencies come to, in nanoseconds. Exact: a percentile is the smallest sample that
/// at least so many per cent of the samples do not exceed; all are 0 when there is none.
struct LatencySummary {
    std::size_t samples = 0;
    std::uint64_t p50 = 0;
    std::uint64_t p90 = 0;
    std::uint64_t p99 = 0;
    std::uint64_t p999 = 0;
    std::uint64_t most = 0;

    static LatencySummary of(std::vector<std::uint64_t> latencies);

    friend bool operator==(const LatencySummary&, const LatencySummary&) = default;
};

}  // namespace VexaTouch::Tools
