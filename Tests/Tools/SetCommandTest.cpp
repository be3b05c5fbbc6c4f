#include "Tests/Tools/CommandRun.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cstdlib>
#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::HasSubstr;
using ::testing::StartsWith;

class SetCommandTest : public ::testing::Test {
protected:
    SetCommandTest() { setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1); }
    ~SetCommandTest() override { unsetenv("VEXATOUCH_PLUGIN"); }

    static CommandResult set(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), "set");
        // Those of the daemon are tested with it.
        if (std::ranges::find(arguments, "--device") == arguments.end()) {
            arguments.insert(arguments.end(), {"--device", "sim"});
        }
        return runCommand(arguments);
    }
};

TEST_F(SetCommandTest, ASettingIsWrittenAndReadBack) {
    EXPECT_EQ(set({"Pipeline.Algs.HoldTimeoutMilliseconds", "300"}),
              (CommandResult{0, "Pipeline.Algs.HoldTimeoutMilliseconds: 300\n", ""}));
    EXPECT_EQ(set({"Pipeline.Algs.ActivationThreshold", "150"}),
              (CommandResult{0, "Pipeline.Algs.ActivationThreshold: 150.0\n", ""}));
    EXPECT_EQ(set({"Pipeline.Algs.EnableTapSuppression", "false"}),
              (CommandResult{0, "Pipeline.Algs.EnableTapSuppression: false\n", ""}));
}

TEST_F(SetCommandTest, AValueThatIsNoNumberCountsAs0) {
    EXPECT_EQ(set({"Pipeline.Algs.HoldTimeoutMilliseconds", "\"soon\""}),
              (CommandResult{0, "Pipeline.Algs.HoldTimeoutMilliseconds: 0\n", ""}));
}

TEST_F(SetCommandTest, APropertyOfTheDeviceTakesAnyValue) {
    EXPECT_EQ(set({"Product", "\"My surface\""}),
              (CommandResult{0, "Product: \"My surface\"\n", ""}));
    EXPECT_EQ(set({"--json", "Product", R"([1, {"a": null}])"}),
              (CommandResult{0,
                             "{\n  \"Product\": [\n    1,\n    {\n      \"a\": null\n    }\n  "
                             "]\n}\n",
                             ""}));
}

TEST_F(SetCommandTest, APropertyThatTheDeviceDidNotHaveIsToldOf) {
    EXPECT_EQ(set({"Colour", "2.5"}),
              (CommandResult{0, "Colour: 2.5\n",
                             "vexatouch set: Colour is no setting and was no property: the device "
                             "keeps it, as it does any\n"}));
}

TEST_F(SetCommandTest, ASettingIsKnownByItsLastPartToo) {
    for (const std::string key : {"HoldTimeoutMilliseconds", "Algs.HoldTimeoutMilliseconds"}) {
        EXPECT_EQ(set({key, "300"}),
                  (CommandResult{0, "Pipeline.Algs.HoldTimeoutMilliseconds: 300\n", ""}));
    }
}

TEST_F(SetCommandTest, TheServicesOwnKeysStayAsTheyAre) {
    EXPECT_EQ(set({"Version", "[14]"}), (CommandResult{0, "Version: [13,0,0]\n", ""}));
}

TEST_F(SetCommandTest, WhatCannotBeReadPrintsNothing) {
    EXPECT_EQ(set({"Pipeline.Algs.ResetEventStats", "true"}), (CommandResult{0, "", ""}));
}

TEST_F(SetCommandTest, AValueThatIsNoJsonIsRefused) {
    const CommandResult result = set({"Product", "grey"});
    EXPECT_EQ(result.exitCode, 2);
    EXPECT_THAT(result.error,
                StartsWith("vexatouch set: Product: the value is no JSON: grey (a string needs "
                           "its quotes: '\"grey\"')\n"));
    EXPECT_EQ(set({"Product", ""}).exitCode, 2);
    EXPECT_EQ(set({"Product"}).exitCode, 2);
    EXPECT_EQ(set({"Product", "1", "2"}).exitCode, 2);
}

TEST_F(SetCommandTest, AKeyThatNothingKnowsIsAFailure) {
    const CommandResult unknown = set({"Pipeline.Algs.HoldTimeout", "300"});
    EXPECT_EQ(unknown.exitCode, 1);
    EXPECT_THAT(unknown.error, HasSubstr("nothing knows the key HoldTimeout"));
    const CommandResult readOnly = set({"Pipeline.Algs.EventStats", "300"});
    EXPECT_EQ(readOnly.exitCode, 1);
    EXPECT_THAT(readOnly.error, HasSubstr("read-only"));
    const CommandResult other = set({"Pipeline.DebugInfo", "1"});
    EXPECT_EQ(other.exitCode, 1);
    EXPECT_EQ(other.error,
              "vexatouch set: Pipeline.DebugInfo: nothing knows the key; settings begin with "
              "Pipeline.Algs.\n");
}

}  // namespace
}  // namespace VexaTouch::Testing
