#include "Platform/ScriptedDevice.h"

#include <gmock/gmock.h>

#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>
#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <latch>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

using Bytes = std::vector<std::uint8_t>;
using Call = ScriptedDevice::Call;
using Writes = ScriptedDevice::Writes;

// The reader's end, as the device gave it on open.
class Opened {
public:
    explicit Opened(ScriptedDevice& device, std::uint32_t options = 0) {
        EXPECT_EQ(device.open(options, descriptor_), VEXA_STATUS_SUCCESS);
    }
    ~Opened() {
        if (descriptor_ >= 0) ::close(descriptor_);
    }
    Opened(const Opened&) = delete;
    Opened(Opened&&) = delete;
    Opened& operator=(const Opened&) = delete;
    Opened& operator=(Opened&&) = delete;

    Bytes read() const {
        Bytes bytes(1000);
        const ssize_t count = ::read(descriptor_, bytes.data(), bytes.size());
        EXPECT_GE(count, 0);
        bytes.resize(static_cast<std::size_t>(count));
        return bytes;
    }
    bool hasHungUp() const {
        pollfd state{.fd = descriptor_, .events = POLLIN | POLLRDHUP, .revents = 0};
        ::poll(&state, 1, 0);
        return (state.revents & (POLLHUP | POLLRDHUP)) != 0;
    }
    bool hasReport() const {
        pollfd state{.fd = descriptor_, .events = POLLIN, .revents = 0};
        return ::poll(&state, 1, 0) == 1;
    }

private:
    int descriptor_ = -1;
};

TEST(ScriptedDevice, SendsReportsOfAnyLengthWhole) {
    ScriptedDevice device;
    const Opened reader(device);
    EXPECT_TRUE(device.sendReport(Bytes{1, 2, 3}));
    EXPECT_TRUE(device.sendReport({}));
    EXPECT_TRUE(device.trySendReport(Bytes(700, 9)));
    EXPECT_EQ(reader.read(), (Bytes{1, 2, 3}));
    EXPECT_TRUE(reader.hasReport());
    EXPECT_EQ(reader.read(), Bytes{});
    EXPECT_EQ(reader.read(), Bytes(700, 9));
    EXPECT_FALSE(reader.hasReport());
}

TEST(ScriptedDevice, SendsNothingUnlessOpen) {
    ScriptedDevice device;
    EXPECT_FALSE(device.isOpen());
    EXPECT_FALSE(device.sendReport(Bytes{1}));
    {
        const Opened reader(device);
        EXPECT_TRUE(device.isOpen());
        EXPECT_TRUE(device.sendReport(Bytes{1}));
        device.close(0);
        EXPECT_FALSE(device.isOpen());
        EXPECT_FALSE(device.sendReport(Bytes{2}));
        EXPECT_FALSE(device.trySendReport(Bytes{2}));
    }
    const Opened again(device);
    EXPECT_TRUE(device.sendReport(Bytes{3}));
    EXPECT_EQ(again.read(), Bytes{3});
    EXPECT_FALSE(again.hasReport());
}

TEST(ScriptedDevice, BlocksWhenFullAndLosesNothing) {
    constexpr std::uint32_t kReports = 20'000;
    ScriptedDevice device;
    const Opened reader(device);
    const auto numbered = [](std::uint32_t number) {
        return Bytes{static_cast<std::uint8_t>(number), static_cast<std::uint8_t>(number >> 8)};
    };
    std::atomic<std::uint32_t> sent = 0;
    const std::jthread sender([&] {
        for (std::uint32_t i = 0; i < kReports; ++i) {
            EXPECT_TRUE(device.sendReport(numbered(i)));
            ++sent;
        }
    });
    for (std::uint32_t i = 0; i < kReports; ++i) {
        ASSERT_EQ(reader.read(), numbered(i));
    }
}

TEST(ScriptedDevice, AnswersFalseInsteadOfBlocking) {
    ScriptedDevice device;
    const Opened reader(device);
    std::size_t sent = 0;
    while (device.trySendReport(Bytes{1})) ++sent;
    EXPECT_GT(sent, 0U);
    EXPECT_FALSE(device.trySendReport(Bytes{2}));
    for (std::size_t i = 0; i < sent; ++i) ASSERT_EQ(reader.read(), Bytes{1});
    EXPECT_TRUE(device.trySendReport(Bytes{3}));
    EXPECT_EQ(reader.read(), Bytes{3});
}

