#include "Tools/Daemon/BusValue.h"

#include "Platform/PropertyValue.h"
#include "Tests/Daemon/PrivateBus.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tools/Daemon/Bus.h"

#include <gmock/gmock.h>

#include <systemd/sd-bus.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using Tools::Daemon::Bus;
using Tools::Daemon::BusError;
using Tools::Daemon::BusMessage;
using Vexa::PropertyValue;
namespace BusValue = Tools::Daemon::BusValue;

class BusValueTest : public ::testing::Test {
protected:
    void SetUp() override {
        if (!PrivateBus::isThere()) {
            GTEST_SKIP() << PrivateBus::kProgram << " is missing: script/bootstrap installs it";
        }
        privateBus.emplace();
        bus.emplace(privateBus->address());
    }
    [[nodiscard]] BusMessage message() const { return bus->call("a.b", "/c", "d.e", "F"); }
    static void seal(const BusMessage& message) {
        ASSERT_GE(sd_bus_message_seal(message.get(), 1, 0), 0);
        ASSERT_GE(sd_bus_message_rewind(message.get(), 1), 0);
    }
    [[nodiscard]] PropertyValue through(const PropertyValue& value) const {
        BusMessage carrier = message();
        carrier.value(value);
        seal(carrier);
        return carrier.readValue();
    }
    /// The type of the variant that a value becomes.
    [[nodiscard]] std::string typeOf(const PropertyValue& value) const {
        BusMessage carrier = message();
        carrier.value(value);
        seal(carrier);
        char type = 0;
        const char* contents = nullptr;
        EXPECT_GT(sd_bus_message_peek_type(carrier.get(), &type, &contents), 0);
        return contents;
    }

    std::optional<PrivateBus> privateBus;
    std::optional<Bus> bus;
};

TEST_F(BusValueTest, EveryKindComesBackAsItWas) {
    const std::vector<std::pair<PropertyValue, std::string>> cases = {
        {PropertyValue::null(), "g"},
        {true, "b"},
        {false, "b"},
        {std::int64_t{-1}, "x"},
        {std::numeric_limits<std::int64_t>::min(), "x"},
        {std::int64_t{5}, "x"},
        {std::uint64_t{5}, "t"},
        {std::numeric_limits<std::uint64_t>::max(), "t"},
        {0.1F, "(d)"},
        {-0.0F, "(d)"},
        {std::numeric_limits<float>::infinity(), "(d)"},
        {std::numeric_limits<float>::denorm_min(), "(d)"},
        {0.1, "d"},
        {-0.0, "d"},
        {std::nan(""), "d"},
        {std::nanf(""), "(d)"},
        {"", "s"},
        {"Gr\xC3\xBC\xC3\x9F"
         "e \xF0\x9F\x8E\xB5",
         "s"},
        {std::string("zero\0inside", 11), "(ay)"},
        {"\xFF\xFE", "(ay)"},
        {"\xED\xA0\x80", "(ay)"},
        {"\xC0\x80", "(ay)"},
        {PropertyValue::Bytes{}, "ay"},
        {PropertyValue::Bytes{0, 1, 255}, "ay"},
        {PropertyValue::Array{}, "av"},
        {PropertyValue::Array{1, "two", PropertyValue(), PropertyValue::Array{3.0F}}, "av"},
        {PropertyValue::Dictionary{}, "a{sv}"},
        {PropertyValue::Dictionary{{"", 1}, {"b", PropertyValue()}, {"c", PropertyValue::null()}},
         "a{sv}"},
        {PropertyValue::Dictionary{{"\xFF", 1}, {"plain", PropertyValue::Dictionary{{"x", 2U}}}},
         "a(ayv)"},
    };
    for (const auto& [value, type] : cases) {
        const PropertyValue back = through(value);
        EXPECT_EQ(back, value);
        EXPECT_EQ(back.type(), value.type()) << value.description();
        EXPECT_EQ(typeOf(value), type) << value.description();
    }
    EXPECT_EQ(typeOf(PropertyValue()), "(g)");
    EXPECT_FALSE(through(PropertyValue()));
}

TEST_F(BusValueTest, TypesThatOthersFindEasierAreTaken) {
    const auto read = [this](const char* types, auto... values) {
        BusMessage carrier = message();
        EXPECT_GE(sd_bus_message_append(carrier.get(), types, values...), 0);
        seal(carrier);
        return carrier.readValue();
    };
    EXPECT_EQ(read("v", "i", -3), PropertyValue(-3));
    EXPECT_EQ(read("v", "n", -3), PropertyValue(-3));
    EXPECT_EQ(read("v", "u", 3U).type(), PropertyValue::Type::Unsigned);
    EXPECT_EQ(read("v", "y", 3), PropertyValue(3U));
    EXPECT_EQ(read("v", "q", 3), PropertyValue(3U));
    EXPECT_EQ(read("v", "o", "/a"), PropertyValue("/a"));
    EXPECT_EQ(read("v", "as", 2, "a", "b"), (PropertyValue(PropertyValue::Array{"a", "b"})));
    EXPECT_EQ(read("v", "a{si}", 1, "a", 7), (PropertyValue(PropertyValue::Dictionary{{"a", 7}})));
    EXPECT_EQ(read("v", "v", "b", 1), PropertyValue(true));
}

TEST_F(BusValueTest, WhatHasNoMeaningIsRefused) {
    const auto refused = [this](const char* types, auto... values) {
        BusMessage carrier = message();
        EXPECT_GE(sd_bus_message_append(carrier.get(), types, values...), 0);
        seal(carrier);
        EXPECT_THROW(static_cast<void>(carrier.readValue()), BusError) << types;
    };
    refused("v", "g", "s");
    refused("v", "(s)", "x");
    refused("v", "(dd)", 1.0, 2.0);
    refused("v", "(d)", 0.1);    // not of single precision
    refused("v", "(d)", 1e300);  // nor this
    refused("v", "(g)", "s");
    refused("v", "a{us}", 1, 1U, "x");
    refused("v", "h", 0);
    refused("v", "ah", 1, 0);
}

TEST_F(BusValueTest, SizeAndDepthAreBounded) {
    EXPECT_THROW(static_cast<void>(through(std::string(BusValue::kMostBytes, 'x'))), BusError);
    EXPECT_THROW(static_cast<void>(through(PropertyValue::Array(BusValue::kMostBytes / 8 + 1, 1))),
                 BusError);
    // What is next to nothing in the message is a value in memory all the same.
    for (const PropertyValue& nothing :
         {PropertyValue::null(), PropertyValue(), PropertyValue(PropertyValue::Array{}),
          PropertyValue(PropertyValue::Dictionary{})}) {
        EXPECT_THROW(
            static_cast<void>(through(PropertyValue::Array(BusValue::kMostBytes / 8 + 1, nothing))),
            BusError);
    }
    PropertyValue deep = 1;
    for (int i = 0; i < BusValue::kMostLevels; ++i) {
        deep = PropertyValue::Dictionary{{"k", deep}};
    }
    EXPECT_EQ(through(deep), deep);
    EXPECT_THROW(static_cast<void>(through(PropertyValue::Array{deep})), BusError);
}

}  // namespace
}  // namespace VexaTouch::Testing
