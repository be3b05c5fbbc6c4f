#include "Pipeline/FrameScanner.h"

#include "Pipeline/ContainerReader.h"

#include <gmock/gmock.h>

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

namespace VexaTouch {
namespace {

using Bytes = std::vector<std::uint8_t>;
using Frame = RecordedFrame;

const std::string kPlain = R"({"Type": "InputReport", "Timestamp": 7, "Report": "01 fF "})";

/// The frame at the front of the text when it is plain, and how far it reaches.
struct Scanned {
    bool plain;
    std::size_t position;
    Frame frame;
};

Scanned scanned(const std::string& text) {
    FrameScanner scanner(text);
    Frame frame;
    const bool plain = scanner.scan(frame);
    return {plain, scanner.position(), frame};
}

std::string fault(const std::string& text) {
    ContainerReader reader;
    reader.write(text);
    try {
        reader.finish();
    } catch (const std::exception& error) {
        return error.what();
    }
    return {};
}

std::string container(const std::string& frames) {
    return R"({"Version": 1, "Frames": [)" + frames + "]}";
}

TEST(FrameScanner, ReadsAPlainFrameAndItsComma) {
    const Scanned got = scanned(kPlain + ",{");
    EXPECT_TRUE(got.plain);
    EXPECT_EQ(got.position, kPlain.size() + 1);
    EXPECT_EQ(got.frame.type, Frame::Type::InputReport);
    EXPECT_EQ(got.frame.timestamp, 7U);
    EXPECT_EQ(got.frame.report, (Bytes{0x01, 0xFF}));
}

TEST(FrameScanner, MembersComeInAnyOrderWithAnyWhiteSpace) {
    const Scanned got = scanned(
        "\n\t{ \"Report\" :\r\n\"\" ,\"Type\":\"InputReport\",\"Timestamp\":9999999999999999999 } "
        ",");
    EXPECT_TRUE(got.plain);
    EXPECT_EQ(got.frame.timestamp, 9999999999999999999U);
    EXPECT_EQ(got.frame.report, Bytes());
}

TEST(FrameScanner, LeavesEveryOtherFormToTheReaderOfJson) {
    const std::vector<std::string> others = {
        "",
        kPlain,  // the last one has no comma
        R"({"Type": "State", "Timestamp": 7, "Key": "a", "Value": 1},)",
        R"({"Type": "InputReport", "Timestamp": 7},)",
        R"({"Type": "InputReport", "Timestamp": 7, "Timestamp": 8},)",
        R"({"Type": "InputReport", "Timestamp": 7, "Report": "01 ", "Report": "02 "},)",
        R"({"Type": "InputReport", "Timestamp": 7.5, "Report": "01 "},)",
        R"({"Type": "InputReport", "Timestamp": 7e1, "Report": "01 "},)",
        R"({"Type": "InputReport", "Timestamp": -7, "Report": "01 "},)",
        R"({"Type": "InputReport", "Timestamp": 07, "Report": "01 "},)",
        R"({"Type": "InputReport", "Timestamp": 18446744073709551615, "Report": "01 "},)",
        R"({"Type": "InputReport", "Timestamp": , "Report": "01 "},)",
        R"({"Type": "InputReport", "Timestamp": 7, "Report": "01"},)",
        R"({"Type": "InputReport", "Timestamp": 7, "Report": "1 "},)",
        R"({"Type": "InputReport", "Timestamp": 7, "Report": "0x "},)",
        R"({"Type": "InputReport", "Timestamp": 7, "Report": "\u0030"},)",
        R"({"Type": "InputReport", "Timestamp": 7, "ReportData": "01 "},)",
        R"({"Type": "InputReports", "Timestamp": 7, "Report": "01 "},)",
        R"({"Type": "InputReport" "Timestamp": 7, "Report": "01 "},)",
    };
    for (const std::string& other : others) {
        const Scanned got = scanned(other);
        EXPECT_FALSE(got.plain) << other;
        EXPECT_EQ(got.position, 0U) << other;
    }
}

TEST(FrameScanner, AReportLongerThanAnyDeviceSendsIsLeftToTheReaderOfJson) {
    std::string report;
    for (int i = 0; i < 128; ++i) {
        report += "00 ";
    }
    const std::string front = R"({"Type": "InputReport", "Timestamp": 7, "Report": ")";
    EXPECT_TRUE(scanned(front + report + "\"},").plain);
    EXPECT_FALSE(scanned(front + report + "00 \"},").plain);
    EXPECT_EQ(fault(container(kPlain + "," + front + report + "00 \"}," + kPlain)), "");
}

TEST(FrameScanner, NothingIsSkippedBesideWholeElements) {
    // What stands between, before and behind plain frames is as good or bad as without them.
    const std::string malformed = "migrateSerializedContainer failed: invalid container";
    EXPECT_EQ(fault(container(kPlain + "," + kPlain + "," + kPlain)), "");
    EXPECT_EQ(fault(container(kPlain + "," + kPlain + ",")), malformed);
    EXPECT_EQ(fault(container(kPlain + "," + kPlain + ",,")), malformed);
    EXPECT_EQ(fault(container("," + kPlain + "," + kPlain)), malformed);
    EXPECT_EQ(fault(container(kPlain + " " + kPlain + "," + kPlain)), malformed);
    EXPECT_EQ(fault(container("\"a,\", \"b,{\"," + kPlain + "," + kPlain)), "invalid frame type");
    EXPECT_EQ(fault(R"({"Version": 1, "Frames": [], "Other": [1,)" + kPlain + "," + kPlain + "]}"),
              "");
    EXPECT_EQ(fault(R"({"Version": 1, "Frames": [{"Type": [1,)" + kPlain + "," + kPlain + "]}]}"),
              "invalid frame type");
}

TEST(FrameScanner, PositionsOfFaultsCountWhatWasScanned) {
    const std::string front = container(kPlain + "," + kPlain + "," + kPlain + ",");
    ContainerReader malformed;
    EXPECT_FALSE(malformed.write(front.substr(0, front.size() - 2) + "?"));
    EXPECT_EQ(malformed.errorOffset(), front.size() - 2);

    ContainerReader refused;
    EXPECT_TRUE(refused.write(container(kPlain + "," + kPlain + "," + kPlain + ",{}," + kPlain)));
    EXPECT_THROW(refused.finish(), std::invalid_argument);
    EXPECT_EQ(refused.errorFrame(), 3U);
}

}  // namespace
}  // namespace VexaTouch
