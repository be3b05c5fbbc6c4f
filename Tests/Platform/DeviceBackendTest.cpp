#include "Platform/DeviceBackend.h"

#include "Platform/HidDevice.h"

#include <gtest/gtest.h>

#include <fcntl.h>
#include <unistd.h>
#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <thread>
#include <utility>
#include <vector>

namespace Vexa {
namespace {

// Overrides what it must and counts its ends.
class Plain : public DeviceBackend {
public:
    explicit Plain(std::atomic<int>& ends) noexcept : ends_(&ends) {}
    ~Plain() override { ++*ends_; }

    vexa_status open(std::uint32_t /*options*/, int& descriptor) noexcept override {
        std::array<int, 2> ends{};
        if (::pipe2(ends.data(), O_CLOEXEC) != 0) return VEXA_STATUS_NO_RESOURCES;
        ::close(ends[1]);
        descriptor = ends[0];
        return VEXA_STATUS_SUCCESS;
    }

private:
    std::atomic<int>* ends_;
};

TEST(DeviceBackend, DoesNothingElseUnlessOverridden) {
    std::atomic<int> ends = 0;
    Plain backend(ends);
    backend.close(0);
    std::array<std::uint8_t, 4> buffer{};
    std::size_t length = buffer.size();
    EXPECT_EQ(backend.getReport(VEXA_REPORT_FEATURE, 4, buffer, length), VEXA_STATUS_UNSUPPORTED);
    EXPECT_FALSE(backend.property("key"));
    EXPECT_FALSE(backend.setProperty("key", 1));
    backend.reportArrived({});
    backend.reportHandled();
}

TEST(DeviceRegistration, GivesEachBackendItsOwnHandle) {
    std::atomic<int> ends = 0;
    const DeviceRegistration first(std::make_shared<Plain>(ends));
    const DeviceRegistration second(std::make_shared<Plain>(ends));
    EXPECT_NE(first.service(), 0U);
    EXPECT_NE(second.service(), 0U);
    EXPECT_NE(first.service(), second.service());
    EXPECT_TRUE(HidDevice::create(first.service()));
}

TEST(DeviceRegistration, MakesTheBackendLastAsLongAsItOrADeviceDoes) {
    std::atomic<int> ends = 0;
    auto registration = std::make_unique<DeviceRegistration>(std::make_shared<Plain>(ends));
    HidDevice device = HidDevice::create(registration->service());
    EXPECT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
    registration.reset();
    EXPECT_EQ(ends, 0);
    EXPECT_EQ(device.open(0), VEXA_STATUS_ALREADY_OPEN);
    device.reset();
    EXPECT_EQ(ends, 1);
    registration = std::make_unique<DeviceRegistration>(std::make_shared<Plain>(ends));
    registration.reset();
    EXPECT_EQ(ends, 2);
}

TEST(DeviceRegistration, MayShareTheBackendWithOthers) {
    std::atomic<int> ends = 0;
    auto backend = std::make_shared<Plain>(ends);
    {
        const DeviceRegistration first(backend);
        const DeviceRegistration second(backend);
        EXPECT_NE(first.service(), second.service());
    }
    EXPECT_EQ(ends, 0);
    backend.reset();
    EXPECT_EQ(ends, 1);
}

TEST(DeviceRegistration, SurvivesManyAtOnce) {
    std::atomic<int> ends = 0;
    {
        std::vector<std::jthread> threads;
        for (int i = 0; i < 4; ++i) {
            threads.emplace_back([&ends] {
                for (int j = 0; j < 500; ++j) {
                    auto registration =
                        std::make_unique<DeviceRegistration>(std::make_shared<Plain>(ends));
                    const HidDevice device = HidDevice::create(registration->service());
                    EXPECT_TRUE(device);
                    registration.reset();
                    EXPECT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
                }
            });
        }
    }
    EXPECT_EQ(ends, 2000);
}

}  // namespace
}  // namespace Vexa