// The sender must give up once this is done to its device.
void expectToWakeABlockedSender(const std::function<void(ScriptedDevice&)>& end) {
    ScriptedDevice device;
    const Opened reader(device);
    std::latch full(1);
    const std::jthread sender([&] {
        while (device.trySendReport(Bytes{1})) {
        }
        full.count_down();
        EXPECT_FALSE(device.sendReport(Bytes{2}));
    });
    full.wait();
    end(device);
}

TEST(ScriptedDevice, UnplugWakesABlockedSender) {
    expectToWakeABlockedSender([](ScriptedDevice& device) { device.unplug(); });
}

TEST(ScriptedDevice, CloseWakesABlockedSender) {
    expectToWakeABlockedSender([](ScriptedDevice& device) { device.close(0); });
}

TEST(ScriptedDevice, UnplugLeavesWhatWasSentAndThenTheEnd) {
    ScriptedDevice device;
    const Opened reader(device);
    device.sendReport(Bytes{1});
    EXPECT_FALSE(reader.hasHungUp());
    device.unplug();
    EXPECT_TRUE(reader.hasHungUp());
    EXPECT_EQ(reader.read(), Bytes{1});
    EXPECT_EQ(reader.read(), Bytes{});
    EXPECT_FALSE(device.isOpen());
    device.unplug();
}

TEST(ScriptedDevice, AnswersGoneOnceUnplugged) {
    ScriptedDevice device({{"key", 1}});
    device.setFeatureReport(4, {1});
    device.unplug();
    int descriptor = -1;
    std::array<std::uint8_t, 4> buffer{};
    std::size_t length = 0;
    EXPECT_EQ(device.open(0, descriptor), VEXA_STATUS_GONE);
    EXPECT_EQ(descriptor, -1);
    EXPECT_EQ(device.getReport(VEXA_REPORT_FEATURE, 4, buffer, length), VEXA_STATUS_GONE);
    EXPECT_FALSE(device.property("key"));
    EXPECT_FALSE(device.setProperty("key", 2));
    EXPECT_FALSE(device.sendReport(Bytes{1}));
    EXPECT_EQ(device.properties(), (PropertyValue::Dictionary{{"key", 1}}));
}

TEST(ScriptedDevice, FailsTheNextOpensAsTold) {
    ScriptedDevice device;
    device.setNextOpenStatuses({VEXA_STATUS_IO_ERROR, VEXA_STATUS_SUCCESS, 77});
    int descriptor = -1;
    EXPECT_EQ(device.open(0, descriptor), VEXA_STATUS_IO_ERROR);
    EXPECT_EQ(descriptor, -1);
    {
        const Opened reader(device);
        device.close(0);
    }
    EXPECT_EQ(device.open(0, descriptor), 77U);
    EXPECT_EQ(descriptor, -1);
    const Opened reader(device);
}

TEST(ScriptedDevice, SecondOpenEndsTheFirst) {
    ScriptedDevice device;
    const Opened first(device);
    const Opened second(device);
    EXPECT_TRUE(first.hasHungUp());
    EXPECT_TRUE(device.sendReport(Bytes{1}));
    EXPECT_EQ(second.read(), Bytes{1});
}

TEST(ScriptedDevice, AnswersFeatureReportsAsTold) {
    ScriptedDevice device;
    const auto ask = [&](vexa_report_type type, std::uint32_t id, std::size_t room) {
        Bytes buffer(room);
        std::size_t length = 0;
        const vexa_status status = device.getReport(type, id, buffer, length);
        buffer.resize(length);
        return std::pair(status, buffer);
    };
    EXPECT_EQ(ask(VEXA_REPORT_FEATURE, 4, 8), std::pair(VEXA_STATUS_UNSUPPORTED, Bytes{}));
    device.setFeatureReport(4, {1, 2, 3});
    EXPECT_EQ(ask(VEXA_REPORT_FEATURE, 4, 8), std::pair(VEXA_STATUS_SUCCESS, Bytes{1, 2, 3}));
    EXPECT_EQ(ask(VEXA_REPORT_FEATURE, 4, 2), std::pair(VEXA_STATUS_SUCCESS, Bytes{1, 2}));
    EXPECT_EQ(ask(VEXA_REPORT_INPUT, 4, 8), std::pair(VEXA_STATUS_UNSUPPORTED, Bytes{}));
    device.setFeatureReportStatus(4, VEXA_STATUS_IO_ERROR);
    EXPECT_EQ(ask(VEXA_REPORT_FEATURE, 4, 8), std::pair(VEXA_STATUS_IO_ERROR, Bytes{}));
    device.setFeatureReport(4, {});
    EXPECT_EQ(ask(VEXA_REPORT_FEATURE, 4, 8), std::pair(VEXA_STATUS_SUCCESS, Bytes{}));
}

