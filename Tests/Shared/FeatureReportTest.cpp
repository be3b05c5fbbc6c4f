#include "Shared/FeatureReport.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

namespace VexaTouch::FeatureReport {
namespace {

using Bytes = std::vector<std::uint8_t>;

/// Accepted from the minimum length on and with its own id alone.
template <typename Report>
void expectLengthAndIdAreTested() {
    for (int id = 0; id < 256; ++id) {
        const Bytes bytes(32, static_cast<std::uint8_t>(id));
        for (std::size_t length = 0; length <= bytes.size(); ++length) {
            EXPECT_EQ(Report::parse(bytes.data(), length).has_value(),
                      id == Report::reportId && length >= Report::minimumLength)
                << "id " << id << " length " << length;
        }
    }
    EXPECT_FALSE(Report::parse(nullptr, 0));
}

TEST(FirmwareVersionReport, HoldsTwoBytesInOrder) {
    const Bytes bytes = {0x04, 0x12, 0x34};
    const auto version = FirmwareVersion::parse(bytes.data(), bytes.size());
    ASSERT_TRUE(version);
    EXPECT_EQ(version->versionByte0, 18);
    EXPECT_EQ(version->versionByte1, 52);
}

TEST(FirmwareVersionReport, LengthAndIdAreTested) {
    EXPECT_EQ(FirmwareVersion::reportId, 4);
    EXPECT_EQ(FirmwareVersion::minimumLength, 3U);
    expectLengthAndIdAreTested<FirmwareVersion>();
}

TEST(FactoryResetHoldDurationReport, IsALittleEndianNumber) {
    const Bytes bytes = {0x1F, 0x10, 0x27, 0x00, 0x00};
    const auto report = FactoryResetHoldDuration::parse(bytes.data(), bytes.size());
    ASSERT_TRUE(report);
    EXPECT_EQ(report->duration, 10000U);
}

TEST(FactoryResetHoldDurationReport, LengthAndIdAreTested) {
    EXPECT_EQ(FactoryResetHoldDuration::reportId, 31);
    EXPECT_EQ(FactoryResetHoldDuration::minimumLength, 5U);
    expectLengthAndIdAreTested<FactoryResetHoldDuration>();
}

TEST(CriticalErrorsReport, IsALittleEndianWordAndWhatFollowsIsIgnored) {
    const Bytes bytes = {0x3F, 0x78, 0x56, 0x34, 0xF2, 0xFF, 0xFF};
    const auto report = CriticalErrors::parse(bytes.data(), bytes.size());
    ASSERT_TRUE(report);
    EXPECT_EQ(report->errors, 0xF2345678U);
}

TEST(CriticalErrorsReport, LengthAndIdAreTested) {
    EXPECT_EQ(CriticalErrors::reportId, 63);
    EXPECT_EQ(CriticalErrors::minimumLength, 5U);
    expectLengthAndIdAreTested<CriticalErrors>();
}

}  // namespace
}  // namespace VexaTouch::FeatureReport
