#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <iostream>
#include <span>
#include <string_view>
#include <type_traits>
#include <vector>

/// What fuzz targets share: taking an input apart, and stopping when something does not hold.
namespace VexaTouch::Fuzz {

/// Ends the process, so that the fuzzer keeps the input, unless it holds.
inline void require(bool holds, std::string_view what) {
    if (!holds) {
        std::cerr << "does not hold: " << what << "\n";
        std::abort();
    }
}

/// Takes an input apart from its front. What is asked for beyond its end is zero or empty, so that
/// every input means something.
class FuzzInput {
public:
    FuzzInput(const std::uint8_t* data, std::size_t size) : rest_(data, size) {}

    [[nodiscard]] bool atEnd() const { return rest_.empty(); }

    /// A little-endian integer.
    template <class Integer>
    Integer take() {
        static_assert(std::is_integral_v<Integer>);
        std::array<std::uint8_t, sizeof(Integer)> bytes{};
        const auto taken = takeSpan(sizeof(Integer));
        std::copy(taken.begin(), taken.end(), bytes.begin());
        Integer value;
        std::memcpy(&value, bytes.data(), sizeof value);
        return value;
    }

    /// A number from 0 to most.
    std::uint8_t takeUpTo(std::uint8_t most) {
        return static_cast<std::uint8_t>(take<std::uint8_t>() % (most + 1U));
    }

    std::vector<std::uint8_t> takeBytes(std::size_t count) {
        const auto taken = takeSpan(count);
        return {taken.begin(), taken.end()};
    }

    /// Text up to before the delimiter, which is skipped, or to the end.
    std::string_view takeText(char delimiter) {
        const auto end =
            std::find(rest_.begin(), rest_.end(), static_cast<std::uint8_t>(delimiter));
        const auto taken = takeSpan(static_cast<std::size_t>(end - rest_.begin()));
        takeSpan(1);
        return {reinterpret_cast<const char*>(taken.data()), taken.size()};
    }

private:
    std::span<const std::uint8_t> takeSpan(std::size_t count) {
        const auto taken = rest_.first(std::min(count, rest_.size()));
        rest_ = rest_.subspan(taken.size());
        return taken;
    }

    std::span<const std::uint8_t> rest_;
};

/// Hands a text over in pieces of 1 to `longest` bytes, until `write` gives false.
template <class Write>
void inPieces(std::string_view text, std::size_t longest, Write&& write) {
    std::uint32_t seed = static_cast<std::uint32_t>(text.size());
    while (!text.empty()) {
        seed = seed * 1664525U + 1013904223U;
        const std::size_t size = std::min(text.size(), 1 + (seed >> 16U) % longest);
        if (!write(text.substr(0, size))) {
            return;
        }
        text.remove_prefix(size);
    }
}

}  // namespace VexaTouch::Fuzz
