#pragma once

#include <cstdint>
#include <iterator>

namespace VexaTouch::Testing {

/// A small generator whose numbers are the same on every machine and library.
class SeededRandom {
public:
    explicit SeededRandom(std::uint64_t seed) : state_(seed) {}

    std::uint64_t next() {
        // splitmix64
        std::uint64_t z = (state_ += 0x9E3779B97F4A7C15U);
        z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9U;
        z = (z ^ (z >> 27)) * 0x94D049BB133111EBU;
        return z ^ (z >> 31);
    }
    /// Both ends included.
    int between(int low, int high) {
        const auto span = static_cast<std::uint64_t>(static_cast<std::int64_t>(high) - low) + 1;
        return static_cast<int>(low + static_cast<std::int64_t>((next() >> 11) % span));
    }
    double between(double low, double high) {
        return low + (high - low) * static_cast<double>(next() >> 11) / 9007199254740992.0;
    }
    bool oneIn(int n) { return between(1, n) == 1; }
    template <typename List>
    const auto& oneOf(const List& list) {
        return list[next() % std::size(list)];
    }

private:
    std::uint64_t state_;
};

}  // namespace VexaTouch::Testing
