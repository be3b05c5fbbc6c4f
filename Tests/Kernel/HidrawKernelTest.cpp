// The hidraw back-end and the service on top of it, against the kernel.

#include "Tests/Kernel/KernelSurface.h"
#include "Tests/Support/LogCapture.h"
#include "Tests/Support/Touch.h"

#include <gmock/gmock.h>

#include <filesystem>
#include <future>

namespace VexaTouch::Testing {
namespace {

using Features = UhidDevice::Features;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Vexa::HidrawDevice;
using Vexa::PropertyValue;

const PropertyValue kNothing;

struct Answer {
    vexa_status status;
    std::vector<std::uint8_t> bytes;

    friend bool operator==(const Answer&, const Answer&) = default;
    friend std::ostream& operator<<(std::ostream& out, const Answer& answer) {
        return out << "status " << answer.status << ", " << ::testing::PrintToString(answer.bytes);
    }
};

Answer featureReport(HidrawDevice& device, std::uint32_t id) {
    std::array<std::uint8_t, 32> room{};
    std::size_t length = 0;
    const vexa_status status = device.getReport(VEXA_REPORT_FEATURE, id, room, length);
    return {status, {room.begin(), room.begin() + static_cast<std::ptrdiff_t>(length)}};
}

/// A surface with an input report that means nothing to the service: the kernel lets only pass what
/// is declared.
UhidDevice::Identity withReportThree() {
    UhidDevice::Identity identity;
    constexpr std::array<std::uint8_t, 16> kReport = {
        0x85, 0x03,              // Report ID (3)
        0x15, 0x00,              // Logical Minimum (0)
        0x26, 0xFF, 0x00,        // Logical Maximum (255)
        0x75, 0x08, 0x95, 0x04,  // Report Size (8), Report Count (4)
        0x09, 0x40, 0x81, 0x02,  // four bytes: Input (Variable)
        0xC0,                    // End Collection
    };
    identity.descriptor.pop_back();
    identity.descriptor.insert(identity.descriptor.end(), kReport.begin(), kReport.end());
    return identity;
}

TEST(HidrawKernelTest, PropertiesAreTheDevicesAndKeepWhatIsWritten) {
    UhidDevice::Identity identity;
    identity.name = "Surface of the test";
    identity.physicalPath = "place/7";
    identity.serial = "S 42";
    const UhidDevice surface(identity);
    HidrawDevice device(nodeOf(surface));
    EXPECT_EQ(device.property("Bus"), PropertyValue(6U));
    EXPECT_EQ(device.property("VendorID"), PropertyValue(0x5658U));
    EXPECT_EQ(device.property("ProductID"), PropertyValue(0x5454U));
    EXPECT_EQ(device.property("Product"), PropertyValue("Surface of the test"));
    EXPECT_EQ(device.property("PhysicalPath"), PropertyValue("place/7"));
    EXPECT_EQ(device.property("SerialNumber"), PropertyValue("S 42"));
    EXPECT_EQ(device.property("MaxInputReportSize"), PropertyValue(73U));
    EXPECT_EQ(device.property("ReportDescriptor"), PropertyValue(identity.descriptor));
    EXPECT_EQ(device.property("Colour"), kNothing);
    EXPECT_TRUE(device.setProperty("Colour", "green"));
    EXPECT_EQ(device.property("Colour"), PropertyValue("green"));
}

TEST(HidrawKernelTest, FeatureReportsAreReadThroughTheService) {
    const UhidDevice surface({});
    KernelSession session(std::make_shared<HidrawDevice>(nodeOf(surface)));
    EXPECT_EQ(session->property("FirmwareVersion"), PropertyValue(PropertyValue::Array{1, 0}));
    EXPECT_EQ(session->property("FactoryResetHoldDuration"), PropertyValue(10'000U));
    EXPECT_EQ(session->property("CriticalErrors"), PropertyValue(0U));
}

TEST(HidrawKernelTest, RefusedAndShortAnswersYieldNothingAndTheNextIsReadAgain) {
    UhidDevice surface({}, Features::Refused);
    const auto device = std::make_shared<HidrawDevice>(nodeOf(surface));
    KernelSession session(device);
    EXPECT_EQ(featureReport(*device, 31), (Answer{VEXA_STATUS_IO_ERROR, {}}));
    EXPECT_EQ(session->property("FactoryResetHoldDuration"), kNothing);
    surface.setFeatures(Features::Short);
    EXPECT_EQ(featureReport(*device, 31), (Answer{VEXA_STATUS_SUCCESS, {31, 0x10}}));
    EXPECT_EQ(session->property("FactoryResetHoldDuration"), kNothing);
    surface.setFeatures(Features::Normal);
    EXPECT_EQ(featureReport(*device, 31), (Answer{VEXA_STATUS_SUCCESS, {31, 0x10, 0x27, 0, 0}}));
    EXPECT_EQ(session->property("FactoryResetHoldDuration"), PropertyValue(10'000U));
}

TEST(HidrawKernelTest, AnswerThatNeverComesHoldsUpItsCallerAndNotTheReports) {
    UhidDevice surface({}, Features::Never);
    KernelSession session(std::make_shared<HidrawDevice>(nodeOf(surface)));
    session->begin();
    const auto begin = std::chrono::steady_clock::now();
    auto asking = std::async(std::launch::async, [&] {
        PropertyValue answer = session->property("CriticalErrors");
        return std::pair(std::move(answer), std::chrono::steady_clock::now());
    });
    ASSERT_TRUE(surface.waitUntilAsked(1, kLimit));
    for (std::uint64_t count = 1; count <= 100; ++count) {
        surface.send(kReset);
        ASSERT_TRUE(session.events.waitUntil(count));
    }
    const auto delivered = std::chrono::steady_clock::now();
    const auto [answer, answered] = asking.get();
    EXPECT_EQ(answer, kNothing);
    EXPECT_LT(delivered, answered);
    EXPECT_GE(answered - begin, std::chrono::seconds(4));
}

TEST(HidrawKernelTest, UnpluggedDeviceIsGoneForGoodWhileItsSuccessorAnswers) {
    auto first = std::make_unique<UhidDevice>(UhidDevice::Identity{.serial = "first"});
    HidrawDevice old(nodeOf(*first));
    EXPECT_FALSE(old.isGone());
    first.reset();
    EXPECT_TRUE(old.isGone());
    const UhidDevice second({.serial = "second"});
    HidrawDevice fresh(nodeOf(second));
    EXPECT_NE(fresh.node(), old.node());
    int descriptor = -1;
    EXPECT_EQ(old.open(0, descriptor), VEXA_STATUS_GONE);
    EXPECT_EQ(featureReport(old, 4), (Answer{VEXA_STATUS_GONE, {}}));
    EXPECT_EQ(old.property("SerialNumber"), kNothing);
    EXPECT_FALSE(old.setProperty("Colour", "green"));
    EXPECT_EQ(featureReport(fresh, 4), (Answer{VEXA_STATUS_SUCCESS, {4, 1, 0}}));
    EXPECT_EQ(fresh.property("SerialNumber"), PropertyValue("second"));
}

TEST(HidrawKernelTest, NodeThatAnotherDeviceHasTakenIsNotMistakenForIt) {
    auto first = std::make_unique<UhidDevice>(UhidDevice::Identity{});
    const std::string node = nodeOf(*first);
    const std::string link = "/sys/class/hidraw" + node.substr(node.rfind('/'));
    const std::string sysPath = std::filesystem::canonical(link);
    EXPECT_EQ(HidrawDevice(node, sysPath).node(), node);
    first.reset();
    const UhidDevice second({});
    ASSERT_EQ(nodeOf(second), node);
    try {
        const HidrawDevice mistaken(node, sysPath);
        ADD_FAILURE() << "took it";
    } catch (const std::system_error& fault) {
        EXPECT_EQ(fault.code(), std::errc::no_such_device) << fault.what();
    }
}

TEST(HidrawKernelTest, ReaderThatStallsLosesTheNewestReportsAndCountsAGap) {
    LogCapture log;
    Vexa::Log::setLevel(Vexa::LogCategory::HIDService, Vexa::LogLevel::Error);
    UhidDevice surface({});
    std::promise<void> goOn;
    std::promise<void> stalled;
    bool isFirst = true;  // the input thread's
    const auto device = std::make_shared<HookedHidraw>(
        nodeOf(surface), [&, goingOn = goOn.get_future().share()](const std::string& moment) {
            if (moment == "report done" && std::exchange(isFirst, false)) {
                stalled.set_value();
                goingOn.wait();
            }
        });
    KernelSession session(device);
    session->begin();
    const auto send = [&](std::uint32_t frame) {
        surface.send(imageReport(Samples{}, frame, frame * 20));
    };
    send(0);
    stalled.get_future().wait();
    for (std::uint32_t frame = 1; frame <= 200; ++frame) {
        send(frame);
    }
    goOn.set_value();
    // The kernel's ring holds 64 places, one of which is always empty.
    ASSERT_TRUE(device->handled.waitUntil(64));
    EXPECT_EQ(session->property("DisjointImageCount"), PropertyValue(0U));
    send(201);
    ASSERT_TRUE(device->handled.waitUntil(65));
    EXPECT_EQ(session->property("DisjointImageCount"), PropertyValue(1U));
    session->end();
    EXPECT_EQ(device->handled.count(), 65U);
    EXPECT_THAT(log.take(), ElementsAre(error("Disjoint image (frame number: 63 -> 201) ***\n\n")));
}

TEST(HidrawKernelTest, FloodOfInvalidReportsNeitherFillsTheLogNorKeepsTheNextReportOut) {
    LogCapture log;
    Vexa::Log::setLevel(Vexa::LogCategory::HIDService, Vexa::LogLevel::Error);
    UhidDevice surface(withReportThree());
    const auto device =
        std::make_shared<HookedHidraw>(nodeOf(surface), [](const std::string& /*moment*/) {});
    KernelSession session(device);
    session->begin();
    constexpr std::array<std::uint8_t, 5> invalid = {3, 1, 4, 1, 5};
    constexpr int kReports = 20'000;
    for (int i = 0; i < kReports; ++i) {
        surface.send(invalid);
    }
    const std::uint64_t events = session.events.count();
    // The flood may have filled the kernel's ring, but room comes.
    while (session.events.count() == events) {
        const std::uint64_t handled = device->handled.count();
        surface.send(kReset);
        ASSERT_TRUE(device->handled.waitUntil(handled + 1));
    }
    session->end();
    EXPECT_THAT(log.take(), IsEmpty());
}

TEST(HidrawKernelTest, TwoSurfacesServeTheirOwnSessions) {
    UhidDevice left({.serial = "left"});
    UhidDevice right({.serial = "right"});
    KernelSession leftSession(std::make_shared<HidrawDevice>(nodeOf(left)));
    KernelSession rightSession(std::make_shared<HidrawDevice>(nodeOf(right)));
    leftSession->begin();
    rightSession->begin();
    left.send(kReset);
    right.send(kReset);
    right.send(kReset);
    EXPECT_TRUE(leftSession.events.waitUntil(1));
    EXPECT_TRUE(rightSession.events.waitUntil(2));
    EXPECT_EQ(leftSession->property("SerialNumber"), PropertyValue("left"));
    EXPECT_EQ(rightSession->property("SerialNumber"), PropertyValue("right"));
    leftSession->end();
    right.send(kReset);
    EXPECT_TRUE(rightSession.events.waitUntil(3));
    rightSession->end();
    EXPECT_EQ(leftSession.events.count(), 1U);
    EXPECT_EQ(rightSession.events.count(), 3U);
}

}  // namespace
}  // namespace VexaTouch::Testing
