// Surfaces that come and go, as udev and the kernel tell.

#include "Host/SurfaceWatch.h"
#include "Tests/Kernel/KernelSurface.h"
#include "Tests/Support/LiveObjects.h"

#include <gmock/gmock.h>
#include <poll.h>

#include <filesystem>
#include <iterator>
#include <optional>
#include <thread>

namespace VexaTouch::Testing {
namespace {

using Host::SurfaceChange;
using Host::SurfaceMatch;
using Host::SurfaceWatch;
using ::testing::IsEmpty;
using ::testing::SizeIs;

/// A HID device that is no surface: a mouse with one button.
const std::vector<std::uint8_t> kMouse = {
    0x05, 0x01, 0x09, 0x02, 0xA1, 0x01, 0x05, 0x09, 0x19, 0x01, 0x29, 0x01, 0x15, 0x00, 0x25,
    0x01, 0x95, 0x01, 0x75, 0x01, 0x81, 0x02, 0x95, 0x01, 0x75, 0x07, 0x81, 0x03, 0x05, 0x01,
    0x09, 0x30, 0x09, 0x31, 0x15, 0x81, 0x25, 0x7F, 0x75, 0x08, 0x95, 0x02, 0x81, 0x06, 0xC0};

/// The next change, or none after the limit.
std::optional<SurfaceChange> nextChange(SurfaceWatch& watch) {
    static std::vector<SurfaceChange> waiting;
    const auto end = std::chrono::steady_clock::now() + kLimit;
    while (waiting.empty() && std::chrono::steady_clock::now() < end) {
        pollfd descriptor{.fd = watch.descriptor(), .events = POLLIN, .revents = 0};
        poll(&descriptor, 1, 1000);
        waiting = watch.takeChanges();
    }
    if (waiting.empty()) return std::nullopt;
    SurfaceChange change = waiting.front();
    waiting.erase(waiting.begin());
    return change;
}

::testing::AssertionResult isChange(const std::optional<SurfaceChange>& change,
                                    SurfaceChange::Kind kind, const std::string& serial) {
    if (!change) return ::testing::AssertionFailure() << "nothing has changed";
    if (change->kind != kind || change->surface.serial != serial) {
        return ::testing::AssertionFailure()
               << change->surface.node << " with serial number " << change->surface.serial
               << (change->kind == SurfaceChange::Kind::Added ? " came" : " went");
    }
    return ::testing::AssertionSuccess();
}

std::size_t entriesOf(const char* folder) {
    const std::filesystem::directory_iterator entries(folder);
    return static_cast<std::size_t>(std::distance(begin(entries), end(entries)));
}

/// Waits until this process has no more threads than that; false after the limit. A session's last
/// one may still be in its last instructions when the session has ended.
bool hasNoMoreThreadsThan(std::size_t threads) {
    const auto end = std::chrono::steady_clock::now() + kLimit;
    while (entriesOf("/proc/self/task") > threads) {
        if (std::chrono::steady_clock::now() >= end) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return true;
}

TEST(SurfaceWatchKernelTest, UdevTellsWhereItRuns) {
    EXPECT_EQ(SurfaceWatch({}).events(), SurfaceWatch::Events::Udev);
}

TEST(SurfaceWatchKernelTest, SurfaceThatIsThereIsFoundByItsDescriptor) {
    SurfaceWatch watch({});
    EXPECT_THAT(watch.takeChanges(), IsEmpty());
    UhidDevice::Identity mouse{.name = "Mouse", .serial = "mouse"};
    mouse.descriptor = kMouse;
    const UhidDevice other(mouse);
    const UhidDevice surface({.serial = "surface"});
    // The mouse came first, so it would be told first.
    ASSERT_TRUE(isChange(nextChange(watch), SurfaceChange::Kind::Added, "surface"));
    const auto found = Host::findSurfaces({});
    ASSERT_THAT(found, SizeIs(1));
    EXPECT_EQ(found.front().node, nodeOf(surface));
    EXPECT_EQ(found.front().name, "Vexa Touch");
    EXPECT_EQ(found.front().bus, 6U);
    const SurfaceMatch named({SurfaceMatch::Ids::fromText("5658:5454")});
    EXPECT_THAT(Host::findSurfaces(named), SizeIs(2));
}

void plugCycle(SurfaceWatch& watch, const std::string& serial) {
    auto surface = std::make_unique<UhidDevice>(UhidDevice::Identity{.serial = serial});
    const auto added = nextChange(watch);
    ASSERT_TRUE(isChange(added, SurfaceChange::Kind::Added, serial)) << serial;
    KernelSession session(
        std::make_shared<Vexa::HidrawDevice>(added->surface.node, added->surface.sysPath));
    session->begin();
    surface->send(kReset);
    ASSERT_TRUE(session.events.waitUntil(1)) << serial;
    surface.reset();
    ASSERT_TRUE(isChange(nextChange(watch), SurfaceChange::Kind::Removed, serial)) << serial;
    session->end();
}

TEST(SurfaceWatchKernelTest, HundredPlugCyclesLeaveNothingBehind) {
    SurfaceWatch watch({});
    EXPECT_THAT(watch.takeChanges(), IsEmpty());
    // The first one loads and starts what stays.
    ASSERT_NO_FATAL_FAILURE(plugCycle(watch, "warm-up"));
    const std::size_t descriptors = entriesOf("/proc/self/fd");
    const std::size_t threads = entriesOf("/proc/self/task");
    const LiveObjects objects = LiveObjects::now();
    for (int cycle = 0; cycle < 100; ++cycle) {
        ASSERT_NO_FATAL_FAILURE(plugCycle(watch, "cycle " + std::to_string(cycle)));
    }
    EXPECT_TRUE(hasNoMoreThreadsThan(threads)) << threads << " before";
    EXPECT_EQ(entriesOf("/proc/self/fd"), descriptors);
    EXPECT_EQ(LiveObjects::now(), objects);
}

TEST(SurfaceWatchKernelTest, DescriptorThatChangedAtTheReplugIsLookedAtAnew) {
    SurfaceWatch watch({});
    EXPECT_THAT(watch.takeChanges(), IsEmpty());
    auto surface = std::make_unique<UhidDevice>(UhidDevice::Identity{.serial = "same"});
    ASSERT_TRUE(isChange(nextChange(watch), SurfaceChange::Kind::Added, "same"));
    surface.reset();
    ASSERT_TRUE(isChange(nextChange(watch), SurfaceChange::Kind::Removed, "same"));
    UhidDevice::Identity changed{.serial = "same"};
    changed.descriptor = kMouse;
    surface = std::make_unique<UhidDevice>(changed);
    const UhidDevice next({.serial = "next"});
    EXPECT_TRUE(isChange(nextChange(watch), SurfaceChange::Kind::Added, "next"));
}

}  // namespace
}  // namespace VexaTouch::Testing
