// A process of its own, since it replaces the heap's operators by ones that fail when told to.

#include "Tests/Support/CountedHeap.h"
#include "Tests/Support/LeakCheck.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>

namespace VexaTouch::Testing {
namespace {

using testing::AnyOf;
using testing::Eq;
using Vexa::PropertyValue;

/// Calls the slot again and again, with the first, the second, the third ... piece of memory that
/// its thread asks for missing, until it asks for no more. Each answer must match, the last one
/// too.
template <typename Slot, typename Matcher>
void expectEachAnswer(const Slot& slot, const Matcher& matcher) {
    std::size_t failing = 0;
    bool hasFailed = true;
    while (hasFailed) {
        failingAllocation = ++failing;
        const auto answer = slot();
        hasFailed = failingAllocation == 0;
        failingAllocation = 0;
        EXPECT_THAT(answer, matcher) << "without piece " << failing;
        ASSERT_LT(failing, 10'000U);
    }
    EXPECT_GT(failing, 1U) << "takes no memory at all";
}

class ServiceWithoutMemoryTest : public testing::Test {
protected:
    static constexpr vexa_status kNoResources = VEXA_STATUS_NO_RESOURCES;

    ServiceStand stand{VEXATOUCH_PLUGIN_FILE};
};

TEST_F(ServiceWithoutMemoryTest, AFactoryMakesNothing) {
    const LoadedPlugin plugin(VEXATOUCH_PLUGIN_FILE);
    expectEachAnswer(
        [&] {
            void* const made = plugin.make();
            if (made == nullptr) return false;
            auto* const service = static_cast<vexa_plugin_interface**>(made);
            (*service)->Release(service);
            return true;
        },
        AnyOf(Eq(false), Eq(true)));
}

TEST_F(ServiceWithoutMemoryTest, StartSaysThatResourcesAreMissing) {
    expectEachAnswer([&] { return stand.service.start(stand.registration.service()); },
                     AnyOf(Eq(kNoResources), Eq(VEXA_STATUS_SUCCESS)));
    EXPECT_EQ(stand.service.start(stand.registration.service()), VEXA_STATUS_SUCCESS);
}

TEST_F(ServiceWithoutMemoryTest, APropertyHasNoValue) {
    stand.device->setFeatureReport(4, {4, 1, 2});
    stand.startUp();
    ASSERT_TRUE(stand.feed({imageReport(nothing(), 1, 10)}));
    for (const std::string name : {"Version", "Recording", "DisjointImageCount"}) {
        const PropertyValue key(name);
        const PropertyValue whole = stand.service.get(key);
        ASSERT_TRUE(whole) << name;
        expectEachAnswer([&] { return stand.service.get(key); },
                         AnyOf(Eq(PropertyValue()), Eq(whole)));
    }
    stand.tearDown();
}

TEST_F(ServiceWithoutMemoryTest, SchedulingLogsAndLeavesNothingRunning) {
    ASSERT_EQ(stand.service.start(stand.registration.service()), VEXA_STATUS_SUCCESS);
    // What is expected, again and again, is not shown.
    Vexa::Log::setLevel(Vexa::LogCategory::HIDService, Vexa::LogLevel::Off);
    const LeakCheck leaks;
    std::uint64_t handled = 0;
    int deaf = 0;
    expectEachAnswer(
        [&] {
            stand.service.schedule(stand.queue);
            const std::size_t left = std::exchange(failingAllocation, 0);
            const bool isOpen = stand.service.open();
            const bool isTaken = isOpen && stand.device->sendReport(firmwareReport(7)) &&
                                 left != 0 && stand.device->waitUntilHandled(++handled);
            deaf += isTaken ? 0 : 1;
            stand.service.close();
            stand.service.unschedule(stand.queue);
            failingAllocation = left;
            return isOpen;
        },
        Eq(true));
    EXPECT_GT(deaf, 0);
    EXPECT_EQ(handled, 1U);
    Vexa::Log::setLevel(Vexa::LogCategory::HIDService, Vexa::LogLevel::Error);
    leaks.expectNothingLeft();
}

}  // namespace
}  // namespace VexaTouch::Testing
