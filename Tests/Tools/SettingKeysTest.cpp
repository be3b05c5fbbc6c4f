#include "Tools/SettingKeys.h"

#include "Algorithm/Algs.h"
#include "Algorithm/StateKeys.h"
#include "Pipeline/Pipeline.h"
#include "Tools/Failure.h"

#include <gmock/gmock.h>

#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::ElementsAre;
using ::testing::StartsWith;
using Vexa::PropertyValue;

std::string fault(const std::string& text) {
    try {
        parseSetting(text);
    } catch (const UsageError& error) {
        return error.what();
    }
    return "none";
}

/// The first line: the rest is the list of keys.
std::string reason(const std::string& text) {
    const std::string whole = fault(text);
    return whole.substr(0, whole.find('\n'));
}

TEST(SettingKeysTest, TheThreeFormsOfAKeyMeanTheSame) {
    const Setting expected{"Algs.ActivationThreshold", PropertyValue(150)};
    EXPECT_EQ(parseSetting("Pipeline.Algs.ActivationThreshold=150"), expected);
    EXPECT_EQ(parseSetting("Algs.ActivationThreshold=150"), expected);
    EXPECT_EQ(parseSetting("ActivationThreshold=150"), expected);
}

TEST(SettingKeysTest, OnlyKeysOfTheAlgorithmBecomeTheHosts) {
    EXPECT_EQ(hostKey("EventStats"), "Pipeline.Algs.EventStats");
    EXPECT_EQ(hostKey("VirtualNormalizationFactors.3"),
              "Pipeline.Algs.VirtualNormalizationFactors.3");
    EXPECT_EQ(hostKey("Algs.Anything"), "Pipeline.Algs.Anything");
    for (const std::string key :
         {"Pipeline.Algs.EventStats", "Recording", "Product", "EventStatsX", "", "."}) {
        EXPECT_EQ(hostKey(key), key);
    }
}

TEST(SettingKeysTest, ValuesAreAnyJson) {
    EXPECT_EQ(parseSetting("ActivationThreshold=200.0").value, PropertyValue(200.0));
    EXPECT_EQ(parseSetting("EnableTapSuppression=false").value, PropertyValue(false));
    EXPECT_EQ(parseSetting("EnableTapSuppression=null").value, PropertyValue::null());
    EXPECT_EQ(parseSetting(R"(ActivationThreshold="a=b")").value, PropertyValue("a=b"));
    EXPECT_EQ(parseSetting("HoldTimeoutMilliseconds=18446744073709551615").value,
              PropertyValue(18446744073709551615U));
    EXPECT_EQ(parseSetting("ResetEventStats= [1, {}] ").value,
              PropertyValue(PropertyValue::Array{1, PropertyValue::Dictionary{}}));
    for (const std::string text : {"", "abc", "1,", "{", "'1'", "nan", "0x10", "TRUE"}) {
        EXPECT_EQ(reason("ActivationThreshold=" + text),
                  "--set ActivationThreshold=" + text + ": the value is no JSON");
    }
}

TEST(SettingKeysTest, ANumberMustBeFiniteAsAFloat) {
    for (const std::string number : {"1e400", "-1e400", "1e39", "-3.5e38"}) {
        EXPECT_EQ(
            reason("ActivationThreshold=" + number),
            "--set ActivationThreshold=" + number + ": the value is not finite as a 32-bit float");
    }
    EXPECT_EQ(parseSetting("ActivationThreshold=-3.4e38").value, PropertyValue(-3.4e38));
}

TEST(SettingKeysTest, EveryWritableKeyIsTakenAndReachesTheAlgorithm) {
    for (const StateKeyEntry& entry : kStateKeys) {
        const std::string key = std::string(entry.name) + (entry.indexed ? ".22" : "");
        if (!entry.writable) {
            EXPECT_EQ(reason(key + "=0"), "--set " + key + "=0: the key " + key + " is read-only");
            continue;
        }
        const Setting setting = parseSetting("Pipeline.Algs." + key + "=0");
        Pipeline pipeline;
        pipeline.setState(setting.key, setting.value);
        if (entry.readable) {
            EXPECT_EQ(pipeline.getState(setting.key).toDouble(), 0.0) << key;
        }
    }
}

