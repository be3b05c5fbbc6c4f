// The plug is pulled at every stage of a service's life.

#include "Host/HostFailure.h"
#include "Tests/Kernel/KernelSurface.h"
#include "Tests/Support/LiveObjects.h"

#include <algorithm>
#include <future>

namespace VexaTouch::Testing {
namespace {

using Vexa::PropertyValue;

struct Stage {
    std::string name;
    bool begins;   ///< whether the session begins
    bool answers;  ///< whether the device answers afterwards
};

void PrintTo(const Stage& stage, std::ostream* out) {  // NOLINT: the name is GoogleTest's
    *out << stage.name;
}

class UnplugKernelTest : public ::testing::TestWithParam<Stage> {
protected:
    void unplugAt(std::string_view moment) {
        if (moment == GetParam().name) surface_.reset();
    }
    std::unique_ptr<UhidDevice> surface_;
};

/// A session on a surface that stays.
void expectServiceWorks() {
    UhidDevice surface({.serial = "successor"});
    KernelSession session(std::make_shared<Vexa::HidrawDevice>(nodeOf(surface)));
    session->begin();
    surface.send(kReset);
    EXPECT_TRUE(session.events.waitUntil(1));
    EXPECT_EQ(session->property("CriticalErrors"), PropertyValue(0U));
    session->end();
}

TEST_P(UnplugKernelTest, EveryStepReturnsAndTheNextSurfaceWorks) {
    const LiveObjects before = LiveObjects::now();
    {
        surface_ = std::make_unique<UhidDevice>(UhidDevice::Identity{.serial = "unplugged"});
        const auto device = std::make_shared<HookedHidraw>(
            nodeOf(*surface_), [this](const std::string& moment) { unplugAt(moment); });
        unplugAt("before start");
        KernelSession session(device);
        unplugAt("after start");
        bool begun = true;
        try {
            session->begin();
        } catch (const Host::HostFailure&) {
            begun = false;
        }
        EXPECT_EQ(begun, GetParam().begins);
        unplugAt("after begin");
        if (surface_) {
            surface_->send(kReset);
            EXPECT_TRUE(session.events.waitUntil(1));
        }
        unplugAt("after a report");
        // Both go to the device itself, which no longer has anything once it is gone.
        const PropertyValue serial = session->property("SerialNumber");
        EXPECT_EQ(static_cast<bool>(serial), surface_ != nullptr);
        const bool isSet = session->setProperty("Colour", "green");
        EXPECT_EQ(isSet, surface_ != nullptr);
        const PropertyValue answer = session->property("CriticalErrors");
        EXPECT_EQ(static_cast<bool>(answer), GetParam().answers);
        if (begun) session->halt();
        unplugAt("after halt");
        session->end();
        unplugAt("after end");
        EXPECT_EQ(device->isGone(), surface_ == nullptr);
        surface_.reset();
    }
    EXPECT_EQ(LiveObjects::now(), before);
    expectServiceWorks();
}

INSTANTIATE_TEST_SUITE_P(
    All, UnplugKernelTest,
    ::testing::Values(Stage{"before start", false, false}, Stage{"after start", false, false},
                      Stage{"open", false, false}, Stage{"open done", true, false},
                      Stage{"after begin", true, false}, Stage{"report done", true, false},
                      Stage{"after a report", true, false}, Stage{"property", true, false},
                      Stage{"setProperty", true, false}, Stage{"getReport", true, false},
                      Stage{"close", true, true}, Stage{"after halt", true, true},
                      Stage{"after end", true, true}, Stage{"never", true, true}),
    [](const auto& test) {
        std::string name = test.param.name;
        std::ranges::replace(name, ' ', '_');
        return name;
    });

/// A feature request waits in the kernel for the device's answer when the plug is pulled.
TEST(PendingRequestUnplugKernelTest, RequestEndsWithoutAnAnswerAndTheNextSurfaceWorks) {
    const LiveObjects before = LiveObjects::now();
    {
        auto surface = std::make_unique<UhidDevice>(UhidDevice::Identity{.serial = "unplugged"},
                                                    UhidDevice::Features::Never);
        const auto device = std::make_shared<Vexa::HidrawDevice>(nodeOf(*surface));
        KernelSession session(device);
        session->begin();
        auto asking =
            std::async(std::launch::async, [&] { return session->property("CriticalErrors"); });
        ASSERT_TRUE(surface->waitUntilAsked(1, kLimit));
        EXPECT_EQ(asking.wait_for(std::chrono::seconds(0)), std::future_status::timeout);
        surface.reset();
        EXPECT_EQ(asking.get(), PropertyValue());
        session->halt();
        session->end();
        EXPECT_TRUE(device->isGone());
    }
    EXPECT_EQ(LiveObjects::now(), before);
    expectServiceWorks();
}

}  // namespace
}  // namespace VexaTouch::Testing
