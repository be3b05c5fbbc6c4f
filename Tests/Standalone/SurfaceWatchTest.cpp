// A process of its own, since /sys, /dev and udev's events are replaced by made-up ones.

#include "Host/SurfaceWatch.h"

#include "Tests/Support/FewDescriptors.h"
#include "Tests/Support/LogCapture.h"
#include "Tests/Support/MockedDevices.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <dlfcn.h>
#include <poll.h>
#include <sys/socket.h>
#include <array>
#include <atomic>
#include <cerrno>
#include <ostream>
#include <string>
#include <vector>

namespace {

/// The next look into a socket finds that it overflowed and lost all, as a netlink socket that
/// nobody reads.
constinit std::atomic<bool> overflows = false;

}  // namespace

namespace VexaTouch::Host {

// Found by the tests' printer.
static void PrintTo(const SurfaceChange& change, std::ostream* out) {
    static constexpr std::array kKinds = {"added ", "removed ", "changed "};
    *out << kKinds.at(static_cast<std::size_t>(change.kind)) << change.surface.node << ' '
         << change.surface.sysPath << " \"" << change.surface.name << "\", "
         << change.surface.reportDescriptor.size() << " bytes";
}

}  // namespace VexaTouch::Host

extern "C" __attribute__((visibility("default"))) ssize_t recv(int socket, void* buffer,
                                                               std::size_t length, int flags) {
    static const auto next = reinterpret_cast<decltype(&::recv)>(::dlsym(RTLD_NEXT, "recv"));
    if (overflows.exchange(false)) {
        std::array<char, 1> lost{};
        while (next(socket, lost.data(), lost.size(), MSG_DONTWAIT) >= 0) {
        }
        errno = ENOBUFS;
        return -1;
    }
    return next(socket, buffer, length, flags);
}

