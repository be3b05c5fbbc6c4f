#pragma once

#include <cstdint>

namespace VexaTouch::Tools {

/// A small pseudo-random generator in exact 64-bit arithmetic: the same seed gives the same numbers
/// on every compiler and machine. Not for secrets. Not thread safe.
class SeededNumbers {
public:
    explicit constexpr SeededNumbers(std::uint64_t seed) noexcept : state_(seed) {}

    /// The next 64 bits.
    constexpr std::uint64_t next() noexcept {
        state_ += 0x9E3779B97F4A7C15U;
        std::uint64_t mixed = state_;
        mixed = (mixed ^ (mixed >> 30U)) * 0xBF58476D1CE4E5B9U;
        mixed = (mixed ^ (mixed >> 27U)) * 0x94D049BB133111EBU;
        return mixed ^ (mixed >> 31U);
    }

    /// A number from 0 to `count` - 1; 0 if `count` is 0.
    constexpr std::uint32_t below(std::uint32_t count) noexcept { return scale(next(), count); }

    /// A number from `lowest` to `highest`, both included.
    constexpr std::int32_t between(std::int32_t lowest, std::int32_t highest) noexcept {
        return lowest +
               static_cast<std::int32_t>(below(static_cast<std::uint32_t>(highest - lowest) + 1U));
    }

    /// A number from -`amplitude` to `amplitude`, likeliest at 0 (the sum of two even draws).
    constexpr std::int32_t around0(std::int32_t amplitude) noexcept {
        const std::uint64_t bits = next();
        const auto count = static_cast<std::uint32_t>(amplitude) + 1U;
        return static_cast<std::int32_t>(scale(bits, count) + scale(bits << 32U, count)) -
               amplitude;
    }

private:
    /// The upper 32 of the 64 `bits`, scaled to 0 to `count` - 1.
    static constexpr std::uint32_t scale(std::uint64_t bits, std::uint32_t count) noexcept {
        return static_cast<std::uint32_t>(((bits >> 32U) * count) >> 32U);
    }

    std::uint64_t state_;
};

}  // namespace VexaTouch::Tools
