#include "Tools/LatencySummary.h"

#include <boost/histogram/axis/traits.hpp>
#include <boost/histogram/make_histogram.hpp>
#include <boost/histogram/storage_adaptor.hpp>

#include <algorithm>
#include <bit>
#include <tuple>

namespace VexaTouch::Tools {
namespace {

/// Each power of two is cut into 1,024 bins of equal width; below the first that needs it a bin is
/// one nanosecond. In integers throughout, so that the figures are the same everywhere.
class NanosecondAxis {
public:
    // The names that the histogram asks for.
    [[nodiscard]] static int index(std::uint64_t ns) noexcept {
        const int shift = shiftOf(ns);
        return shift * kBinsOfAPower + static_cast<int>(ns >> static_cast<unsigned>(shift));
    }
    [[nodiscard]] static int size() noexcept { return index(UINT64_MAX) + 1; }

    /// The longest time that falls into the bin.
    [[nodiscard]] static std::uint64_t longest(int bin) noexcept {
        const int shift = std::max(bin / kBinsOfAPower - 1, 0);
        const auto width = std::uint64_t{1} << static_cast<unsigned>(shift);
        return static_cast<std::uint64_t>(bin - shift * kBinsOfAPower) * width + (width - 1);
    }

private:
    static constexpr int kBinsOfAPower = 1024;

    [[nodiscard]] static int shiftOf(std::uint64_t ns) noexcept {
        return std::max(static_cast<int>(std::bit_width(ns)) - 11, 0);
    }
};

}  // namespace

LatencySummary LatencySummary::of(std::span<const std::uint64_t> latencies) {
    auto histogram = boost::histogram::make_histogram_with(
        boost::histogram::dense_storage<std::uint64_t>(), NanosecondAxis());
    LatencySummary summary;
    for (const std::uint64_t latency : latencies) {
        histogram(latency);
        summary.most = std::max(summary.most, latency);
    }
    summary.samples = latencies.size();

    const auto at = [&](std::uint64_t perMille) -> std::uint64_t {
        const std::uint64_t wanted = (summary.samples * perMille + 999) / 1000;
        std::uint64_t counted = 0;
        for (int bin = 0; bin < NanosecondAxis::size(); ++bin) {
            counted += histogram.at(bin);
            if (counted >= wanted) {
                return std::min(NanosecondAxis::longest(bin), summary.most);
            }
        }
        return summary.most;
    };
    summary.p50 = at(500);
    summary.p90 = at(900);
    summary.p99 = at(990);
    summary.p999 = at(999);
    return summary;
}

}  // namespace VexaTouch::Tools
