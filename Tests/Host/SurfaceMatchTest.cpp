#include "Host/SurfaceMatch.h"

#include "Tools/HidReportDescriptor.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Host {
namespace {

using testing::HasSubstr;
using Bytes = std::vector<std::uint8_t>;

const Bytes kOurs(Tools::kHidReportDescriptor.begin(), Tools::kHidReportDescriptor.end());

Surface deviceWith(Bytes descriptor) {
    return {.vendor = 0x046D, .product = 0xC077, .reportDescriptor = std::move(descriptor)};
}

/// Ours with some of its bytes exchanged, wherever they are.
Bytes ours(const Bytes& from, const Bytes& to) {
    Bytes bytes = kOurs;
    const auto found = std::ranges::search(bytes, from);
    EXPECT_FALSE(found.empty());
    bytes.erase(found.begin(), found.end());
    bytes.insert(found.begin(), to.begin(), to.end());
    return bytes;
}

TEST(SurfaceMatchTest, KnowsOurOwnDescriptor) {
    EXPECT_TRUE(SurfaceMatch().matches(deviceWith(kOurs)));
    EXPECT_EQ(SurfaceMatch().reason(deviceWith(kOurs)), "its reports are a surface's");
}

TEST(SurfaceMatchTest, SaysEverythingThatIsMissing) {
    const std::vector<std::pair<Bytes, std::string>> cases = {
        {{}, "its report descriptor cannot be read"},
        {{0xA1, 0x01}, "its report descriptor is wrong at byte 2: a collection is not ended"},
        {{0x05, 0x01, 0x09, 0x06, 0xA1, 0x01, 0xC0},
         "no input report 1; no input report 2; no feature report 4; no feature report 31; no "
         "feature report 63"},
        // Fourteen signed pixels.
        {ours({0x95, 0x0F, 0x09, 0x13}, {0x95, 0x0E, 0x09, 0x13}),
         "input report 1 has 68 bytes after its id, not 72"},
        // Three reserved bytes.
        {ours({0x95, 0x04, 0x09, 0x12}, {0x95, 0x03, 0x09, 0x12}),
         "input report 1 has 71 bytes after its id, not 72"},
        {ours({0x75, 0x08, 0x95, 0x09}, {0x75, 0x08, 0x95, 0x08}),
         "input report 2 has 8 bytes after its id, not 9"},
        {ours({0x95, 0x02, 0x09, 0x30}, {0x95, 0x01, 0x09, 0x30}),
         "feature report 4 has 1 byte after its id, not 2"},
        // 24 bits for this report alone.
        {ours({0x09, 0x31, 0xB1, 0x02}, {0x75, 0x18, 0x09, 0x31, 0xB1, 0x02, 0x75, 0x20}),
         "feature report 31 has 3 bytes after its id, not 4"},
        {ours({0x09, 0x32, 0xB1, 0x02}, {0x75, 0x18, 0x09, 0x32, 0xB1, 0x02}),
         "feature report 63 has 3 bytes after its id, not 4"},
        {ours({0x09, 0x31, 0xB1, 0x02}, {0x09, 0x31, 0x81, 0x02}), "no feature report 31"},
        {ours({0x85, 0x3F}, {0x85, 0x3E}), "no feature report 63"},
    };
    for (const auto& [descriptor, reason] : cases) {
        EXPECT_EQ(SurfaceMatch().reason(deviceWith(descriptor)), reason);
        EXPECT_FALSE(SurfaceMatch().matches(deviceWith(descriptor))) << reason;
    }
}

TEST(SurfaceMatchTest, OurOwnReportsAreAsShortAsReportsMayBe) {
    const auto descriptor = Vexa::parseReportDescriptor(kOurs);
    ASSERT_TRUE(descriptor);
    for (const SurfaceMatch::Report& wanted : SurfaceMatch::kReports) {
        EXPECT_EQ(descriptor->find(wanted.kind, wanted.id)->bytes(), wanted.bytes)
            << unsigned{wanted.id};
    }
}

TEST(SurfaceMatchTest, LongerReportsWillDo) {
    EXPECT_TRUE(SurfaceMatch().matches(
        deviceWith(ours({0x75, 0x08, 0x95, 0x09}, {0x75, 0x08, 0x95, 0x3F}))));
}

TEST(SurfaceMatchTest, TheReportsMustBeAVendors) {
    // Generic Desktop instead of 0xFF60.
    const Surface device = deviceWith(ours({0x06, 0x60, 0xFF}, {0x05, 0x01}));
    EXPECT_FALSE(SurfaceMatch().matches(device));
    EXPECT_THAT(SurfaceMatch().reason(device),
                HasSubstr("input report 1 is on no vendor's usage page"));
}

TEST(SurfaceMatchTest, ADeviceThatIsNamedIsOne) {
    const SurfaceMatch match({{.vendor = 0x046D, .product = 0xC077}});
    EXPECT_TRUE(match.matches(deviceWith({})));
    EXPECT_EQ(match.reason(deviceWith({})), "named 046d:c077");
    Surface other = deviceWith({});
    other.product = 1;
    EXPECT_FALSE(match.matches(other));
    other.reportDescriptor = kOurs;
    EXPECT_TRUE(match.matches(other)) << "the name comes on top of the rule";
}

TEST(SurfaceMatchTest, EverythingIsEveryDevice) {
    EXPECT_TRUE(SurfaceMatch::everything().matches(deviceWith({})));
}

TEST(SurfaceMatchTest, ReadsIds) {
    using Ids = SurfaceMatch::Ids;
    EXPECT_EQ(Ids::fromText("5658:5454"), (Ids{0x5658, 0x5454}));
    EXPECT_EQ(Ids::fromText("a:FfFf"), (Ids{0xA, 0xFFFF}));
    for (const char* wrong : {"", ":", "5658", "5658:", ":5454", "0x5658:5454", "5658:5454:1",
                              "12345:1", "-1:1", "+1:1", " 1:1", "1:1 ", "g:1"}) {
        try {
            Ids::fromText(wrong);
            ADD_FAILURE() << wrong;
        } catch (const std::invalid_argument& error) {
            EXPECT_EQ(error.what(),
                      "expected a vendor and a product id, VENDOR:PRODUCT in hexadecimal such as "
                      "5658:5454, found \"" +
                          std::string(wrong) + '"');
        }
    }
}

}  // namespace
}  // namespace VexaTouch::Host
