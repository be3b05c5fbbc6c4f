#pragma once

#include <vexa/plugin.h>
#include <algorithm>
#include <array>
#include <cstdint>

namespace VexaTouch {

/// A host identifier as an object: 16 bytes in the order the host gives them, equal when all are.
class Identifier {
public:
    explicit Identifier(const vexa_identifier& identifier) noexcept {
        std::copy_n(identifier.bytes, bytes_.size(), bytes_.begin());
    }

    friend bool operator==(const Identifier&, const Identifier&) = default;

private:
    std::array<std::uint8_t, sizeof(vexa_identifier)> bytes_{};
};

}  // namespace VexaTouch