TEST(SettingKeysTest, KeysThatNothingKnowsAreRefused) {
    for (const std::string key :
         {"", "Foo", "activationThreshold", "ActivationThreshold.1", "Pipeline.ActivationThreshold",
          "Pipeline.Algs.", "VirtualNormalizationFactors", "EventStats.numTaps",
          "Pipeline.Algs.Pipeline.Algs.ActivationThreshold"}) {
        std::string shown = key;
        if (shown.starts_with("Pipeline.Algs.")) {
            shown.erase(0, 14);
        }
        EXPECT_EQ(reason(key + "=1"), "--set " + key + "=1: nothing knows the key " + shown);
    }
}

TEST(SettingKeysTest, AnIndexMustBeThatOfAGroup) {
    for (const std::string index :
         {"23", "-1", "99", "4294967296", "9223372036854775808", "18446744073709551616",
          "-9223372036854775809", "100000000000000000000000000"}) {
        EXPECT_EQ(reason("VirtualNormalizationFactors." + index + "=1"),
                  "--set VirtualNormalizationFactors." + index + "=1: the index is not below 23");
    }
    EXPECT_EQ(parseSetting("VirtualNormalizationFactors.22=0.5").key,
              "Algs.VirtualNormalizationFactors.22");
    // As the algorithm reads it: what is no number is index 0.
    EXPECT_EQ(fault("VirtualNormalizationFactors.=1"), "none");
    EXPECT_EQ(fault("VirtualNormalizationFactors.x=1"), "none");
}

TEST(SettingKeysTest, AWrongSettingListsTheKeysWithTheirDefaultsAndMeaning) {
    EXPECT_EQ(fault("Foo=1"),
              "--set Foo=1: nothing knows the key Foo\n"
              "Keys that can be set (with or without Pipeline.Algs. before them):\n" +
                  settingKeysText());
    EXPECT_EQ(
        settingKeysText(),
        "  ActivationThreshold               pixel value that counts as progress 1.0 (float, "
        "default 200.0)\n"
        "  HoldTimeoutMilliseconds           touch duration in ms after which a touch becomes a "
        "hold (unsigned 32-bit, default 500)\n"
        "  EnableHoldSuppression             whether a low touch score forbids a hold to begin "
        "(boolean, default true)\n"
        "  EnableTapSuppression              whether the tap classifier may reject a tap (boolean, "
        "default true)\n"
        "  VirtualNormalizationFactors.INDEX gain of a pixel group as read back; frames keep the "
        "gain they were built with (float, INDEX 0 to 22)\n"
        "  ResetEventStats                   a write sets every counter to 0");
}

TEST(SettingKeysTest, TheDefaultsInTheListAreThoseOfTheAlgorithm) {
    const Algs algs;
    for (const StateKeyEntry& entry : kStateKeys) {
        if (!entry.defaultValue.empty()) {
            const Setting setting =
                parseSetting(std::string(entry.name) + "=" + std::string(entry.defaultValue));
            EXPECT_EQ(algs.getState(std::string(entry.name)).toDouble(), setting.value.toDouble())
                << entry.name;
        }
    }
}

TEST(SettingKeysTest, SettingsKeepTheirOrderAndTheNameOfTheirOption) {
    const std::vector<std::string> texts = {"ActivationThreshold=1", "ResetEventStats=0",
                                            "ActivationThreshold=2"};
    EXPECT_THAT(parseSettings(texts), ElementsAre(Setting{"Algs.ActivationThreshold", 1},
                                                  Setting{"Algs.ResetEventStats", 0},
                                                  Setting{"Algs.ActivationThreshold", 2}));
    const std::vector<std::string> wrong = {"X=1"};
    try {
        parseSettings(wrong, "--set-b");
        FAIL();
    } catch (const UsageError& error) {
        EXPECT_THAT(error.what(), StartsWith("--set-b X=1: "));
    }
}

}  // namespace
}  // namespace VexaTouch::Tools
