// Only why there is no keyboard: one that could be made would type on the machine of whoever runs
// the tests.

#include "Host/VirtualKeyboard.h"

#include "Host/HostFailure.h"
#include "Host/KeyMap.h"
#include "Tests/Tools/CommandRun.h"

#include <gtest/gtest.h>
#include <sys/fsuid.h>
#include <sys/stat.h>

#include <filesystem>
#include <string>
#include <thread>

namespace VexaTouch::Host {
namespace {

std::string refusal(const std::string& node) {
    try {
        const VirtualKeyboard keyboard(KeyMap().keys(), node);
    } catch (const HostFailure& failure) {
        return failure.what();
    }
    return "made";
}

TEST(VirtualKeyboardTest, MissingNodeSaysWhichModuleToLoad) {
    const Testing::TemporaryFolder folder;
    const std::string node = folder.path("uinput");
    EXPECT_EQ(refusal(node), "no keyboard: cannot open " + node +
                                 ": No such file or directory (the kernel's module is not loaded; "
                                 "as root: modprobe uinput)");
    EXPECT_TRUE(folder.names().empty());
}

TEST(VirtualKeyboardTest, MissingPermissionSaysHowToGiveIt) {
    const Testing::TemporaryFolder folder;
    const std::string node = folder.file("uinput", "");
    ASSERT_EQ(chmod(node.c_str(), 0), 0);
    std::filesystem::permissions(std::filesystem::path(node).parent_path(),
                                 std::filesystem::perms::all);
    std::string text;
    // As root the thread, and it alone, becomes somebody who may not.
    std::jthread([&] {
        constexpr unsigned kNobody = 65534;
        setfsuid(kNobody);
        text = refusal(node);
    }).join();
    EXPECT_EQ(text, "no keyboard: cannot open " + node +
                        ": Permission denied (run as root, or let a group of yours write to it "
                        "with a udev rule: KERNEL==\"uinput\", GROUP=\"...\", MODE=\"0660\")");
}

TEST(VirtualKeyboardTest, NodeOfSomethingElseIsRefused) {
    const Testing::TemporaryFolder folder;
    const std::string node = folder.file("uinput", "kept");
    EXPECT_EQ(refusal(node), "no keyboard: cannot make one with " + node +
                                 ": Inappropriate ioctl for device (it is not the node of uinput)");
    EXPECT_EQ(Testing::contentOf(node), "kept");
}

}  // namespace
}  // namespace VexaTouch::Host
