#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>

namespace VexaTouch {

/// Sensing pixels of the surface, named "A" to "O"; index = letter minus "A".
inline constexpr std::size_t kPixelCount = 15;

/// Reports that the device sends on its own. Each structure holds exactly the bytes that follow
/// the report id, in wire order (little-endian); the members fall on their natural alignment, so
/// there is no padding.
namespace InputReport {

/// One touch image per sensing frame: "Image=IICCCC[15S][15s]".
struct Image {
    static constexpr std::uint8_t reportId = 1;
    /// Shortest accepted report in bytes, report id included.
    static constexpr std::size_t minimumLength = 73;

    std::uint32_t frameNumber;  ///< sequence number of the sensing frame
    std::uint32_t timestampMs;  ///< device time in milliseconds, wraps
    std::uint8_t reserved0;
    std::uint8_t reserved1;
    std::uint8_t reserved2;
    std::uint8_t reserved3;
    std::array<std::uint16_t, kPixelCount> unsignedPixels;  ///< for the diagnostic text only
    std::array<std::int16_t, kPixelCount> signedPixels;     ///< the signal the algorithm uses

    /// The record, or nothing when the bytes are no such report. Extra bytes are ignored, no field
    /// is validated. Never allocates or throws; any thread. `data` may be null if `length` is 0.
    static std::optional<Image> parse(const std::uint8_t* data, std::size_t length) noexcept;
};

/// An event of the firmware: "FirmwareEvent=C[8C]". Code 0 announces that the firmware has reset.
struct FirmwareEvent {
    static constexpr std::uint8_t reportId = 2;
    static constexpr std::size_t minimumLength = 10;

    std::uint8_t code;
    std::array<std::uint8_t, 8> data;

    /// See Image::parse.
    static std::optional<FirmwareEvent> parse(const std::uint8_t* data,
                                              std::size_t length) noexcept;
};

static_assert(sizeof(Image) == Image::minimumLength - 1);
static_assert(offsetof(Image, unsignedPixels) == 12);
static_assert(offsetof(Image, signedPixels) == 42);
static_assert(sizeof(FirmwareEvent) == FirmwareEvent::minimumLength - 1);

}  // namespace InputReport
}  // namespace VexaTouch
