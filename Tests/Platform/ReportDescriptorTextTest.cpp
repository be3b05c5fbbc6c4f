#include "Platform/ReportDescriptorText.h"

#include "Tools/HidReportDescriptor.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;
using Bytes = std::vector<std::uint8_t>;

/// "offset+length text" of each line.
std::vector<std::string> linesOf(const Bytes& bytes) {
    std::vector<std::string> lines;
    for (const DescriptorLine& line : reportDescriptorLines(bytes)) {
        EXPECT_EQ(line.bytes.data(), bytes.data() + line.offset);
        lines.push_back(std::to_string(line.offset) + '+' + std::to_string(line.bytes.size()) +
                        ' ' + line.text);
    }
    return lines;
}

TEST(ReportDescriptorTextTest, IndentsWhatStandsInCollections) {
    EXPECT_THAT(linesOf({0x06, 0x60, 0xFF, 0x09, 0x01, 0xA1, 0x01, 0x16, 0x00, 0x80,
                         0xA1, 0x00, 0x85, 0x3F, 0x81, 0x02, 0xC0, 0xB1, 0x05, 0xC0}),
                ElementsAre("0+3 Usage Page (0xFF60)", "3+2 Usage (0x01)",
                            "5+2 Collection (Application)", "7+3   Logical Minimum (-32768)",
                            "10+2   Collection (Physical)", "12+2     Report ID (63)",
                            "14+2     Input (Data, Variable)", "16+1   End Collection",
                            "17+2   Feature (Constant, Array, Relative)", "19+1 End Collection"));
}

TEST(ReportDescriptorTextTest, ShowsWhatItDoesNotKnow) {
    EXPECT_THAT(
        linesOf({0xFE, 0x01, 0xF0, 0x00, 0xF5, 0x00, 0xFC, 0xA1, 0x80, 0xA1, 0x07, 0xC0, 0xC0, 0xC0,
                 0xA4, 0xB4, 0x09}),
        ElementsAre("0+4 Long item (1 byte)", "4+2 Unknown item (1 byte)",
                    "6+1 Unknown item (0 bytes)", "7+2 Collection (0x80)",
                    "9+2   Collection (0x07)", "11+1   End Collection", "12+1 End Collection",
                    "13+1 End Collection", "14+1 Push", "15+1 Pop", "16+1 breaks off here"));
}

TEST(ReportDescriptorTextTest, EveryByteOfOurOwnIsOnALine) {
    const auto& bytes = VexaTouch::Tools::kHidReportDescriptor;
    std::size_t end = 0;
    for (const DescriptorLine& line : reportDescriptorLines(bytes)) {
        EXPECT_EQ(line.offset, end);
        EXPECT_EQ(line.text.find("Unknown"), std::string::npos);
        end += line.bytes.size();
    }
    EXPECT_EQ(end, bytes.size());
}

}  // namespace
}  // namespace Vexa
