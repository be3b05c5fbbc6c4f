// A process of its own, since it replaces the function that makes a keyboard of the kernel's: a
// true one would type on the machine of whoever runs the tests.

#include "Tools/KeyOptions.h"

#include "Host/KeyName.h"
#include "Tests/Tools/CommandRun.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <linux/input-event-codes.h>

#include <cerrno>
#include <cstdlib>
#include <set>
#include <sstream>
#include <string>
#include <vector>

namespace {

/// The keys of the keyboard that was asked for last, by name.
std::set<std::string> declared;

}  // namespace

// Of the library that knows the kernel's input devices.
struct libevdev;
struct libevdev_uinput;

extern "C" {

int libevdev_has_event_code(const libevdev* device, unsigned type, unsigned code);

__attribute__((visibility("default"))) int libevdev_uinput_create_from_device(
    const libevdev* description, int /*node*/, libevdev_uinput** /*made*/) {
    declared.clear();
    for (unsigned code = 0; code < KEY_CNT; ++code) {
        if (libevdev_has_event_code(description, EV_KEY, code) != 0) {
            declared.insert(
                std::string(VexaTouch::Host::keyName(static_cast<VexaTouch::Host::KeyCode>(code))));
        }
    }
    return -EPERM;
}

}  // extern "C"

namespace VexaTouch::Testing {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;

class KeyOptionsTest : public ::testing::Test {
protected:
    KeyOptionsTest() { setenv("VEXATOUCH_UINPUT", node_.c_str(), 1); }
    ~KeyOptionsTest() override { unsetenv("VEXATOUCH_UINPUT"); }

    /// The kernel drops the strokes of keys that a keyboard has not, and says nothing.
    std::set<std::string> keysOf(const std::vector<std::string>& changes) {
        EXPECT_EQ(Tools::makeKeyboard(Tools::parseKeyMap(changes), "run", streams_), nullptr);
        return declared;
    }

    const TemporaryFolder folder_;
    const std::string node_ = folder_.file("uinput", "");
    std::istringstream in_;
    std::ostringstream out_;
    std::ostringstream error_;
    Tools::Streams streams_{.in = in_, .out = out_, .error = error_};
};

TEST_F(KeyOptionsTest, TheKeyboardHasTheKeysOfTheMapAndNoOthers) {
    EXPECT_THAT(keysOf({}),
                ElementsAre("KEY_ASSISTANT", "KEY_PLAYPAUSE", "KEY_VOLUMEDOWN", "KEY_VOLUMEUP"));
    EXPECT_THAT(keysOf({"tap:1=KEY_NEXTSONG", "hold:1=none"}),
                ElementsAre("KEY_NEXTSONG", "KEY_VOLUMEDOWN", "KEY_VOLUMEUP"));
    EXPECT_THAT(keysOf({"tap:1=KEY_A", "tap:2=KEY_B", "tap:3=none", "hold:1=KEY_A", "hold:2=none",
                        "hold:3=none"}),
                ElementsAre("KEY_A", "KEY_B"));
    EXPECT_THAT(error_.str(), HasSubstr("vexatouch run: no keyboard: "));
    EXPECT_THAT(error_.str(), HasSubstr("; going on without keys\n"));
}

}  // namespace
}  // namespace VexaTouch::Testing
