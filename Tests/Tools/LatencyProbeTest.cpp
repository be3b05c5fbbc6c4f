#include "Tools/LatencyProbe.h"

#include "Platform/HidEvent.h"
#include "Platform/Trace.h"
#include "Shared/InputReport.h"

#include <gmock/gmock.h>

#include <cstdint>
#include <cstring>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using ::testing::Each;
using ::testing::Gt;
using ::testing::IsEmpty;
using ::testing::SizeIs;

std::vector<std::uint8_t> image(std::uint32_t frame) {
    InputReport::Image content{};
    content.frameNumber = frame;
    std::vector<std::uint8_t> bytes(InputReport::Image::minimumLength);
    bytes[0] = InputReport::Image::reportId;
    std::memcpy(bytes.data() + 1, &content, sizeof content);
    return bytes;
}

Vexa::HidEvent eventOf(std::uint32_t frame) {
    const Vexa::HidEvent event = Vexa::HidEvent::digitizer({});
    event.setIntegerField(Vexa::HidEventField::DigitizerFrameNumber, frame);
    return event;
}

/// What happens to one report, in its order, on one thread.
class Passage {
public:
    explicit Passage(LatencyProbe& probe) : probe_(probe), hooks_(probe.hooks()) {}
    void report(const std::vector<std::uint8_t>& bytes) const {
        hooks_.onSend(bytes);
        Vexa::trace(Vexa::TraceCode::Report);
        hooks_.onHandled();
    }
    void events(const std::vector<Vexa::HidEvent>& events) const {
        Vexa::trace(Vexa::TraceCode::Batch, events.size());
        for (const Vexa::HidEvent& event : events) probe_.delivered(event);
    }

private:
    LatencyProbe& probe_;
    DeviceHooks hooks_;
};

TEST(LatencyProbeTest, AReportIsMeasuredAtEachStage) {
    LatencyProbe probe(10, false);
    const Passage passage(probe);
    passage.report(image(7));
    passage.events({eventOf(7)});
    std::uint64_t last = 0;
    for (const LatencyStage stage : kLatencyStages) {
        const auto latencies = probe.latencies(stage);
        ASSERT_THAT(latencies, SizeIs(1));
        EXPECT_GE(latencies[0], last);
        last = latencies[0];
    }
    EXPECT_FALSE(probe.inputThread().realTime);
}

TEST(LatencyProbeTest, EventsFindTheirReportByTheFrameNumber) {
    LatencyProbe probe(10, false);
    const Passage passage(probe);
    passage.report(image(0xFFFFFFFF));
    passage.report({9, 9});
    passage.report(image(0));
    passage.events({eventOf(0)});
    // The report of two events counts once, what belongs to none not at all.
    passage.events({eventOf(0xFFFFFFFF), eventOf(0xFFFFFFFF)});
    passage.events({eventOf(5), Vexa::HidEvent::vendorDefined({})});
    EXPECT_THAT(probe.latencies(LatencyStage::TakenUp), SizeIs(3));
    EXPECT_THAT(probe.latencies(LatencyStage::Handled), SizeIs(3));
    EXPECT_THAT(probe.latencies(LatencyStage::Landed), SizeIs(2));
    const auto delivered = probe.latencies(LatencyStage::Delivered);
    EXPECT_THAT(delivered, SizeIs(2));
    EXPECT_THAT(delivered, Each(Gt(0U)));
    EXPECT_GT(delivered[0], delivered[1]);
}

TEST(LatencyProbeTest, ReportsBeyondItsRoomAreLeftOut) {
    LatencyProbe probe(2, false);
    const Passage passage(probe);
    for (std::uint32_t frame = 0; frame < 5; ++frame) {
        passage.report(image(frame));
        passage.events({eventOf(frame)});
    }
    for (const LatencyStage stage : kLatencyStages) {
        EXPECT_THAT(probe.latencies(stage), SizeIs(2));
    }
}

TEST(LatencyProbeTest, NothingReportedNothingMeasured) {
    {
        const LatencyProbe probe(2, false);
        for (const LatencyStage stage : kLatencyStages) {
            EXPECT_THAT(probe.latencies(stage), IsEmpty());
        }
    }
    // Nobody listens any more.
    Vexa::trace(Vexa::TraceCode::Report);
}

}  // namespace
}  // namespace VexaTouch::Tools