namespace VexaTouch::Testing {
namespace {

using Host::Surface;
using Host::SurfaceChange;
using Host::SurfaceMatch;
using Host::SurfaceWatch;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr auto kAdded = SurfaceChange::Kind::Added;
constexpr auto kRemoved = SurfaceChange::Kind::Removed;
constexpr auto kChanged = SurfaceChange::Kind::Changed;

/// A descriptor of nothing.
const std::vector<std::uint8_t> kNoReports = {0x06, 0x60, 0xFF, 0x09, 0x01, 0xA1, 0x01, 0xC0};

Surface surfaceOf(const MockedIdentity& identity, unsigned number, const std::string& sysPath) {
    return {.node = MockedDevices::nodeOf(number),
            .sysPath = sysPath,
            .name = identity.name,
            .physicalPath = identity.physicalPath,
            .serial = identity.serial,
            .vendor = identity.vendor,
            .product = identity.product,
            .bus = identity.bus,
            .reportDescriptor = identity.descriptor};
}

/// The changes, once there are events for them.
std::vector<SurfaceChange> nextChanges(SurfaceWatch& watch) {
    pollfd waiting{.fd = watch.descriptor(), .events = POLLIN, .revents = 0};
    EXPECT_EQ(::poll(&waiting, 1, 60'000), 1);
    return watch.takeChanges();
}

class SurfaceWatchTest : public testing::TestWithParam<SurfaceWatch::Events> {
protected:
    MockedDevices devices_;
    const MockedIdentity ours_;
};

TEST_P(SurfaceWatchTest, FindsTheSurfacesThatAreThere) {
    const std::string second = devices_.plug(10, ours_);
    const std::string first = devices_.plug(9, ours_);
    devices_.plug(0, {.name = "Keyboard", .descriptor = kNoReports});
    SurfaceWatch watch(SurfaceMatch(), GetParam());
    EXPECT_THAT(watch.takeChanges(),
                ElementsAre(SurfaceChange{kAdded, surfaceOf(ours_, 9, first)},
                            SurfaceChange{kAdded, surfaceOf(ours_, 10, second)}));
    EXPECT_THAT(watch.takeChanges(), IsEmpty());
}

TEST_P(SurfaceWatchTest, TellsWhatComesAndGoes) {
    SurfaceWatch watch(SurfaceMatch(), GetParam());
    EXPECT_THAT(watch.takeChanges(), IsEmpty());
    const std::string path = devices_.plug(3, ours_);
    const Surface surface = surfaceOf(ours_, 3, path);
    EXPECT_THAT(nextChanges(watch), ElementsAre(SurfaceChange{kAdded, surface}));
    // Whoever triggers udev anew.
    for (const char* action : {"change", "add"}) {
        devices_.announce(3, action);
        EXPECT_THAT(nextChanges(watch), ElementsAre(SurfaceChange{kChanged, surface}));
    }
    devices_.announce(3, "move");
    EXPECT_THAT(nextChanges(watch), IsEmpty());
    devices_.unplug(3);
    EXPECT_THAT(nextChanges(watch), ElementsAre(SurfaceChange{kRemoved, surface}));
    EXPECT_THAT(watch.takeChanges(), IsEmpty());
}

TEST_P(SurfaceWatchTest, IsSilentAboutOtherDevices) {
    SurfaceWatch watch(SurfaceMatch(), GetParam());
    devices_.plug(0, {.name = "Keyboard", .descriptor = kNoReports});
    EXPECT_THAT(nextChanges(watch), IsEmpty());
    devices_.unplug(0);
    EXPECT_THAT(nextChanges(watch), IsEmpty());
}

TEST_P(SurfaceWatchTest, ADescriptorThatChangesAtReplugIsLookedAtAnew) {
    const std::string before = devices_.plug(0, ours_);
    SurfaceWatch watch(SurfaceMatch(), GetParam());
    EXPECT_EQ(watch.takeChanges().size(), 1U);

    // Both events before anybody looks, with the same node for another device.
    devices_.unplug(0);
    const MockedIdentity other{.name = "Updated", .descriptor = kNoReports};
    devices_.plug(0, other);
    std::vector<SurfaceChange> changes = nextChanges(watch);
    EXPECT_THAT(changes, ElementsAre(SurfaceChange{kRemoved, surfaceOf(ours_, 0, before)}));

    devices_.unplug(0);
    const std::string after = devices_.plug(0, ours_);
    EXPECT_THAT(nextChanges(watch), ElementsAre(SurfaceChange{kAdded, surfaceOf(ours_, 0, after)}));
}

TEST_P(SurfaceWatchTest, ASurfaceThatIsNoneAnyMoreIsToldOfOnceWithTheReason) {
    LogCapture log;
    SurfaceWatch watch(SurfaceMatch(), GetParam());
    EXPECT_THAT(watch.takeChanges(), IsEmpty());
    const auto plugAndPull = [&](const MockedIdentity& identity) {
        devices_.plug(0, identity);
        const auto changes = nextChanges(watch);
        devices_.unplug(0);
        nextChanges(watch);
        return changes.size();
    };
    MockedIdentity ours = ours_;
    ours.physicalPath = "port-1/input1";
    MockedIdentity updated = ours;
    updated.physicalPath = "port-2/input1";
    updated.descriptor = kNoReports;
    MockedIdentity anotherInterface = updated;
    anotherInterface.physicalPath = "port-1/input0";
    MockedIdentity anotherUnit = updated;
    anotherUnit.serial = "0002";
    const auto told = ElementsAre(
        error("/dev/hidraw0: no surface any more: no input report 1; no input report 2; no "
              "feature report 4; no feature report 31; no feature report 63"));

    EXPECT_EQ(plugAndPull(updated), 0U);
    EXPECT_THAT(log.take(), IsEmpty()) << "it never was one";
    EXPECT_EQ(plugAndPull(ours), 1U);
    EXPECT_EQ(plugAndPull(anotherInterface), 0U);
    EXPECT_EQ(plugAndPull(anotherUnit), 0U);
    EXPECT_THAT(log.take(), IsEmpty());
    EXPECT_EQ(plugAndPull(updated), 0U);
    EXPECT_THAT(log.take(), told);
    EXPECT_EQ(plugAndPull(updated), 0U);
    EXPECT_THAT(log.take(), IsEmpty());
    EXPECT_EQ(plugAndPull(ours), 1U);
    EXPECT_EQ(plugAndPull(updated), 0U);
    EXPECT_THAT(log.take(), told);
}

TEST_P(SurfaceWatchTest, WithoutDescriptorsASurfaceThatComesIsFoundLater) {
    // Each is missing at another place.
    for (rlim_t left = 0; left < 6; ++left) {
        SCOPED_TRACE(left);
        MockedDevices devices;
        LogCapture log;
        SurfaceWatch watch(SurfaceMatch(), GetParam());
        EXPECT_THAT(watch.takeChanges(), IsEmpty());
        const Surface surface = surfaceOf(ours_, 3, devices.plug(3, ours_));
        std::vector<SurfaceChange> changes;
        {
            const FewDescriptors few(left);
            changes = nextChanges(watch);
            const auto again = watch.takeChanges();
            changes.insert(changes.end(), again.begin(), again.end());
        }
        if (left == 0) {
            EXPECT_THAT(changes, IsEmpty());
        }
        if (changes.empty()) {
            EXPECT_THAT(log.take(),
                        ElementsAre(error("HID devices cannot be looked at: Too many open files; "
                                          "what is known stays, the others are looked at with "
                                          "the next news of a device")));
        }
        devices.plug(0, {.name = "Keyboard", .serial = "K", .descriptor = kNoReports});
        const auto later = nextChanges(watch);
        changes.insert(changes.end(), later.begin(), later.end());
        EXPECT_THAT(changes, ElementsAre(SurfaceChange{kAdded, surface}));
        EXPECT_THAT(log.take(), IsEmpty());
    }
}

TEST_P(SurfaceWatchTest, WithoutDescriptorsWhatIsKnownStays) {
    for (rlim_t left = 0; left < 6; ++left) {
        SCOPED_TRACE(left);
        MockedDevices devices;
        LogCapture log;
        const Surface surface = surfaceOf(ours_, 0, devices.plug(0, ours_));
        SurfaceWatch watch(SurfaceMatch(), GetParam());
        EXPECT_EQ(watch.takeChanges().size(), 1U);
        {
            const FewDescriptors few(left);
            overflows = true;
            EXPECT_THAT(watch.takeChanges(), IsEmpty());
            EXPECT_THAT(watch.takeChanges(), IsEmpty());
        }
        EXPECT_LE(log.take().size(), 1U);
        devices.unplug(0);
        EXPECT_THAT(nextChanges(watch), ElementsAre(SurfaceChange{kRemoved, surface}));
    }
}

TEST_P(SurfaceWatchTest, AnEventOfADeviceThatHasGoneAgainIsNothing) {
    SurfaceWatch watch(SurfaceMatch(), GetParam());
    EXPECT_THAT(watch.takeChanges(), IsEmpty());
    devices_.plug(0, ours_);
    devices_.unplug(0);
    EXPECT_THAT(nextChanges(watch), IsEmpty());
}

TEST_P(SurfaceWatchTest, TwoSurfacesComeAndGoEachByItself) {
    SurfaceWatch watch(SurfaceMatch(), GetParam());
    const Surface first = surfaceOf(ours_, 0, devices_.plug(0, ours_));
    const Surface second = surfaceOf(ours_, 1, devices_.plug(1, ours_));
    EXPECT_THAT(watch.takeChanges(),
                ElementsAre(SurfaceChange{kAdded, first}, SurfaceChange{kAdded, second}));
    devices_.unplug(0);
    EXPECT_THAT(nextChanges(watch), ElementsAre(SurfaceChange{kRemoved, first}));
}

TEST_P(SurfaceWatchTest, MakesTheListAnewWhenEventsWereLost) {
    const Surface stays = surfaceOf(ours_, 0, devices_.plug(0, ours_));
    const Surface goes = surfaceOf(ours_, 1, devices_.plug(1, ours_));
    SurfaceWatch watch(SurfaceMatch(), GetParam());
    EXPECT_EQ(watch.takeChanges().size(), 2U);

    devices_.unplug(1, false);
    const Surface comes = surfaceOf(ours_, 2, devices_.plug(2, ours_));
    overflows = true;
    EXPECT_THAT(watch.takeChanges(),
                ElementsAre(SurfaceChange{kRemoved, goes}, SurfaceChange{kAdded, comes}));
    EXPECT_FALSE(overflows);
}

TEST_P(SurfaceWatchTest, ANamedDeviceNeedsNoReports) {
    const MockedIdentity keyboard{.vendor = 0x1D6B, .product = 2, .descriptor = kNoReports};
    const std::string path = devices_.plug(0, keyboard);
    SurfaceWatch watch(SurfaceMatch({{.vendor = 0x1D6B, .product = 2}}), GetParam());
    EXPECT_THAT(watch.takeChanges(),
                ElementsAre(SurfaceChange{kAdded, surfaceOf(keyboard, 0, path)}));
}

TEST(SurfaceWatchEventsTest, AreThoseThatTheMachineHas) {
    const MockedDevices devices;
    const SurfaceWatch watch{SurfaceMatch()};
    EXPECT_NE(watch.events(), SurfaceWatch::Events::Automatic);
}

INSTANTIATE_TEST_SUITE_P(Both, SurfaceWatchTest,
                         testing::Values(SurfaceWatch::Events::Udev, SurfaceWatch::Events::Kernel),
                         [](const auto& event) {
                             return event.param == SurfaceWatch::Events::Udev ? "Udev" : "Kernel";
                         });

}  // namespace
}  // namespace VexaTouch::Testing
