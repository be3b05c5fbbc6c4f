#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

namespace VexaTouch::Tools {

/// What a lot of latencies come to, in nanoseconds. A percentile is the smallest sample that at
/// least so many per cent of the samples do not exceed: exact below 2,048 ns, above that at most a
/// thousandth too large, and never above `most`, which is exact. All are 0 when there is no sample.
struct LatencySummary {
    std::size_t samples = 0;
    std::uint64_t p50 = 0;
    std::uint64_t p90 = 0;
    std::uint64_t p99 = 0;
    std::uint64_t p999 = 0;
    std::uint64_t most = 0;

    static LatencySummary of(std::span<const std::uint64_t> latencies);

    friend bool operator==(const LatencySummary&, const LatencySummary&) = default;
};

}  // namespace VexaTouch::Tools
