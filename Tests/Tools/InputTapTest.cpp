#include "Tools/InputTap.h"

#include "Host/PluginLibrary.h"
#include "Pipeline/ContainerReader.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/ScriptedDevice.h"
#include "Shared/Util.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/Touch.h"
#include "Tests/Tools/DeviceReader.h"
#include "Tools/SettingKeys.h"

#include <gmock/gmock.h>

#include <sched.h>

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <iterator>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::IsEmpty;
using ::testing::SizeIs;

constexpr const char* kVariable = "VEXATOUCH_PLUGIN";

/// A real service on a device that does as it is told, with a tap between them.
class InputTapTest : public ::testing::Test {
protected:
    ~InputTapTest() override { unsetenv(kVariable); }

    static Host::PluginLibrary load() {
        setenv(kVariable, VEXATOUCH_PLUGIN_FILE, 1);
        return Host::PluginLibrary::loadDefault();
    }

    /// A feed and what comes out of it.
    class Watched {
    public:
        /// What has come since this was last asked.
        FrameList frames() {
            drain(*feed, decoder_);
            return std::exchange(frames_, {});
        }

        const std::shared_ptr<FrameFeed> feed = std::make_shared<FrameFeed>([] {});

    private:
        FrameList frames_;
        FrameDecoder decoder_{
            {.onFrame = [this](const RecordedFrame& frame) { frames_.push_back(frame); },
             .onGap = [](const FrameGap&) { ADD_FAILURE() << "a gap"; }}};
    };
    /// What the service itself recorded.
    static FrameList recorded(const Host::HostSession& service) {
        ContainerReader reader;
        const Vexa::PropertyValue recording = service.property("Recording");
        reader.write(*recording.asString());
        return reader.finish();
    }
    /// In words, a line each.
    static std::vector<std::string> described(const FrameList& frames) {
        std::vector<std::string> lines;
        for (const RecordedFrame& frame : frames) {
            lines.push_back(frame.type == RecordedFrame::Type::State
                                ? frame.key + " = " + frame.value.description()
                                : Util::hexStringFromBytes(frame.report));
        }
        return lines;
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
    Watched watched;
    tap->add(watched.feed, session);
    const FrameList frames = watched.frames();
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
    Watched watched;
    tap->add(watched.feed, session);
    static_cast<void>(watched.frames());
    session.begin();
    {
        // Fewer inputs than the service's own recording keeps.
        std::vector<std::jthread> writers;
        for (int writer = 0; writer < 3; ++writer) {
            writers.emplace_back([this, writer] {
                for (int i = 0; i < 200; ++i) {
                    tap->setProperty(
                        session,
                        "Pipeline.Algs.VirtualNormalizationFactors." + std::to_string(writer), i);
                }
            });
        }
        for (std::uint32_t i = 0; i < 700; ++i) {
            report(Testing::imageReport(Testing::Samples{}, i, i));
        }
    }
    ASSERT_TRUE(device->waitUntilHandled(700));
    session.halt();
    FrameList frames = watched.frames();
    EXPECT_THAT(frames, SizeIs(1300));
    std::uint64_t before = 0;
    for (const RecordedFrame& frame : frames) {
        EXPECT_GE(frame.timestamp, before);
        before = frame.timestamp;
    }
    // The service leaves out settings that were superseded before the next report.
    PipelineRecording::trimFrames(frames, 1350);
    EXPECT_EQ(described(frames), described(recorded(session)));
}

/// A device that does something else between the arrival of a report and the service.
class MeddlingDevice final : public Vexa::DeviceBackend {
public:
    MeddlingDevice(std::shared_ptr<Vexa::DeviceBackend> device, std::function<void()> meddle)
        : device_(std::move(device)), meddle_(std::move(meddle)) {}

    vexa_status open(std::uint32_t options, int& descriptor) noexcept override {
        return device_->open(options, descriptor);
    }
    void close(std::uint32_t options) noexcept override { device_->close(options); }
    void reportArrived(std::span<const std::uint8_t>, std::uint64_t) noexcept override {
        meddle_();
    }
    void reportHandled() noexcept override { device_->reportHandled(); }

private:
    std::shared_ptr<Vexa::DeviceBackend> device_;
    std::function<void()> meddle_;
};

TEST_F(InputTapTest, SettingWaitsForTheReportThatHasArrived) {
    std::optional<Host::HostSession> meddled;
    std::jthread writer;
    std::atomic<bool> written = false;
    const Vexa::DeviceRegistration meddledRegistration(std::make_shared<TappedDevice>(
        std::make_shared<MeddlingDevice>(device,
                                         [&] {
                                             writer = std::jthread([&] {
                                                 tap->setProperty(*meddled, "Pipeline.Late", 1);
                                                 written = true;
                                             });
                                             // Every occasion to come in between.
                                             constexpr int kOccasions = 20'000;
                                             for (int i = 0; i < kOccasions && !written; ++i) {
                                                 sched_yield();
                                             }
                                         }),
        tap));
    meddled.emplace(library, meddledRegistration.service(), [](const Vexa::HidEvent&) {});
    Watched watched;
    tap->add(watched.feed, *meddled);
    static_cast<void>(watched.frames());
    meddled->begin();
    report({7, 7});
    ASSERT_TRUE(device->waitUntilHandled(1));
    writer.join();
    meddled->halt();
    EXPECT_EQ(described(recorded(*meddled)), (std::vector<std::string>{"07 07 ", "Late = 1"}));
    EXPECT_EQ(described(watched.frames()), (std::vector<std::string>{"07 07 ", "Late = 1"}));
}

TEST_F(InputTapTest, FeedsComeAndGoWhileReportsDo) {
    session.begin();
    report({7, 1});
    ASSERT_TRUE(device->waitUntilHandled(1));
    Watched first;
    Watched second;
    tap->add(first.feed, session);
    report({7, 2});
    ASSERT_TRUE(device->waitUntilHandled(2));
    tap->add(second.feed, session);
    report({7, 3});
    ASSERT_TRUE(device->waitUntilHandled(3));
    tap->remove(first.feed);
    tap->remove(first.feed);
    EXPECT_TRUE(first.feed->isClosed());
    report({7, 4});
    ASSERT_TRUE(device->waitUntilHandled(4));
    session.halt();
    EXPECT_FALSE(second.feed->isClosed());
    using Reports = std::vector<std::vector<std::uint8_t>>;
    EXPECT_EQ(Testing::reportsOf(first.frames()), (Reports{{7, 2}, {7, 3}}));
    EXPECT_EQ(Testing::reportsOf(second.frames()), (Reports{{7, 3}, {7, 4}}));
}

TEST_F(InputTapTest, OnlyWhatThePipelineTakesIsAnInput) {
    Watched watched;
    tap->add(watched.feed, session);
    static_cast<void>(watched.frames());
    EXPECT_TRUE(tap->setProperty(session, "Product", "grey"));
    EXPECT_EQ(session.property("Product"), Vexa::PropertyValue("grey"));
    EXPECT_THAT(watched.frames(), IsEmpty());
    EXPECT_TRUE(tap->setProperty(session, "Pipeline.Nothing", 1));
    EXPECT_TRUE(tap->setProperty(session, "Pipeline.Algs.ResetEventStats", {}));
    const FrameList frames = watched.frames();
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
