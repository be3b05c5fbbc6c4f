#pragma once

#include "Algorithm/Lanes.h"

#include <array>
#include <cstddef>

namespace VexaTouch {

/// Sorts numbers from largest to smallest by comparisons that do not depend on the data, four at a
/// time: no branch to mispredict, however much noise shuffles the numbers from frame to frame.
/// Numbers must compare (no not-a-number among them).
namespace SortNetwork {

template <std::size_t n>
using Run = std::array<FloatLanes, n>;  // 4 n numbers in order, lane by lane

VEXA_LANES_INLINE void order(FloatLanes& larger, FloatLanes& smaller) noexcept {
    const FloatLanes a = larger;
    const FloatLanes b = smaller;
    larger = largerOrOld(a, b);
    smaller = smallerOrOld(a, b);
}

VEXA_LANES_INLINE FloatLanes reversed(FloatLanes lanes) noexcept {
    return __builtin_shufflevector(lanes, lanes, 3, 2, 1, 0);
}

/// Sorts the four numbers of each vector, which first rise and then fall or the other way round.
VEXA_LANES_INLINE void mergeLanes(FloatLanes& a, FloatLanes& b) noexcept {
    // Numbers two places apart, then neighbours, each against each.
    FloatLanes larger = __builtin_shufflevector(a, b, 0, 1, 4, 5);
    FloatLanes smaller = __builtin_shufflevector(a, b, 2, 3, 6, 7);
    order(larger, smaller);
    FloatLanes even = __builtin_shufflevector(larger, smaller, 0, 2, 4, 6);
    FloatLanes odd = __builtin_shufflevector(larger, smaller, 1, 3, 5, 7);
    order(even, odd);
    const FloatLanes low = __builtin_shufflevector(even, odd, 0, 4, 1, 5);
    const FloatLanes high = __builtin_shufflevector(even, odd, 2, 6, 3, 7);
    a = __builtin_shufflevector(low, high, 0, 1, 4, 5);
    b = __builtin_shufflevector(low, high, 2, 3, 6, 7);
}

/// Sorts `n` (a power of two, at least 2) vectors from `first` whose numbers first rise and then
/// fall or the other way round.
template <std::size_t n>
VEXA_LANES_INLINE void mergeBitonic(FloatLanes* first) noexcept {
    for (std::size_t i = 0; i < n / 2; ++i) {
        order(first[i], first[i + n / 2]);
    }
    if constexpr (n == 2) {
        mergeLanes(first[0], first[1]);
    } else {
        mergeBitonic<n / 2>(first);
        mergeBitonic<n / 2>(first + n / 2);
    }
}

/// Merges two sorted runs of `n` vectors that follow each other.
template <std::size_t n>
VEXA_LANES_INLINE void mergeRuns(FloatLanes* first) noexcept {
    for (std::size_t i = 0; i < n / 2; ++i) {
        const FloatLanes last = reversed(first[2 * n - 1 - i]);
        first[2 * n - 1 - i] = reversed(first[n + i]);
        first[n + i] = last;
    }
    if constexpr (n == 1) {
        first[1] = reversed(first[1]);
    }
    mergeBitonic<2 * n>(first);
}

/// Sorts four vectors.
VEXA_LANES_INLINE void sortBlock(FloatLanes* first) noexcept {
    order(first[0], first[2]);
    order(first[1], first[3]);
    order(first[0], first[1]);
    order(first[2], first[3]);
    order(first[1], first[2]);
    const auto rows = transposed({first[0], first[1], first[2], first[3]});
    for (std::size_t i = 0; i < 4; ++i) {
        first[i] = rows[i];
    }
    mergeRuns<1>(first);
    mergeRuns<1>(first + 2);
    mergeRuns<2>(first);
}

/// Sorts 48 numbers.
inline void sortDescending(Run<12>& numbers) noexcept {
    FloatLanes* first = numbers.data();
    sortBlock(first);
    sortBlock(first + 4);
    sortBlock(first + 8);
    mergeRuns<4>(first);
    // The last 16 meet the lower half of the first 32, as if 16 smaller numbers followed them. What
    // is smaller stays behind, the rest joins the first 32.
    for (std::size_t i = 0; i < 4; ++i) {
        FloatLanes other = reversed(first[11 - i]);
        order(first[4 + i], other);
        first[11 - i] = other;
    }
    mergeBitonic<8>(first);
    mergeBitonic<4>(first + 8);
}

}  // namespace SortNetwork
}  // namespace VexaTouch
