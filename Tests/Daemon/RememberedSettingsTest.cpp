#include "Tools/Daemon/RememberedSettings.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <string>

namespace VexaTouch::Tools::Daemon {
namespace {

SurfaceIdentity surface(const std::string& serial, const std::string& place) {
    return {.vendor = 1, .product = 2, .serial = serial, .place = place};
}

Settings settings(unsigned value) {
    return {{"Pipeline.Algs.HoldTimeoutMilliseconds", value}};
}

class RememberedSettingsTest : public ::testing::Test {
protected:
    /// Plugs in, gives what it has then, and unplugs with what it has at the end.
    Settings visit(const SurfaceIdentity& who, const Settings& atTheEnd) {
        const Settings before = remembered.arrive(who).settings;
        remembered.leave(who, atTheEnd);
        return before;
    }

    RememberedSettings remembered;
};

TEST_F(RememberedSettingsTest, WhatComesBackHasWhatItHad) {
    EXPECT_EQ(visit(surface("A", "1"), settings(300)), Settings());
    EXPECT_EQ(visit(surface("A", "1"), settings(400)), settings(300));
    EXPECT_EQ(visit(surface("A", "1"), {}), settings(400));
    EXPECT_EQ(visit(surface("A", "1"), {}), Settings());
}

TEST_F(RememberedSettingsTest, AtAnotherPlaceTheSerialNumberTells) {
    visit(surface("A", "1"), settings(300));
    EXPECT_EQ(visit(surface("B", "1"), {}), Settings());
    const RememberedSettings::Arrival arrival = remembered.arrive(surface("A", "2"));
    EXPECT_EQ(arrival.before, surface("A", "1"));
    EXPECT_EQ(arrival.settings, settings(300));
    remembered.leave(surface("A", "2"), {});
    // What was taken back there does not come again here.
    EXPECT_EQ(visit(surface("A", "1"), {}), Settings());
}

TEST_F(RememberedSettingsTest, TheSameNumberOfAnotherProductIsAnother) {
    visit(surface("A", "1"), settings(300));
    SurfaceIdentity other = surface("A", "1");
    other.product = 3;
    EXPECT_EQ(visit(other, {}), Settings());
    other = surface("A", "1");
    other.vendor = 3;
    EXPECT_EQ(visit(other, {}), Settings());
}

TEST_F(RememberedSettingsTest, TwoWithOneSerialNumberKeepTheirOwn) {
    remembered.arrive(surface("0", "1"));
    remembered.arrive(surface("0", "2"));
    remembered.leave(surface("0", "1"), settings(300));
    remembered.leave(surface("0", "2"), {});
    EXPECT_EQ(visit(surface("0", "2"), {}), Settings());
    EXPECT_EQ(visit(surface("0", "1"), settings(300)), settings(300));
    // Which of both this is nobody can tell.
    EXPECT_EQ(remembered.arrive(surface("0", "3")).settings, Settings());
}

TEST_F(RememberedSettingsTest, OneThatIsPluggedInIsNotTakenForItsTwin) {
    visit(surface("0", "1"), settings(300));
    EXPECT_EQ(remembered.arrive(surface("0", "1")).settings, settings(300));
    EXPECT_EQ(remembered.arrive(surface("0", "2")).settings, Settings());
}

TEST_F(RememberedSettingsTest, WithoutASerialNumberThePlaceTells) {
    visit(surface("", "1"), settings(300));
    EXPECT_EQ(visit(surface("", "2"), {}), Settings());
    EXPECT_EQ(visit(surface("", "1"), {}), settings(300));
}

TEST_F(RememberedSettingsTest, WhatWasUnderWayCounts) {
    visit(surface("A", "1"), settings(300));
    remembered.correct(surface("A", "1"), settings(400));
    EXPECT_EQ(remembered.arrive(surface("A", "1")).settings, settings(400));
}

TEST_F(RememberedSettingsTest, TheOldestAreForgotten) {
    for (std::size_t i = 0; i <= RememberedSettings::kMost; ++i) {
        visit(surface(std::to_string(i), "1"), settings(300));
    }
    EXPECT_EQ(visit(surface("0", "1"), {}), Settings());
    EXPECT_EQ(visit(surface("1", "1"), {}), settings(300));
}

}  // namespace
}  // namespace VexaTouch::Tools::Daemon
