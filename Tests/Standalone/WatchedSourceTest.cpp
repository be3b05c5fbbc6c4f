// A process of its own, since /sys, /dev and system calls are replaced by made-up ones.

#include "Tools/Daemon/WatchedSource.h"

#include "Tests/Support/MockedDevices.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/ObservedDevice.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <iostream>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using ::testing::HasSubstr;
using Tools::Daemon::PlugChange;
using Tools::Daemon::PluggedSurface;
using Tools::Daemon::WatchedSource;

/// What a failing operation says; empty when it does not fail.
template <typename Operation>
std::string failureOf(Operation&& operation) {
    try {
        operation();
    } catch (const Tools::Failure& error) {
        return error.what();
    }
    return {};
}

TEST(WatchedSourceTest, ASurfaceIsWhatTheSystemSaysOfIt) {
    MockedDevices devices;
    const MockedIdentity ours;
    const std::string sysPath = devices.plug(3, ours);
    WatchedSource source{Host::SurfaceMatch()};
    const std::vector<PlugChange> changes = source.takeChanges();
    ASSERT_EQ(changes.size(), 1U);
    const PluggedSurface& surface = changes.front().surface;
    EXPECT_EQ(changes.front().kind, PlugChange::Kind::Added);
    EXPECT_EQ(surface.id, sysPath);
    EXPECT_EQ(surface.node, "/dev/hidraw3");
    EXPECT_EQ(surface.name, ours.name);
    EXPECT_EQ(surface.identity(), (Tools::Daemon::SurfaceIdentity{.vendor = ours.vendor,
                                                                  .product = ours.product,
                                                                  .serial = ours.serial,
                                                                  .place = ours.physicalPath}));
    // So that what it sent before an unplug is waited for.
    EXPECT_TRUE(surface.open()->property(Tools::ObservedDevice::kReadsOnKey));
}

TEST(WatchedSourceTest, AnotherDeviceThatHasGotTheNodeIsNotOpened) {
    MockedDevices devices;
    devices.plug(0);
    WatchedSource source{Host::SurfaceMatch()};
    const PluggedSurface surface = source.takeChanges().at(0).surface;
    devices.unplug(0);
    devices.plug(0);
    EXPECT_THAT(failureOf([&] { surface.open(); }),
                HasSubstr("/dev/hidraw0: the device that had this node was unplugged"));
}

TEST(WatchedSourceTest, ASurfaceThatCannotBeOpenedSaysWhatToDo) {
    MockedDevices devices;
    devices.plug(0);
    WatchedSource source{Host::SurfaceMatch()};
    const PluggedSurface surface = source.takeChanges().at(0).surface;
    devices.unplug(0);
    EXPECT_THAT(failureOf([&] { surface.open(); }), HasSubstr("(vexatouch devices lists what is"));
}

/// Does something when it is first written to.
class ActingStream final : public std::stringbuf {
public:
    explicit ActingStream(std::function<void()> act) : act_(std::move(act)) {}

protected:
    std::streamsize xsputn(const char* text, std::streamsize size) override {
        if (act_) {
            std::exchange(act_, nullptr)();
        }
        return std::stringbuf::xsputn(text, size);
    }

private:
    std::function<void()> act_;
};

TEST(WatchedSourceTest, ACommandDoesNotOpenAnotherDeviceThatHasGotTheNodeEither) {
    MockedDevices devices;
    devices.plug(0);
    devices.plug(1);
    // It says which of both it takes, between the list and the opening.
    ActingStream replaces([&] {
        devices.unplug(0);
        devices.plug(0);
    });
    std::ostream error(&replaces);
    Tools::Streams streams{.in = std::cin, .out = std::cout, .error = error};
    EXPECT_THAT(
        failureOf([&] { Tools::makeDevice(Tools::DeviceChoice::parse("hidraw"), {}, streams); }),
        HasSubstr("/dev/hidraw0: the device that had this node was unplugged"));
}

TEST(WatchedSourceTest, ADeviceThatIsNamedIsASurface) {
    MockedDevices devices;
    // No report that makes it one.
    const MockedIdentity other{.vendor = 0x1D6B,
                               .product = 2,
                               .descriptor = {0x06, 0x60, 0xFF, 0x09, 0x01, 0xA1, 0x01, 0xC0}};
    devices.plug(0, other);
    EXPECT_EQ(WatchedSource{Host::SurfaceMatch()}.takeChanges().size(), 0U);
    WatchedSource named{Host::SurfaceMatch({{.vendor = 0x1D6B, .product = 2}})};
    EXPECT_EQ(named.takeChanges().size(), 1U);
}

}  // namespace
}  // namespace VexaTouch::Testing
