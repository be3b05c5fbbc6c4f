#pragma once

#include "Algorithm/StateFields.h"

#include <bit>
#include <concepts>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Testing {

/// A field's content as a number that is equal exactly when the contents are: floats by their
/// bits, every not-a-number the same.
template <typename T>
std::uint64_t fieldBits(const T& value) {
    if constexpr (std::floating_point<T>) {
        static_assert(sizeof(T) == 4);
        return value == value ? std::bit_cast<std::uint32_t>(value) : 0x7FC00000U;
    } else {
        static_assert(std::integral<T>);
        return static_cast<std::uint64_t>(value);
    }
}

template <typename Counters, typename Visit>
void forEachCounter(Counters& stats, Visit&& visit) {
    visit("numTaps", stats.numTaps);
    visit("numBeginHold", stats.numBeginHold);
    visit("numIncrementHold", stats.numIncrementHold);
    visit("numEndHold", stats.numEndHold);
    visit("numVolumeUp", stats.numVolumeUp);
    visit("numVolumeDown", stats.numVolumeDown);
    visit("numPlayPause", stats.numPlayPause);
    visit("numQuarnCall", stats.numQuarnCall);
    visit("numQuarnCallIncrement", stats.numQuarnCallIncrement);
    visit("numVolumeIncrement", stats.numVolumeIncrement);
    visit("numVolumeDecrement", stats.numVolumeDecrement);
    visit("numRejectedTap", stats.numRejectedTap);
    visit("numRejectedBeginHold", stats.numRejectedBeginHold);
    visit("numRejectedIncrementHold", stats.numRejectedIncrementHold);
    visit("numRejectedEndHold", stats.numRejectedEndHold);
    visit("numRejectedVolumeUp", stats.numRejectedVolumeUp);
    visit("numRejectedVolumeDown", stats.numRejectedVolumeDown);
    visit("numRejectedPlayPause", stats.numRejectedPlayPause);
    visit("numRejectedQuarnCall", stats.numRejectedQuarnCall);
    visit("numRejectedQuarnCallIncrement", stats.numRejectedQuarnCallIncrement);
    visit("numRejectedVolumeIncrement", stats.numRejectedVolumeIncrement);
    visit("numRejectedVolumeDecrement", stats.numRejectedVolumeDecrement);
    visit("numSuppressed2Holding", stats.numSuppressed2Holding);
    visit("numHolding2Suppressed", stats.numHolding2Suppressed);
}

/// Calls visit(place, position, name, value) for every field of an algorithm's whole state, such as
/// ("virtual pixel", 3, "_value", 250). Vectors and arrays are visited by element.
template <typename Algorithm, typename Visit>
void forEachStateField(const Algorithm& algs, Visit&& visit) {
    const auto elements = [&visit](std::string_view place, std::string_view name,
                                   const auto& values) {
        std::size_t i = 0;
        for (const auto& value : values) {
            visit(place, i++, name, value);
        }
    };
    std::size_t i = 0;
    for (const auto& pixel : algs.touchPixels()) {
        forEachPixelField(pixel, [&](std::string_view name, const auto& value) {
            visit("pixel", i, name, value);
        });
        ++i;
    }
    i = 0;
    for (const auto& pixel : algs.virtualPixels()) {
        forEachPixelField(pixel, [&](std::string_view name, const auto& value) {
            visit("virtual pixel", i, name, value);
        });
        elements("virtual pixel", "_name", pixel._name);
        ++i;
    }
    const auto& virtualImage = algs.virtualImage();
    elements("virtual image", "_values", virtualImage._values);
    elements("virtual image", "_maxPixelIndex", virtualImage._maxPixelIndex);
    elements("virtual image", "_normalizationFactors", virtualImage._normalizationFactors);
    for (const auto& group : virtualImage.neighborPixelGroups()) {
        elements("virtual image", "_neighborPixelGroups", group);
    }
    forEachHandStatsField(algs.handStats(), [&](std::string_view name, const auto& value) {
        if constexpr (requires { value.size(); }) {
            elements("hand", name, value);
        } else {
            visit("hand", 0, name, value);
        }
    });
    forEachCounter(algs.eventStats()._stats, [&](std::string_view name, const auto& value) {
        visit("counter", 0, name, value);
    });
    const std::uint16_t phase = algs.lastDispatchedPhase();
    visit("algorithm", 0, "_lastDispatchedPhase", phase);
}

/// The whole state as numbers, in the order of forEachStateField.
template <typename Algorithm>
void snapshot(const Algorithm& algs, std::vector<std::uint64_t>& bits) {
    bits.clear();
    forEachStateField(algs, [&bits](std::string_view, std::size_t, std::string_view,
                                    const auto& value) { bits.push_back(fieldBits(value)); });
}

/// The first field in which two algorithms' states differ, with both contents; nothing when they
/// are the same to the bit.
template <typename A, typename B>
std::optional<std::string> firstDifference(const A& a, const B& b) {
    thread_local std::vector<std::uint64_t> bitsA;
    thread_local std::vector<std::uint64_t> bitsB;
    snapshot(a, bitsA);
    snapshot(b, bitsB);
    if (bitsA == bitsB) {
        return std::nullopt;
    }
    if (bitsA.size() != bitsB.size()) {
        return "different numbers of fields: " + std::to_string(bitsA.size()) + " and " +
               std::to_string(bitsB.size());
    }
    struct Named {
        std::string name;
        std::string content;
    };
    const auto named = [](const auto& algs) {
        std::vector<Named> all;
        forEachStateField(algs, [&all](std::string_view place, std::size_t position,
                                       std::string_view name, const auto& value) {
            all.push_back(
                {std::string(place) + " " + std::to_string(position) + " " + std::string(name),
                 std::to_string(value)});
        });
        return all;
    };
    const std::vector<Named> namedA = named(a);
    const std::vector<Named> namedB = named(b);
    std::size_t i = 0;
    while (bitsA[i] == bitsB[i]) {
        ++i;
    }
    const auto hex = [](std::uint64_t bits) {
        std::string text;
        for (int shift = 28; shift >= 0; shift -= 4) {
            text += "0123456789abcdef"[bits >> shift & 15U];
        }
        return text;
    };
    return namedA[i].name + ": " + namedA[i].content + " (" + hex(bitsA[i]) + ") and " +
           namedB[i].content + " (" + hex(bitsB[i]) + ")";
}

}  // namespace VexaTouch::Testing
