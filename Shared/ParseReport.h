#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <type_traits>

namespace VexaTouch {

// The structures are the wire bytes themselves.
static_assert(std::endian::native == std::endian::little);

/// The one parse rule of all reports: at least the minimum length, the right id, then a plain copy
/// of the payload. The id byte is not read when the length is 0.
template <typename Report>
std::optional<Report> parseReport(const std::uint8_t* data, std::size_t length) noexcept {
    static_assert(std::is_trivially_copyable_v<Report>);
    if (length == 0 || length < Report::minimumLength || data[0] != Report::reportId) {
        return std::nullopt;
    }
    Report report;
    std::memcpy(&report, data + 1, sizeof report);
    return report;
}

}  // namespace VexaTouch
