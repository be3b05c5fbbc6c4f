#include "Algorithm/StateKeys.h"

#include "Algorithm/Algs.h"
#include "Tests/Support/PrintCounters.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/StateSnapshot.h"
#include "Tests/Support/Surface.h"

#include <gmock/gmock.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

namespace VexaTouch {
namespace {

using Testing::firstDifference;
using Testing::nothing;
using Testing::Surface;
using Testing::touch;
using Vexa::PropertyValue;
using Dictionary = PropertyValue::Dictionary;

constexpr double kInfinity = std::numeric_limits<double>::infinity();

/// Values that are neither boolean nor number.
const std::vector<PropertyValue> kNoNumbers = {PropertyValue(),
                                               PropertyValue::null(),
                                               "abc",
                                               "200",
                                               PropertyValue::Bytes{1, 2, 3},
                                               PropertyValue::Array{200},
                                               Dictionary{{"ActivationThreshold", 200}}};

TEST(StateKeysTest, DefaultsAreReadWithTheirTypes) {
    const Algs algs;
    EXPECT_EQ(algs.getState("EnableHoldSuppression"), PropertyValue(true));
    EXPECT_EQ(algs.getState("EnableTapSuppression"), PropertyValue(true));
    EXPECT_EQ(algs.getState("HoldTimeoutMilliseconds"), PropertyValue(500U));
    EXPECT_EQ(algs.getState("ActivationThreshold"), PropertyValue(200.0F));
    EXPECT_EQ(algs.getState("VirtualNormalizationFactors.7"), PropertyValue(0.4651F));
    EXPECT_EQ(algs.getState("ActivationThreshold").type(), PropertyValue::Type::Float);
    EXPECT_EQ(algs.getState("EnableHoldSuppression").type(), PropertyValue::Type::Boolean);
    EXPECT_EQ(algs.getState("HoldTimeoutMilliseconds").type(), PropertyValue::Type::Unsigned);
}

TEST(StateKeysTest, CountersAreReadAloneAndAsDebugInformation) {
    Surface surface;
    surface.feel({touch("A").at(350).forMs(120), nothing()});
    const PropertyValue stats = surface.algs.getState("EventStats");
    EXPECT_EQ(stats, surface.algs.eventStats().statsDictionary());
    EXPECT_EQ(stats.member("Dispatched").member("numTaps"), PropertyValue(1U));
    EXPECT_EQ(surface.algs.getState("DebugInfo"), PropertyValue(Dictionary{{"EventStats", stats}}));
}

TEST(StateKeysTest, UnknownKeysHaveNoValueAndAreIgnored) {
    Surface surface;
    surface.feel({touch("A").at(350).forMs(700), nothing()});
    const Surface before = surface;
    for (const std::string& key :
         {std::string(), std::string("."), std::string("activationThreshold"),
          std::string("ActivationThreshold "), std::string("ActivationThreshold."),
          std::string("Algs.ActivationThreshold"), std::string("ActivationThreshold\0", 20),
          std::string("\0ActivationThreshold", 20), std::string("VirtualNormalizationFactors"),
          std::string("VirtualNormalizationFactors3"), std::string("virtualNormalizationFactors.3"),
          std::string("Reset"), std::string("_activationThreshold")}) {
        EXPECT_FALSE(surface.algs.getState(key)) << key;
        surface.algs.setState(key, 7);
        EXPECT_EQ(firstDifference(surface.algs, before.algs), std::nullopt) << key;
    }
}

TEST(StateKeysTest, CountersAreResetByAnyValueAndNothingElseIs) {
    for (const PropertyValue& value : kNoNumbers) {
        Surface surface;
        surface.feel({touch("A").at(350).forMs(120), nothing().forMs(2000), touch("A").at(350)});
        const HandStats hand = surface.hand();
        surface.algs.setState("ResetEventStats", value);
        EXPECT_EQ(surface.counters(), EventStats::Counters());
        EXPECT_EQ(surface.algs.lastDispatchedPhase(), 0x80);
        EXPECT_EQ(surface.hand()._lastEventTimestamp_ms, hand._lastEventTimestamp_ms);
        EXPECT_FALSE(surface.algs.getState("ResetEventStats"));
    }
}

TEST(StateKeysTest, WhatIsOnlyReadIsNotWritten) {
    Surface surface;
    surface.feel({touch("A").at(350).forMs(120), nothing()});
    const Surface before = surface;
    for (const char* key : {"EventStats", "DebugInfo"}) {
        surface.algs.setState(key, 0);
        surface.algs.setState(key, Dictionary{});
        EXPECT_EQ(firstDifference(surface.algs, before.algs), std::nullopt) << key;
    }
}

TEST(StateKeysTest, SwitchesAreTrueForEveryNumberButZero) {
    for (const std::string key : {"EnableHoldSuppression", "EnableTapSuppression"}) {
        Algs algs;
        const auto readsAs = [&](const PropertyValue& value) {
            algs.setState(key, value);
            return algs.getState(key) == PropertyValue(true);
        };
        EXPECT_TRUE(readsAs(true));
        EXPECT_FALSE(readsAs(false));
        EXPECT_TRUE(readsAs(1));
        EXPECT_FALSE(readsAs(0));
        EXPECT_TRUE(readsAs(-1));
        EXPECT_TRUE(readsAs(0.25));
        EXPECT_FALSE(readsAs(0.0));
        EXPECT_FALSE(readsAs(-0.0));
        EXPECT_TRUE(readsAs(1e-300));
        EXPECT_TRUE(readsAs(kInfinity));
        EXPECT_TRUE(readsAs(std::nan("")));
        EXPECT_TRUE(readsAs(std::numeric_limits<std::uint64_t>::max()));
        for (const PropertyValue& value : kNoNumbers) {
            algs.setState(key, true);
            EXPECT_FALSE(readsAs(value)) << value.description();
        }
    }
}

TEST(StateKeysTest, EachSwitchIsItsOwn) {
    Algs algs;
    algs.setState("EnableHoldSuppression", false);
    EXPECT_FALSE(algs.handStats()._enableHoldSuppression);
    EXPECT_TRUE(algs.handStats()._enableTapSuppression);
    algs.setState("EnableTapSuppression", false);
    algs.setState("EnableHoldSuppression", true);
    EXPECT_TRUE(algs.handStats()._enableHoldSuppression);
    EXPECT_FALSE(algs.handStats()._enableTapSuppression);
}

TEST(StateKeysTest, TheHoldTimeoutKeepsTheLowHalf) {
    Algs algs;
    const auto stored = [&algs](const PropertyValue& value) {
        algs.setState("HoldTimeoutMilliseconds", value);
        EXPECT_EQ(algs.getState("HoldTimeoutMilliseconds"),
                  PropertyValue(algs.handStats()._hold_timeout_ms));
        return algs.handStats()._hold_timeout_ms;
    };
    EXPECT_EQ(stored(0), 0U);
    EXPECT_EQ(stored(750), 750U);
    EXPECT_EQ(stored(4294967295), 4294967295U);
    EXPECT_EQ(stored(4294967296), 0U);
    EXPECT_EQ(stored(4294967297), 1U);
    EXPECT_EQ(stored(std::numeric_limits<std::uint64_t>::max()), 4294967295U);
    EXPECT_EQ(stored(-1), 4294967295U);
    EXPECT_EQ(stored(-2.9), 4294967294U);
    EXPECT_EQ(stored(999.99), 999U);
    EXPECT_EQ(stored(300.0F), 300U);
    EXPECT_EQ(stored(true), 1U);
    EXPECT_EQ(stored(1e300), 4294967295U);
    EXPECT_EQ(stored(-1e300), 0U);  // the least signed number has an empty low half
    EXPECT_EQ(stored(kInfinity), 4294967295U);
    EXPECT_EQ(stored(std::nan("")), 0U);
    for (const PropertyValue& value : kNoNumbers) {
        stored(500);
        EXPECT_EQ(stored(value), 0U) << value.description();
    }
}

TEST(StateKeysTest, TheActivationThresholdMayBeAnything) {
    Algs algs;
    const auto stored = [&algs](const PropertyValue& value) {
        algs.setState("ActivationThreshold", value);
        EXPECT_EQ(algs.getState("ActivationThreshold"),
                  PropertyValue(algs.handStats()._activationThreshold));
        return algs.handStats()._activationThreshold;
    };
    EXPECT_EQ(stored(150), 150.0F);
    EXPECT_EQ(stored(0.1), 0.1F);
    EXPECT_EQ(stored(-3), -3.0F);
    EXPECT_EQ(stored(true), 1.0F);
    EXPECT_EQ(stored(16777217), 16777216.0F);  // rounded once, to even
    EXPECT_EQ(stored(std::numeric_limits<std::uint64_t>::max()), 18446744073709551616.0F);
    EXPECT_EQ(stored(1e39), std::numeric_limits<float>::infinity());
    EXPECT_EQ(stored(-1e39), -std::numeric_limits<float>::infinity());
    EXPECT_TRUE(std::isnan(stored(std::nan(""))));
    EXPECT_TRUE(std::signbit(stored(-0.0)));
    for (const PropertyValue& value : kNoNumbers) {
        stored(200);
        EXPECT_EQ(stored(value), 0.0F) << value.description();
    }
}

TEST(StateKeysTest, AFactorIsReadAndWrittenByItsIndex) {
    Algs algs;
    const VirtualImage defaults;
    for (std::size_t i = 0; i < kVirtualPixelCount; ++i) {
        const std::string key = "VirtualNormalizationFactors." + std::to_string(i);
        EXPECT_EQ(algs.getState(key), PropertyValue(defaults._normalizationFactors[i]));
        algs.setState(key, static_cast<double>(i) + 0.5);
        EXPECT_EQ(algs.getState(key), PropertyValue(static_cast<float>(i) + 0.5F));
    }
    EXPECT_EQ(algs.virtualImage()._normalizationFactors.size(), kVirtualPixelCount);
    algs.setState("VirtualNormalizationFactors.3", "abc");
    EXPECT_EQ(algs.getState("VirtualNormalizationFactors.3"), PropertyValue(0.0F));
}

TEST(StateKeysTest, AnIndexReadsAsTheBeginningOfADecimalNumber) {
    Algs algs;
    for (int i = 0; i < 23; ++i) {
        algs.setState("VirtualNormalizationFactors." + std::to_string(i), i);
    }
    const auto factor = [&algs](const std::string& index) {
        return algs.getState("VirtualNormalizationFactors." + index);
    };
    EXPECT_EQ(factor("22"), PropertyValue(22.0F));
    EXPECT_EQ(factor("+7"), PropertyValue(7.0F));
    EXPECT_EQ(factor(" \t\n5"), PropertyValue(5.0F));
    EXPECT_EQ(factor("007"), PropertyValue(7.0F));
    EXPECT_EQ(factor("5x"), PropertyValue(5.0F));
    EXPECT_EQ(factor("4.4"), PropertyValue(4.0F));
    EXPECT_EQ(factor("1e1"), PropertyValue(1.0F));
    EXPECT_EQ(factor(std::string("6\0007", 3)), PropertyValue(6.0F));
    // No number is index 0.
    for (const char* text : {"", "abc", "x5", "-", "+", ".", "-x"}) {
        EXPECT_EQ(factor(text), PropertyValue(0.0F)) << text;
    }
    EXPECT_EQ(factor("0x5"), PropertyValue(0.0F));
    EXPECT_EQ(factor("-0"), PropertyValue(0.0F));
}

TEST(StateKeysTest, AnIndexOutOfRangeHasNoValueAndIsIgnored) {
    Algs algs;
    const Algs before = algs;
    for (const char* index :
         {"23", "-1", "-23", "24", "255", "2147483647", "2147483648", "4294967295", "4294967296",
          "4294967297", "-4294967295", "9223372036854775807", "9223372036854775808",
          "18446744073709551615", "18446744073709551616", "99999999999999999999999",
          "-99999999999999999999999"}) {
        const std::string key = std::string("VirtualNormalizationFactors.") + index;
        EXPECT_FALSE(algs.getState(key)) << key;
        algs.setState(key, 9.0);
        EXPECT_EQ(firstDifference(algs, before), std::nullopt) << key;
    }
}

TEST(StateKeysTest, TheTableOfKeysTellsTheTruth) {
    for (const StateKeyEntry& entry : kStateKeys) {
        Surface surface;
        surface.feel({touch("A").at(350).forMs(120), nothing()});
        const Surface before = surface;
        const std::string key = std::string(entry.name) + (entry.indexed ? ".3" : "");
        EXPECT_EQ(static_cast<bool>(surface.algs.getState(key)), entry.readable) << key;
        surface.algs.setState(key, 0);
        EXPECT_EQ(firstDifference(surface.algs, before.algs).has_value(), entry.writable) << key;
    }
}

}  // namespace
}  // namespace VexaTouch
