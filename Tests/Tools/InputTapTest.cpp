#include "Tools/InputTap.h"

#include "Host/PluginLibrary.h"
#include "Pipeline/ContainerReader.h"
#include "Platform/ScriptedDevice.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/Touch.h"
#include "Tests/Tools/DeviceReader.h"
#include "Tools/SettingKeys.h"

#include <gmock/gmock.h>

#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::IsEmpty;
using ::testing::SizeIs;
using Testing::untimed;

constexpr const char* kVariable = "VEXATOUCH_PLUGIN";

/// A real service on a device that does as it is told, with a tap between them.
class InputTapTest : public ::testing::Test {
protected:
    ~InputTapTest() override { unsetenv(kVariable); }

    static Host::PluginLibrary load() {
        setenv(kVariable, VEXATOUCH_PLUGIN_FILE, 1);
        return Host::PluginLibrary::loadDefault();
    }

    /// Everything that is in the feed now.
    static FrameList framesIn(FrameFeed& feed) {
        FrameList frames;
        FrameDecoder decoder(
            {.onFrame = [&](const RecordedFrame& frame) { frames.push_back(frame); },
             .onGap = [](const FrameGap&) { ADD_FAILURE() << "a gap"; }});
        drain(feed, decoder);
        return frames;
    }
    /// What the service itself recorded.
    FrameList recorded() const {
        ContainerReader reader;
        const Vexa::PropertyValue recording = session.property("Recording");
        reader.write(*recording.asString());
        return reader.finish();
    }
    void report(const std::vector<std::uint8_t>& bytes) { device->sendReport(bytes); }

    std::shared_ptr<Vexa::ScriptedDevice> device = std::make_shared<Vexa::ScriptedDevice>();
    std::shared_ptr<InputTap> tap = std::make_shared<InputTap>();
    Vexa::DeviceRegistration registration{std::make_shared<TappedDevice>(device, tap)};
    Host::PluginLibrary library = load();
    Host::HostSession session{library, registration.service(), [](const Vexa::HidEvent&) {}};
};

TEST_F(InputTapTest, FeedBeginsWithEverySettingInForce) {
    session.setProperty("Pipeline.Algs.HoldTimeoutMilliseconds", 321);
    const auto feed = std::make_shared<FrameFeed>([] {});
    tap->add(feed, session);
    const FrameList frames = framesIn(*feed);
    std::vector<std::string> keys;
    for (const RecordedFrame& frame : frames) {
        EXPECT_EQ(frame.type, RecordedFrame::Type::State);
        EXPECT_EQ(frame.value, session.property("Pipeline." + frame.key));
        keys.push_back(frame.key);
    }
    EXPECT_EQ(keys, pipelineSettingKeys());
    EXPECT_THAT(keys, SizeIs(27));
    EXPECT_THAT(keys, ::testing::Contains("Algs.VirtualNormalizationFactors.22"));
}

TEST_F(InputTapTest, FeedHoldsExactlyWhatTheServiceRecordsWhileManyWriteSettings) {
    const auto feed = std::make_shared<FrameFeed>([] {});
    tap->add(feed, session);
    static_cast<void>(framesIn(*feed));
    session.begin();
    {
        // Fewer inputs than the service's own recording keeps.
        std::vector<std::jthread> writers;
        for (int writer = 0; writer < 3; ++writer) {
            writers.emplace_back([this, writer] {
                for (int i = 0; i < 200; ++i) {
                    tap->setProperty(session, "Pipeline.Algs.HoldTimeoutMilliseconds",
                                     writer * 1000 + i);
                }
            });
        }
        for (std::uint32_t i = 0; i < 700; ++i) {
            report(Testing::imageReport(Testing::Samples{}, i, i));
        }
    }
    ASSERT_TRUE(device->waitUntilHandled(700));
    session.halt();
    const FrameList frames = framesIn(*feed);
    EXPECT_EQ(untimed(frames), untimed(recorded()));
    EXPECT_THAT(frames, SizeIs(1300));
    std::uint64_t before = 0;
    for (const RecordedFrame& frame : frames) {
        EXPECT_GE(frame.timestamp, before);
        before = frame.timestamp;
    }
}

TEST_F(InputTapTest, FeedsComeAndGoWhileReportsDo) {
    session.begin();
    report({7, 1});
    ASSERT_TRUE(device->waitUntilHandled(1));
    const auto first = std::make_shared<FrameFeed>([] {});
    const auto second = std::make_shared<FrameFeed>([] {});
    tap->add(first, session);
    report({7, 2});
    ASSERT_TRUE(device->waitUntilHandled(2));
    tap->add(second, session);
    report({7, 3});
    ASSERT_TRUE(device->waitUntilHandled(3));
    tap->remove(first);
    tap->remove(first);
    EXPECT_TRUE(first->isClosed());
    report({7, 4});
    ASSERT_TRUE(device->waitUntilHandled(4));
    session.halt();
    EXPECT_FALSE(second->isClosed());
    using Reports = std::vector<std::vector<std::uint8_t>>;
    EXPECT_EQ(Testing::reportsOf(framesIn(*first)), (Reports{{7, 2}, {7, 3}}));
    EXPECT_EQ(Testing::reportsOf(framesIn(*second)), (Reports{{7, 3}, {7, 4}}));
}

TEST_F(InputTapTest, OnlyWhatThePipelineTakesIsAnInput) {
    const auto feed = std::make_shared<FrameFeed>([] {});
    tap->add(feed, session);
    static_cast<void>(framesIn(*feed));
    EXPECT_TRUE(tap->setProperty(session, "Product", "grey"));
    EXPECT_EQ(session.property("Product"), Vexa::PropertyValue("grey"));
    EXPECT_THAT(framesIn(*feed), IsEmpty());
    EXPECT_TRUE(tap->setProperty(session, "Pipeline.Nothing", 1));
    EXPECT_TRUE(tap->setProperty(session, "Pipeline.Algs.ResetEventStats", {}));
    const FrameList frames = framesIn(*feed);
    ASSERT_THAT(frames, SizeIs(2));
    EXPECT_EQ(frames.front().key, "Nothing");
    EXPECT_EQ(std::next(frames.begin())->key, "Algs.ResetEventStats");
    EXPECT_EQ(std::next(frames.begin())->value, Vexa::PropertyValue::null());
}

TEST_F(InputTapTest, DeviceBehindItIsWholeAndToldOfEverything) {
    session.begin();
    report({7});
    ASSERT_TRUE(device->waitUntilHandled(1));
    EXPECT_TRUE(device->isOpen());
    session.halt();
    EXPECT_FALSE(device->isOpen());
}

}  // namespace
}  // namespace VexaTouch::Tools