TEST(ScriptedDevice, StoresAcceptsOrRefusesWrites) {
    ScriptedDevice device({{"a", 1}});
    EXPECT_TRUE(device.setProperty("a", 2));
    EXPECT_TRUE(device.setProperty("b", 3));
    EXPECT_EQ(device.property("a"), PropertyValue(2));
    EXPECT_EQ(device.property("b"), PropertyValue(3));
    EXPECT_FALSE(device.property("c"));
    EXPECT_FALSE(device.property(5));
    EXPECT_FALSE(device.setProperty(5, 5));
    device.setWrites(Writes::Accepted);
    EXPECT_TRUE(device.setProperty("a", 4));
    device.setWrites(Writes::Refused);
    EXPECT_FALSE(device.setProperty("a", 5));
    device.setPropertyValue("c", 6);
    EXPECT_EQ(device.properties(), (PropertyValue::Dictionary{{"a", 2}, {"b", 3}, {"c", 6}}));
}

TEST(ScriptedDevice, ListsTheCallsInTheirOrder) {
    ScriptedDevice device;
    EXPECT_THAT(device.calls(), IsEmpty());
    std::array<std::uint8_t, 4> buffer{};
    std::size_t length = 0;
    {
        const Opened reader(device, 1);
        device.getReport(VEXA_REPORT_OUTPUT, 31, buffer, length);
        static_cast<void>(device.property("a"));
        device.setProperty("b", 2);
        device.reportHandled();
        device.close(3);
    }
    EXPECT_THAT(
        device.calls(),
        ElementsAre(
            Call{.operation = "open", .options = 1},
            Call{.operation = "getReport", .type = VEXA_REPORT_OUTPUT, .reportId = 31, .room = 4},
            Call{.operation = "property", .key = "a"},
            Call{.operation = "setProperty", .key = "b", .value = 2},
            Call{.operation = "close", .options = 3}));
    EXPECT_EQ(device.callCount("property"), 1U);
    EXPECT_EQ(device.callCount("reportHandled"), 0U);
    EXPECT_EQ(device.handled(), 1U);
}

TEST(ScriptedDevice, CallsTheHookOnEntryOfEachOperation) {
    ScriptedDevice device;
    std::vector<std::string_view> entered;
    device.setHook([&](std::string_view operation) {
        entered.push_back(operation);
        // No lock is held.
        device.setPropertyValue("entered", PropertyValue(operation));
    });
    std::array<std::uint8_t, 4> buffer{};
    std::size_t length = 0;
    {
        const Opened reader(device);
        device.getReport(VEXA_REPORT_FEATURE, 4, buffer, length);
        EXPECT_EQ(device.property("entered"), PropertyValue("property"));
        device.setProperty("b", 2);
        device.reportHandled();
        device.close(0);
        device.setHook({});
        device.close(0);
    }
    EXPECT_THAT(entered, ElementsAre("open", "getReport", "property", "setProperty",
                                     "reportHandled", "close"));
}

TEST(ScriptedDevice, HookMayPullThePlugInTheMiddle) {
    ScriptedDevice device;
    device.setHook([&](std::string_view operation) {
        if (operation == ScriptedDevice::kOpen) device.unplug();
    });
    int descriptor = -1;
    EXPECT_EQ(device.open(0, descriptor), VEXA_STATUS_GONE);
}

TEST(ScriptedDevice, WaitsUntilSoManyReportsAreHandled) {
    ScriptedDevice device;
    EXPECT_TRUE(device.waitUntilHandled(0));
    std::latch waiting(3);
    std::vector<std::jthread> waiters;
    for (const std::uint64_t target : {10U, 500U, 1000U}) {
        waiters.emplace_back([&, target] {
            waiting.count_down();
            EXPECT_TRUE(device.waitUntilHandled(target));
            EXPECT_GE(device.handled(), target);
        });
    }
    waiting.wait();
    for (int i = 0; i < 1000; ++i) device.reportHandled();
    waiters.clear();
    EXPECT_EQ(device.handled(), 1000U);
    EXPECT_TRUE(device.waitUntilHandled(1000));
}

TEST(ScriptedDevice, WaitsUntilItIsOpenOrNot) {
    ScriptedDevice device;
    EXPECT_TRUE(device.waitUntilOpen(false));
    const std::jthread opener([&] {
        const Opened reader(device);
        EXPECT_TRUE(device.waitUntilOpen(false));
    });
    EXPECT_TRUE(device.waitUntilOpen());
    device.unplug();
}

}  // namespace
}  // namespace Vexa
