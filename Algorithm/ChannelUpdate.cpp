#include "Algorithm/ChannelUpdate.h"

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstring>
#include <type_traits>

namespace VexaTouch {

namespace {

using Totals = ChannelUpdate::Totals;
/// One member of four pixels, or one row of cells of one pixel.
using Columns = std::array<FloatLanes, 4>;

// A pixel is two rows of four 32-bit cells. Four pixels' rows, transposed, are eight columns with
// one member of the four pixels each.
static_assert(std::is_trivially_copyable_v<Pixel> && std::is_standard_layout_v<Pixel>);
static_assert(sizeof(Pixel) == 32 && std::endian::native == std::endian::little);
static_assert(offsetof(Pixel, _value) == 0 && offsetof(Pixel, _normalizationFactor) == 4);
static_assert(offsetof(Pixel, _progress) == 8 && offsetof(Pixel, _peakProgress) == 12);
static_assert(offsetof(Pixel, _valleyProgress) == 16 && offsetof(Pixel, _isActive) == 20);
static_assert(offsetof(Pixel, _isAboveNoise) == 21 && offsetof(Pixel, _wasAboveNoise) == 22);
static_assert(offsetof(Pixel, _wasActive) == 23 && offsetof(Pixel, _maxProgressAboveNoise) == 24);
static_assert(offsetof(Pixel, _index) == 28);

// The four flags share a cell.
constexpr std::int32_t kIsActive = 0x1;
constexpr std::int32_t kIsAboveNoise = 0x100;
constexpr std::int32_t kWasAboveNoise = 0x10000;
constexpr std::int32_t kWasActive = 0x1000000;

/// One cell row (0 or 1) of four pixels, as columns.
VEXA_LANES_INLINE Columns load(const std::array<Pixel*, 4>& pixels, std::size_t row) noexcept {
    Columns rows;
    for (std::size_t i = 0; i < 4; ++i) {
        std::memcpy(&rows[i],
                    reinterpret_cast<const std::byte*>(pixels[i]) + row * sizeof(FloatLanes),
                    sizeof(FloatLanes));
    }
    return transposed(rows);
}

VEXA_LANES_INLINE void store(const Columns& columns, const std::array<Pixel*, 4>& pixels,
                             std::size_t row) noexcept {
    const Columns rows = transposed(columns);
    for (std::size_t i = 0; i < 4; ++i) {
        std::memcpy(reinterpret_cast<std::byte*>(pixels[i]) + row * sizeof(FloatLanes), &rows[i],
                    sizeof(FloatLanes));
    }
}

/// The update of four pixels; gives their values. The steps are Pixel::updatePixelState's. Only
/// pixels whose lane in `valid` is all ones count in the totals.
VEXA_LANES_INLINE IntegerLanes updateFour(const std::array<Pixel*, 4>& pixels, IntegerLanes samples,
                                          FloatLanes activationThreshold, IntegerLanes valid,
                                          Totals& totals) noexcept {
    const Columns first =
        load(pixels, 0);  // _value, _normalizationFactor, _progress, _peakProgress
    const Columns second =
        load(pixels, 1);  // _valleyProgress, flags, _maxProgressAboveNoise, _index
    const FloatLanes gain = first[1];
    const FloatLanes oldPeak = first[3];
    const FloatLanes oldValley = second[0];
    const IntegerLanes oldFlags = std::bit_cast<IntegerLanes>(second[1]);
    const FloatLanes oldMaxProgress = second[2];

    const IntegerLanes value =
        __builtin_convertvector(__builtin_convertvector(samples, FloatLanes) * gain, IntegerLanes);
    const IntegerLanes wasActive = (oldFlags & allLanes(kIsActive)) != 0;
    const FloatLanes threshold = select(wasActive, oldPeak * allLanes(0.6F),
                                        largerOrOld(oldValley / allLanes(0.6F), allLanes(1.0F)));
    const FloatLanes progress = __builtin_convertvector(value, FloatLanes) / activationThreshold;
    const IntegerLanes active = progress > threshold;
    const IntegerLanes noisy = value > allLanes(kNoiseLevel);
    const FloatLanes peak = select(active, largerOrOld(progress, oldPeak), progress);
    const FloatLanes valley = select(active, progress, smallerOrOld(progress, oldValley));
    const FloatLanes maxProgress =
        select(noisy, largerOrOld(progress, oldMaxProgress), oldMaxProgress);
    const IntegerLanes flags = (oldFlags & allLanes(kWasAboveNoise | kWasActive)) |
                               (active & allLanes(kIsActive | kWasActive)) |
                               (noisy & allLanes(kIsAboveNoise | kWasAboveNoise));

    store({std::bit_cast<FloatLanes>(value), gain, progress, peak}, pixels, 0);
    store({valley, std::bit_cast<FloatLanes>(flags), maxProgress, second[3]}, pixels, 1);

    totals.active |= active & valid;
    totals.aboveNoise += noisy & valid;
    totals.neverActive +=
        ((flags & allLanes(kWasAboveNoise | kWasActive)) == allLanes(kWasAboveNoise)) & valid;
    const IntegerLanes counted = select(valid, value, allLanes(INT32_MIN));
    totals.largest = select(counted > totals.largest, counted, totals.largest);
    return value;
}

/// Updates `count` pixels, three more than a multiple of four, whose samples are `samples(first)`.
/// The last one comes twice in the last four, with the same result, and counts once.
template <std::size_t count, typename P, typename Samples>
VEXA_LANES_INLINE void updateAll(P* pixels, Samples samples, float activationThreshold,
                                 std::int32_t* values, Totals& totals) noexcept {
    static_assert(count % 4 == 3);
    const FloatLanes threshold = allLanes(activationThreshold);
    Totals sums = totals;
    for (std::size_t i = 0; i + 4 <= count; i += 4) {
        const IntegerLanes value =
            updateFour({&pixels[i], &pixels[i + 1], &pixels[i + 2], &pixels[i + 3]},
                       IntegerLanes{samples(i), samples(i + 1), samples(i + 2), samples(i + 3)},
                       threshold, IntegerLanes{-1, -1, -1, -1}, sums);
        std::memcpy(values + i, &value, sizeof value);
    }
    constexpr std::size_t rest = count - 3;
    const IntegerLanes value = updateFour(
        {&pixels[rest], &pixels[rest + 1], &pixels[rest + 2], &pixels[rest + 2]},
        IntegerLanes{samples(rest), samples(rest + 1), samples(rest + 2), samples(rest + 2)},
        threshold, IntegerLanes{-1, -1, -1, 0}, sums);
    std::memcpy(values + rest, &value, 3 * sizeof(std::int32_t));
    totals = sums;
}

}  // namespace

void ChannelUpdate::updatePixels(std::span<Pixel, kPixelCount> pixels,
                                 std::span<const std::int16_t, kPixelCount> samples) noexcept {
    const auto sample = [samples](std::size_t i) -> std::int32_t { return samples[i]; };
    updateAll<kPixelCount>(pixels.data(), sample, activationThreshold_, summary_.values.data(),
                           totals_);
}

void ChannelUpdate::updateVirtualPixels(
    std::span<VirtualPixel, kVirtualPixelCount> pixels,
    std::span<const std::int32_t, kVirtualPixelCount> sums,
    std::span<const std::int32_t, kVirtualPixelCount> maxPixelIndex) noexcept {
    // A strong group's sum deliberately wraps.
    const auto sample = [sums](std::size_t i) -> std::int32_t {
        return static_cast<std::int16_t>(sums[i]);
    };
    updateAll<kVirtualPixelCount>(pixels.data(), sample, activationThreshold_,
                                  summary_.values.data() + kPixelCount, totals_);
    for (std::size_t i = 0; i < kVirtualPixelCount; ++i) {
        pixels[i]._index = maxPixelIndex[i];
    }
}

void ChannelUpdate::keepVirtualPixels(std::int32_t neverActive) noexcept {
    std::fill_n(summary_.values.begin() + kPixelCount, kVirtualPixelCount, 0);
    totals_.largest = select(allLanes(0) > totals_.largest, allLanes(0), totals_.largest);
    totals_.neverActive[0] -= neverActive;
}

const ChannelSummary& ChannelUpdate::summarize() noexcept {
    const IntegerLanes& largest = totals_.largest;
    const IntegerLanes& aboveNoise = totals_.aboveNoise;
    summary_.largestValue = std::max({largest[0], largest[1], largest[2], largest[3]});
    summary_.aboveNoise = -(aboveNoise[0] + aboveNoise[1] + aboveNoise[2] + aboveNoise[3]);
    summary_.neverActive = neverActive();
    summary_.anyActive = anyActive();
    return summary_;
}

}  // namespace VexaTouch
