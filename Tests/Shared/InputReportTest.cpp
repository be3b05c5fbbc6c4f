#include "Shared/InputReport.h"

#include "Tests/Support/Touch.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <limits>
#include <numeric>
#include <vector>

namespace VexaTouch::InputReport {
namespace {

using Bytes = std::vector<std::uint8_t>;

/// Bytes 1, 2, 3... behind the id.
Bytes counted(std::uint8_t reportId, std::size_t length) {
    Bytes bytes(length);
    std::iota(bytes.begin(), bytes.end(), std::uint8_t{0});
    bytes[0] = reportId;
    return bytes;
}

TEST(ImageReport, NeedsSeventyThreeBytes) {
    const Bytes bytes = counted(1, 73);
    EXPECT_FALSE(Image::parse(bytes.data(), 72));
    EXPECT_TRUE(Image::parse(bytes.data(), 73));
}

TEST(ImageReport, CopiesEveryByteBehindTheId) {
    const Bytes bytes = counted(1, 73);
    const auto image = Image::parse(bytes.data(), bytes.size());
    ASSERT_TRUE(image);
    EXPECT_EQ(std::memcmp(&*image, bytes.data() + 1, 72), 0);
}

TEST(ImageReport, FieldsAreLittleEndianInWireOrder) {
    const Bytes bytes = counted(1, 73);
    const Image image = Image::parse(bytes.data(), bytes.size()).value();
    EXPECT_EQ(image.frameNumber, 0x04030201U);
    EXPECT_EQ(image.timestampMs, 0x08070605U);
    EXPECT_EQ(image.reserved0, 9);
    EXPECT_EQ(image.reserved1, 10);
    EXPECT_EQ(image.reserved2, 11);
    EXPECT_EQ(image.reserved3, 12);
    EXPECT_EQ(image.unsignedPixels.front(), 0x0E0D);
    EXPECT_EQ(image.unsignedPixels.back(), 0x2A29);
    EXPECT_EQ(image.signedPixels.front(), 0x2C2B);
    EXPECT_EQ(image.signedPixels.back(), 0x4847);
}

TEST(ImageReport, IgnoresWhatFollowsThePayload) {
    Bytes bytes = counted(1, 100);
    const Image image = Image::parse(bytes.data(), bytes.size()).value();
    std::fill(bytes.begin() + 73, bytes.end(), std::uint8_t{0xEE});
    const Image other = Image::parse(bytes.data(), bytes.size()).value();
    EXPECT_EQ(std::memcmp(&image, &other, sizeof image), 0);
}

TEST(ImageReport, CarriesExtremeValuesUnchanged) {
    Testing::Samples samples{};
    samples[0] = std::numeric_limits<std::int16_t>::min();
    samples[14] = std::numeric_limits<std::int16_t>::max();
    std::array<std::uint16_t, kPixelCount> unsignedPixels{};
    unsignedPixels[7] = 65535;
    const Bytes bytes = Testing::imageReport(samples, 0xFFFFFFFFU, 0xFFFFFFFFU, unsignedPixels);
    ASSERT_EQ(bytes.size(), 73U);
    const Image image = Image::parse(bytes.data(), bytes.size()).value();
    EXPECT_EQ(image.frameNumber, 0xFFFFFFFFU);
    EXPECT_EQ(image.timestampMs, 0xFFFFFFFFU);
    EXPECT_EQ(image.signedPixels, samples);
    EXPECT_EQ(image.unsignedPixels, unsignedPixels);
}

TEST(ImageReport, AnotherIdIsNoImage) {
    for (int id = 0; id < 256; ++id) {
        const Bytes bytes = counted(static_cast<std::uint8_t>(id), 73);
        EXPECT_EQ(Image::parse(bytes.data(), bytes.size()).has_value(), id == 1) << id;
    }
}

TEST(ImageReport, TheIdOfAnEmptyReportIsNotRead) {
    // An address that must not be read.
    const auto* nowhere = reinterpret_cast<const std::uint8_t*>(1);
    EXPECT_FALSE(Image::parse(nowhere, 0));
    EXPECT_FALSE(FirmwareEvent::parse(nowhere, 0));
    EXPECT_FALSE(Image::parse(nullptr, 0));
    EXPECT_FALSE(FirmwareEvent::parse(nullptr, 0));
}

TEST(FirmwareEventReport, NeedsTenBytes) {
    const Bytes bytes = counted(2, 10);
    EXPECT_FALSE(FirmwareEvent::parse(bytes.data(), 9));
    EXPECT_TRUE(FirmwareEvent::parse(bytes.data(), 10));
}

TEST(FirmwareEventReport, HoldsCodeAndEightBytes) {
    const Bytes bytes = {2, 200, 1, 2, 3, 4, 5, 6, 7, 255, 99};
    const FirmwareEvent event = FirmwareEvent::parse(bytes.data(), bytes.size()).value();
    EXPECT_EQ(event.code, 200);
    EXPECT_EQ(event.data, (std::array<std::uint8_t, 8>{1, 2, 3, 4, 5, 6, 7, 255}));
}

TEST(FirmwareEventReport, OfImageLengthIsAFirmwareEventByItsId) {
    const Bytes bytes = counted(2, 73);
    EXPECT_TRUE(FirmwareEvent::parse(bytes.data(), bytes.size()));
    EXPECT_FALSE(Image::parse(bytes.data(), bytes.size()));
}

TEST(FirmwareEventReport, AnotherIdIsNoFirmwareEvent) {
    for (int id = 0; id < 256; ++id) {
        const Bytes bytes = counted(static_cast<std::uint8_t>(id), 10);
        EXPECT_EQ(FirmwareEvent::parse(bytes.data(), bytes.size()).has_value(), id == 2) << id;
    }
}

}  // namespace
}  // namespace VexaTouch::InputReport
