#pragma once

#include <array>

namespace VexaTouch {

/// Four numbers side by side. Every operation is the scalar one on each lane, rounded as the scalar
/// one is, so results do not depend on the machine's instructions.
using FloatLanes [[gnu::vector_size(16)]] = float;

// A call costs more than a step on four numbers, and vectors cross calls through memory.
#define VEXA_LANES_INLINE [[gnu::always_inline]] inline

VEXA_LANES_INLINE FloatLanes allLanes(float value) noexcept {
    return FloatLanes{value, value, value, value};
}

/// See the scalar operations of the same names.
VEXA_LANES_INLINE FloatLanes largerOrOld(FloatLanes candidate, FloatLanes old) noexcept {
    return candidate > old ? candidate : old;
}

VEXA_LANES_INLINE FloatLanes smallerOrOld(FloatLanes candidate, FloatLanes old) noexcept {
    return candidate < old ? candidate : old;
}

/// Rows become columns.
VEXA_LANES_INLINE std::array<FloatLanes, 4> transposed(
    const std::array<FloatLanes, 4>& rows) noexcept {
    const FloatLanes low01 = __builtin_shufflevector(rows[0], rows[1], 0, 4, 1, 5);
    const FloatLanes high01 = __builtin_shufflevector(rows[0], rows[1], 2, 6, 3, 7);
    const FloatLanes low23 = __builtin_shufflevector(rows[2], rows[3], 0, 4, 1, 5);
    const FloatLanes high23 = __builtin_shufflevector(rows[2], rows[3], 2, 6, 3, 7);
    return {__builtin_shufflevector(low01, low23, 0, 1, 4, 5),
            __builtin_shufflevector(low01, low23, 2, 3, 6, 7),
            __builtin_shufflevector(high01, high23, 0, 1, 4, 5),
            __builtin_shufflevector(high01, high23, 2, 3, 6, 7)};
}

}  // namespace VexaTouch
