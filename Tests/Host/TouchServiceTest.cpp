// The host and the real plug-in.

#include "Host/HostFailure.h"
#include "Host/HostSession.h"
#include "Host/PluginInstance.h"
#include "Host/PluginLibrary.h"
#include "Platform/ScriptedDevice.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using Host::HostFailure;
using Host::HostSession;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::SizeIs;
using Vexa::HidEventType;
using Vexa::PropertyValue;
using Vexa::ScriptedDevice;

/// The firmware has reset.
constexpr std::array<std::uint8_t, 10> kReset = {2, 0};

class TouchServiceTest : public ::testing::Test {
protected:
    Host::PluginLibrary library{VEXATOUCH_PLUGIN_FILE};
    std::shared_ptr<ScriptedDevice> device = std::make_shared<ScriptedDevice>();
    Vexa::DeviceRegistration registration{device};
    std::vector<HidEventType> events;  // the queue's until a session has halted

    HostSession::EventSink sink() {
        return [this](const Vexa::HidEvent& event) { events.push_back(event.type()); };
    }
};

TEST_F(TouchServiceTest, EventsArriveBetweenBeginAndHaltAndAllOfThem) {
    HostSession session(library, registration.service(), sink());
    session.begin();
    for (int i = 0; i < 100; ++i) {
        ASSERT_TRUE(device->sendReport(kReset));
    }
    ASSERT_TRUE(device->waitUntilHandled(100));
    session.halt();
    EXPECT_THAT(events, SizeIs(100));
    EXPECT_FALSE(device->isOpen());
    EXPECT_FALSE(device->sendReport(kReset));
    session.end();
    EXPECT_THAT(events, SizeIs(100));
}

TEST_F(TouchServiceTest, BeginsAgainAfterHalt) {
    HostSession session(library, registration.service(), sink());
    for (std::uint64_t round = 1; round <= 50; ++round) {
        session.begin();
        ASSERT_TRUE(device->sendReport(kReset));
        ASSERT_TRUE(device->waitUntilHandled(round));
        session.halt();
        EXPECT_THAT(events, SizeIs(round));
    }
}

TEST_F(TouchServiceTest, PropertiesAreAnsweredFromStartToStop) {
    HostSession session(library, registration.service(), sink());
    const PropertyValue version = PropertyValue::Array{13, 0, 0};
    EXPECT_EQ(session.property("Version"), version);
    EXPECT_TRUE(session.setProperty("Pipeline.Algs.HoldTimeoutMilliseconds", 300));
    session.begin();
    EXPECT_EQ(session.property("Version"), version);
    EXPECT_EQ(session.property("Pipeline.Algs.HoldTimeoutMilliseconds"), PropertyValue(300U));
    EXPECT_EQ(session.property("Pipeline.Nothing"), PropertyValue());
    session.halt();
    EXPECT_EQ(session.property("Version"), version);
}

TEST_F(TouchServiceTest, ProbeLeavesTheScoreAlone) {
    const Host::PluginInstance plugin(library);
    for (const std::int32_t rated : {0, 1, -3, 4711, INT32_MAX, INT32_MIN}) {
        std::int32_t score = rated;
        EXPECT_EQ(plugin.probe({}, registration.service(), score), VEXA_STATUS_SUCCESS);
        EXPECT_EQ(score, rated);
    }
    EXPECT_EQ(HostSession(library, registration.service(), sink()).score(), 0);
}

TEST_F(TouchServiceTest, UnknownDeviceFailsToStart) {
    try {
        const HostSession session(library, 0xFFFF'FFF0U, sink());
        ADD_FAILURE() << "started";
    } catch (const HostFailure& fault) {
        EXPECT_EQ(fault.what(),
                  library.file().string() + ": Start failed: status 0xE00002BE (no resources)");
    }
}

TEST_F(TouchServiceTest, DeviceThatDoesNotOpenIsLeftAloneAndMayOpenLater) {
    device->setNextOpenStatuses({VEXA_STATUS_IO_ERROR});
    HostSession session(library, registration.service(), sink());
    EXPECT_THROW(session.begin(), HostFailure);
    EXPECT_EQ(device->callCount(ScriptedDevice::kClose), 0U);
    session.begin();
    ASSERT_TRUE(device->sendReport(kReset));
    ASSERT_TRUE(device->waitUntilHandled(1));
    session.end();
    EXPECT_THAT(events, ElementsAre(HidEventType::VendorDefined));
}

TEST_F(TouchServiceTest, UnpluggedDeviceIsTakenDownLikeAnyOther) {
    HostSession session(library, registration.service(), sink());
    session.begin();
    ASSERT_TRUE(device->sendReport(kReset));
    ASSERT_TRUE(device->waitUntilHandled(1));
    device->unplug();
    EXPECT_EQ(session.property("FirmwareVersion"), PropertyValue());
    session.end();
    EXPECT_THAT(events, SizeIs(1));
}

TEST_F(TouchServiceTest, OptionsReachTheDevice) {
    HostSession session(library, registration.service(), sink());
    session.begin(5);
    session.end();
    std::vector<std::uint32_t> options;
    for (const ScriptedDevice::Call& call : device->calls()) {
        if (call.operation == ScriptedDevice::kOpen || call.operation == ScriptedDevice::kClose) {
            options.push_back(call.options);
        }
    }
    EXPECT_THAT(options, ElementsAre(5, 5));
    EXPECT_THAT(events, IsEmpty());
}

}  // namespace
}  // namespace VexaTouch::Testing
