#include "Host/KeyMap.h"
#include "Tests/Tools/CommandRun.h"
#include "Tools/EventRecord.h"
#include "Tools/KeyOptions.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <linux/input-event-codes.h>

#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::HasSubstr;
using ::testing::StartsWith;

TEST(KeysCommandTest, PrintsTheKeysThatGesturesSend) {
    EXPECT_EQ(runCommand({"keys"}),
              (CommandResult{0,
                             "gesture  key             effect\n"
                             "tap:1    KEY_PLAYPAUSE   pressed and released\n"
                             "tap:2    KEY_VOLUMEDOWN  pressed and released\n"
                             "tap:3    KEY_VOLUMEUP    pressed and released\n"
                             "hold:1   KEY_ASSISTANT   down as long as the hold\n"
                             "hold:2   KEY_VOLUMEDOWN  down as long as the hold\n"
                             "hold:3   KEY_VOLUMEUP    down as long as the hold\n",
                             ""}));
}

TEST(KeysCommandTest, PrintsWhatWasChanged) {
    EXPECT_EQ(runCommand({"keys", "--key", "tap:1=KEY_SELECTIVE_SCREENSHOT", "--key", "hold:1=none",
                          "--key", "hold:2=KEY_MUTE", "--key=hold:2=KEY_REWIND"}),
              (CommandResult{0,
                             "gesture  key                       effect\n"
                             "tap:1    KEY_SELECTIVE_SCREENSHOT  pressed and released\n"
                             "tap:2    KEY_VOLUMEDOWN            pressed and released\n"
                             "tap:3    KEY_VOLUMEUP              pressed and released\n"
                             "hold:1   none                      nothing\n"
                             "hold:2   KEY_REWIND                down as long as the hold\n"
                             "hold:3   KEY_VOLUMEUP              down as long as the hold\n",
                             ""}));
}

TEST(KeysCommandTest, JsonHasAnObjectForEachGesture) {
    const CommandResult result =
        runCommand({"keys", "--json", "--key", "tap:1=KEY_NEXTSONG", "--key", "hold:1=none"});
    EXPECT_EQ(result.exitCode, 0);
    EXPECT_EQ(result.error, "");
    std::string compact;
    for (const char c : result.out) {
        if (c != ' ' && c != '\n') {
            compact += c;
        }
    }
    EXPECT_EQ(compact, R"([{"gesture":"tap","region":1,"key":"KEY_NEXTSONG","code":163},)"
                       R"({"gesture":"tap","region":2,"key":"KEY_VOLUMEDOWN","code":114},)"
                       R"({"gesture":"tap","region":3,"key":"KEY_VOLUMEUP","code":115},)"
                       R"({"gesture":"hold","region":1,"key":null,"code":null},)"
                       R"({"gesture":"hold","region":2,"key":"KEY_VOLUMEDOWN","code":114},)"
                       R"({"gesture":"hold","region":3,"key":"KEY_VOLUMEUP","code":115}])");
}

TEST(KeysCommandTest, WrongKeysAreUsageErrors) {
    for (const std::string command : {"keys", "run"}) {
        EXPECT_EQ(
            runCommand({command, "--key", "tap:4=KEY_A"}),
            (CommandResult{2, "",
                           "vexatouch " + command +
                               ": --key tap:4=KEY_A: there is no region \"4\", only 1 (play), "
                               "2 (volume down) and 3 (volume up)\nTry 'vexatouch " +
                               command + " --help'.\n"}));
        EXPECT_EQ(runCommand({command, "--key", "tap:1=KEY_A", "--key", "hold:1=mute"}),
                  (CommandResult{2, "",
                                 "vexatouch " + command +
                                     ": --key hold:1=mute: there is no key \"mute\"; KEY_MUTE is "
                                     "meant?\nTry 'vexatouch " +
                                     command + " --help'.\n"}));
    }
}

TEST(KeyOptionsTest, HelpAndCompletionNameEveryDefault) {
    for (const Host::DefaultKey& each : Host::kDefaultKeys) {
        const std::string text = std::string(each.trigger) + '=' + std::string(each.name);
        EXPECT_THAT(std::string(Tools::kKeyOption.help), HasSubstr(text));
        EXPECT_THAT(' ' + std::string(Tools::kKeyOption.choices) + ' ',
                    HasSubstr(' ' + std::string(each.trigger) + "= "));
    }
}

TEST(KeyOptionsTest, ManualHasTheDefaults) {
    const std::string manual = contentOf(VEXA_SOURCE_DIR "/docs/operations.md");
    std::string table;
    for (const Host::DefaultKey& each : Host::kDefaultKeys) {
        const auto kind = each.gesture == Host::KeyGesture::Tap ? Tools::EventKind::Tap
                                                                : Tools::EventKind::HoldStart;
        table += "| `" + std::string(each.trigger) + "` | " +
                 std::string(Tools::regionMeaning(kind, each.region)) + " | `" +
                 std::string(each.name) + "` (" + std::to_string(each.key) + ") |";
        table += each.gesture == Host::KeyGesture::Tap ? " pressed and released |\n"
                                                       : " down as long as the hold |\n";
    }
    EXPECT_THAT(manual, HasSubstr(table));
}

class RunWithKeysTest : public ::testing::Test {
protected:
    RunWithKeysTest() {
        setenv("VEXATOUCH_PLUGIN", VEXATOUCH_PLUGIN_FILE, 1);
        setenv("VEXATOUCH_UINPUT", node.c_str(), 1);
    }
    ~RunWithKeysTest() override {
        unsetenv("VEXATOUCH_PLUGIN");
        unsetenv("VEXATOUCH_UINPUT");
    }

    static CommandResult run(std::vector<std::string> arguments) {
        arguments.insert(
            arguments.begin(),
            {"run", "--json", "--device", "recording:" VEXA_SOURCE_DIR "/Examples/taps.json@max"});
        return runCommand(arguments);
    }

    TemporaryFolder folder;
    const std::string node = folder.path("uinput");
};

TEST_F(RunWithKeysTest, WithoutUinputItSaysWhatToDoAndGoesOn) {
    const auto events = Tools::readExpectedEvents(VEXA_SOURCE_DIR "/Examples/taps.events");
    const std::vector<std::vector<std::string>> wishes = {
        {"--keys"}, {"--key", "tap:1=KEY_NEXTSONG"}, {"--keys", "--key", "tap:1=none"}};
    for (const auto& wish : wishes) {
        const CommandResult result = run(wish);
        EXPECT_EQ(result.exitCode, 0) << result;
        EXPECT_THAT(result.error,
                    StartsWith("vexatouch run: no keyboard: cannot open " + node +
                               ": No such file or directory (the kernel's module is not loaded; as "
                               "root: modprobe uinput); going on without keys\n"));
        EXPECT_EQ(linesOf(result.out).size(), events.size());
    }
}

TEST_F(RunWithKeysTest, KeysAreNotSentUnlessAskedFor) {
    EXPECT_THAT(run({}).error, ::testing::Not(HasSubstr("key")));
}

}  // namespace
}  // namespace VexaTouch::Testing
