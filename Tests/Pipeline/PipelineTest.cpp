#include "Pipeline/Pipeline.h"

#include "Tests/Support/EventMatchers.h"
#include "Tests/Support/PrintPropertyValue.h"
#include "Tests/Support/StateSnapshot.h"
#include "Tests/Support/Touch.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cstdint>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch {
namespace {

using ::testing::AllOf;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using namespace Testing;
using Bytes = std::vector<std::uint8_t>;
using Vexa::HidEvent;
using Vexa::PropertyValue;

const Touch kFinger = touch("A").at(350);  // region 1

std::string addressOf(const void* address) {
    return ::testing::PrintToString(address);
}

/// A pipeline all of whose probes tell what they saw, and the device that feeds it.
struct WatchedPipeline {
    Pipeline pipeline;
    FrameSequence clock;
    std::vector<std::string> seen;
    std::vector<HidEvent> events;

    WatchedPipeline() {
        pipeline.setTimeProbe = [this](std::uint64_t time) {
            seen.push_back("time " + std::to_string(time));
        };
        pipeline.setStateProbe = [this](const std::string& key, const PropertyValue& value) {
            seen.push_back("set " + key + " = " + value.description());
        };
        pipeline.getStateProbe = [this](const std::string& key) { seen.push_back("get " + key); };
        pipeline.inputReportProbe = [this](const std::uint8_t* report, std::uint64_t length) {
            seen.push_back("report " + bytes(report, length));
        };
        pipeline.invalidInputReportProbe = [this](const std::uint8_t* report,
                                                  std::uint64_t length) {
            seen.push_back("invalid " + bytes(report, length));
        };
        pipeline.firmwareEventProbe = [this](const InputReport::FirmwareEvent* event) {
            seen.push_back("firmware " + std::to_string(event->code) + " " +
                           ::testing::PrintToString(event->data));
        };
        pipeline.imageProbe = [this](const InputReport::Image* image) {
            seen.push_back("image " + std::to_string(image->frameNumber) + " @" +
                           std::to_string(image->timestampMs));
        };
        pipeline.hidEventsProbe = [this](const std::vector<HidEvent>& batch) {
            seen.push_back("events " + std::to_string(batch.size()));
            events.insert(events.end(), batch.begin(), batch.end());
        };
    }

    static std::string bytes(const std::uint8_t* report, std::uint64_t length) {
        std::string text = std::to_string(length);
        for (std::uint64_t i = 0; i < length && i < 4; ++i) {
            text += " " + std::to_string(report[i]);
        }
        return text;
    }
    void send(const Bytes& report) { pipeline.handleInputReport(report.data(), report.size()); }
    void feel(const Touch& touch) {
        for (const Bytes& report : clock.reports(touch)) {
            send(report);
        }
    }
    /// What was seen since the last question.
    std::vector<std::string> lately() { return std::exchange(seen, {}); }
};

TEST(PipelineTest, BeginsEmpty) {
    const Pipeline pipeline;
    EXPECT_FALSE(pipeline.setTimeProbe);
    EXPECT_FALSE(pipeline.setStateProbe);
    EXPECT_FALSE(pipeline.inputReportProbe);
    EXPECT_FALSE(pipeline.invalidInputReportProbe);
    EXPECT_FALSE(pipeline.firmwareEventProbe);
    EXPECT_FALSE(pipeline.imageProbe);
    EXPECT_FALSE(pipeline.hidEventsProbe);
    EXPECT_FALSE(pipeline.getStateProbe);
    EXPECT_EQ(pipeline.timeMach(), 0U);
    EXPECT_EQ(firstDifference(pipeline.algs(), Algs()), std::nullopt);
}

TEST(PipelineTest, WorksWithoutAnyProbe) {
    Pipeline pipeline;
    FrameSequence clock;
    pipeline.setTime(5);
    pipeline.setState("Algs.HoldTimeoutMilliseconds", 300);
    EXPECT_EQ(pipeline.getState("Algs.HoldTimeoutMilliseconds"), PropertyValue(300));
    for (const Bytes& report : clock.reports(kFinger.forMs(100))) {
        pipeline.handleInputReport(report.data(), report.size());
    }
    EXPECT_TRUE(pipeline.algs().handStats()._isTouching);
    const Bytes reset = firmwareReport(0);
    pipeline.handleInputReport(reset.data(), reset.size());
    pipeline.handleInputReport(nullptr, 0);
    EXPECT_FALSE(pipeline.algs().handStats()._isTouching);
}

// Time.

TEST(PipelineTest, TheTimeProbeSeesTheNewTimeBeforeItHolds) {
    Pipeline pipeline;
    pipeline.setTime(1);
    std::vector<std::uint64_t> times;
    pipeline.setTimeProbe = [&](std::uint64_t time) {
        times.push_back(pipeline.timeMach());
        times.push_back(time);
    };
    pipeline.setTime(7);
    EXPECT_THAT(times, ElementsAre(1, 7));
    EXPECT_EQ(pipeline.timeMach(), 7U);
}

// State.

TEST(PipelineTest, AStateOfTheAlgorithmsDomainReachesIt) {
    WatchedPipeline watched;
    watched.pipeline.setState("Algs.ActivationThreshold", 150.0);
    EXPECT_EQ(watched.pipeline.getState("Algs.ActivationThreshold"), PropertyValue(150.0F));
    EXPECT_THAT(watched.lately(), ElementsAre("set Algs.ActivationThreshold = 150.0",
                                              "get Algs.ActivationThreshold"));
    EXPECT_EQ(watched.pipeline.algs().handStats()._activationThreshold, 150.0F);
}

TEST(PipelineTest, ABareKeyIsDroppedThoughTheProbeSeesIt) {
    WatchedPipeline watched;
    const Algs before = watched.pipeline.algs();
    for (const char* key : {"ActivationThreshold", "Algs", "AlgsActivationThreshold",
                            "Pipeline.Algs.ActivationThreshold", "algs.ActivationThreshold", ""}) {
        watched.pipeline.setState(key, 150.0);
        EXPECT_THAT(watched.lately(), ElementsAre(std::string("set ") + key + " = 150.0"));
        EXPECT_FALSE(watched.pipeline.getState(key));
        EXPECT_THAT(watched.lately(), ElementsAre(std::string("get ") + key));
    }
    EXPECT_EQ(firstDifference(watched.pipeline.algs(), before), std::nullopt);
}

TEST(PipelineTest, AnUnknownStateOfTheAlgorithmIsNoValue) {
    WatchedPipeline watched;
    watched.pipeline.setState("Algs.Unknown", 1);
    EXPECT_FALSE(watched.pipeline.getState("Algs.Unknown"));
    watched.pipeline.setState("Algs.", 1);
    EXPECT_FALSE(watched.pipeline.getState("Algs."));
}

TEST(PipelineTest, AStateWithoutAValueReachesTheProbeAndTheAlgorithm) {
    WatchedPipeline watched;
    bool hadValue = true;
    watched.pipeline.setStateProbe = [&](const std::string&, const PropertyValue& value) {
        hadValue = static_cast<bool>(value);
    };
    watched.pipeline.setState("Algs.HoldTimeoutMilliseconds", PropertyValue());
    EXPECT_FALSE(hadValue);
    EXPECT_EQ(watched.pipeline.getState("Algs.HoldTimeoutMilliseconds"), PropertyValue(0));
}

TEST(PipelineTest, TheStateProbeComesBeforeTheAlgorithm) {
    Pipeline pipeline;
    PropertyValue atProbe;
    pipeline.setStateProbe = [&](const std::string&, const PropertyValue&) {
        atProbe = pipeline.getState("Algs.HoldTimeoutMilliseconds");
    };
    pipeline.setState("Algs.HoldTimeoutMilliseconds", 300);
    EXPECT_EQ(atProbe, PropertyValue(500));
}

TEST(PipelineTest, DebugInfoIsNoValueButTheAlgorithmsOwnIs) {
    WatchedPipeline watched;
    EXPECT_FALSE(watched.pipeline.getState("DebugInfo"));
    EXPECT_THAT(watched.lately(), ElementsAre("get DebugInfo"));
    EXPECT_TRUE(watched.pipeline.getState("Algs.DebugInfo").asDictionary());
}

// Reports.

TEST(PipelineTest, AReportOfLengthZeroIsInvalid) {
    WatchedPipeline watched;
    const std::uint8_t id = InputReport::FirmwareEvent::reportId;
    watched.pipeline.handleInputReport(&id, 0);
    EXPECT_THAT(watched.lately(), ElementsAre("report 0", "invalid 0"));
    watched.pipeline.handleInputReport(nullptr, 0);
    EXPECT_THAT(watched.lately(), ElementsAre("report 0", "invalid 0"));
}

TEST(PipelineTest, TheReportProbesSeeTheCallersBytes) {
    Pipeline pipeline;
    std::vector<std::string> seen;
    pipeline.inputReportProbe = [&](const std::uint8_t* report, std::uint64_t length) {
        seen.push_back(addressOf(report) + " " + std::to_string(length));
    };
    pipeline.invalidInputReportProbe = pipeline.inputReportProbe;
    const Bytes report = {9, 8, 7};
    pipeline.handleInputReport(report.data(), report.size());
    const std::string expected = addressOf(report.data()) + " 3";
    EXPECT_THAT(seen, ElementsAre(expected, expected));
}

TEST(PipelineTest, AReportThatIsNeitherFirmwareEventNorImageIsDropped) {
    WatchedPipeline watched;
    watched.feel(kFinger);
    watched.events.clear();
    const Algs before = watched.pipeline.algs();
    watched.lately();
    Bytes shortFirmware = firmwareReport(0);
    shortFirmware.pop_back();
    Bytes shortImage = imageReport(kFinger, 2, 20);
    shortImage.pop_back();
    Bytes otherId = imageReport(kFinger, 2, 20);
    otherId[0] = 3;
    watched.send(shortFirmware);
    EXPECT_THAT(watched.lately(), ElementsAre("report 9 2 0 0 0", "invalid 9 2 0 0 0"));
    watched.send(shortImage);
    EXPECT_THAT(watched.lately(), ElementsAre("report 72 1 2 0 0", "invalid 72 1 2 0 0"));
    watched.send(otherId);
    EXPECT_THAT(watched.lately(), ElementsAre("report 73 3 2 0 0", "invalid 73 3 2 0 0"));
    watched.send({1});
    EXPECT_THAT(watched.lately(), ElementsAre("report 1 1", "invalid 1 1"));
    EXPECT_EQ(firstDifference(watched.pipeline.algs(), before), std::nullopt);
    EXPECT_THAT(watched.events, IsEmpty());
}

TEST(PipelineTest, ReportsMayBeLongerThanTheirRecord) {
    WatchedPipeline watched;
    Bytes report = imageReport(nothing(), 2, 20);
    report.resize(65'536);
    watched.send(report);
    EXPECT_THAT(watched.lately(), ElementsAre("report 65536 1 2 0 0", "image 2 @20"));
    report = firmwareReport(1);
    report.resize(73);  // long enough for an image
    watched.send(report);
    EXPECT_THAT(watched.lately(), ElementsAre("report 73 2 1 0 0",
                                              "firmware 1 { '\\0', '\\0', '\\0', '\\0', '\\0', "
                                              "'\\0', '\\0', '\\0' }"));
}

TEST(PipelineTest, AnImageWithoutAnEventDoesNotCallTheEventsProbe) {
    WatchedPipeline watched;
    watched.send(imageReport(nothing(), 1, 10));
    EXPECT_THAT(watched.lately(), ElementsAre("report 73 1 1 0 0", "image 1 @10"));
}

TEST(PipelineTest, AnImageReachesTheAlgorithmAndItsEventTheProbe) {
    WatchedPipeline watched;
    Algs alone;
    FrameSequence clock;
    std::size_t made = 0;
    for (const Touch& touch : {kFinger.forMs(120), nothing().forMs(500)}) {
        watched.feel(touch);
        clock.play(touch, [&](const Samples& samples, std::uint32_t frame, std::uint32_t timeMs) {
            made += alone.handleImage(image(samples, frame, timeMs)).size();
        });
    }
    EXPECT_EQ(firstDifference(watched.pipeline.algs(), alone), std::nullopt);
    EXPECT_EQ(watched.events.size(), made);
    EXPECT_THAT(watched.events, ElementsAre(MayBegin(1), Tap(1)));
}

TEST(PipelineTest, TheProbesOfAnImageComeInOrder) {
    WatchedPipeline watched;
    watched.pipeline.setTime(77);
    watched.lately();
    watched.feel(kFinger.forMs(40));
    // The event comes with the frame that decides it, behind that frame's other probes.
    std::vector<std::string> seen = watched.lately();
    const auto events = std::find(seen.begin(), seen.end(), "events 1");
    ASSERT_NE(events, seen.end());
    ASSERT_GE(events - seen.begin(), 2);
    EXPECT_EQ(events[-1].substr(0, 6), "image ");
    EXPECT_EQ(events[-2].substr(0, 7), "report ");
    EXPECT_THAT(watched.events, ElementsAre(AllOf(MayBegin(1), StampedAt(77))));
}

TEST(PipelineTest, TheImageProbeComesBeforeTheAlgorithm) {
    Pipeline pipeline;
    Algs atProbe;
    InputReport::Image seen{};
    pipeline.imageProbe = [&](const InputReport::Image* image) {
        atProbe = pipeline.algs();
        seen = *image;
    };
    const Bytes report = imageReport(kFinger, 2, 20);
    pipeline.handleInputReport(report.data(), report.size());
    EXPECT_EQ(firstDifference(atProbe, Algs()), std::nullopt);
    EXPECT_NE(firstDifference(pipeline.algs(), Algs()), std::nullopt);
    EXPECT_EQ(seen.signedPixels, kFinger.samples());
    EXPECT_EQ(seen.frameNumber, 2U);
    EXPECT_EQ(seen.timestampMs, 20U);
}

// The firmware's events.

TEST(PipelineTest, AFirmwareResetAloneIsOneVendorEvent) {
    WatchedPipeline watched;
    watched.pipeline.setTime(123'456);
    watched.lately();
    watched.send(firmwareReport(0, {1, 2, 3, 4, 5, 6, 7, 8}));
    EXPECT_THAT(watched.lately(),
                ElementsAre("report 10 2 0 1 2",
                            "firmware 0 { '\\x1' (1), '\\x2' (2), '\\x3' (3), '\\x4' (4), '\\x5' "
                            "(5), '\\x6' (6), '\\a' (7), '\\b' (8) }",
                            "events 1"));
    ASSERT_EQ(watched.events.size(), 1U);
    const Vexa::VendorEventRecord expected = {.timestamp = 123'456,
                                              .usagePage = 0xFF60,
                                              .usage = 2,
                                              .version = 0,
                                              .payload = {},
                                              .options = 0};
    ASSERT_TRUE(watched.events[0].vendorRecord());
    EXPECT_EQ(*watched.events[0].vendorRecord(), expected);
    EXPECT_EQ(watched.events[0].type(), Vexa::HidEventType::VendorDefined);
    EXPECT_EQ(watched.events[0].phase(), Vexa::HidEventPhase::None);
}

TEST(PipelineTest, AFirmwareResetInATouchEndsItAndTheVendorEventFollows) {
    WatchedPipeline watched;
    watched.feel(kFinger.forMs(100));
    EXPECT_THAT(watched.events, ElementsAre(MayBegin(1)));
    watched.events.clear();
    watched.lately();
    watched.pipeline.setTime(999);
    watched.send(firmwareReport(0));
    EXPECT_EQ(watched.lately().back(), "events 2");  // one batch
    EXPECT_THAT(watched.events, ElementsAre(AllOf(Cancel(), WithFrame(0), StampedAt(999)),
                                            AllOf(FirmwareReset(), StampedAt(999))));
    watched.events.clear();
    watched.feel(nothing().forMs(1000));
    EXPECT_THAT(watched.events, IsEmpty());
}

TEST(PipelineTest, AFirmwareResetIsTheAlgorithmsReset) {
    WatchedPipeline watched;
    watched.feel(kFinger.forMs(700));
    Algs alone = watched.pipeline.algs();
    watched.send(firmwareReport(0));
    alone.handleReset();
    EXPECT_EQ(firstDifference(watched.pipeline.algs(), alone), std::nullopt);
    EXPECT_THAT(watched.events,
                ElementsAre(MayBegin(1), HoldStart(1), HoldEnd(1), FirmwareReset()));
}

TEST(PipelineTest, AnyOtherFirmwareCodeIsOnlyObserved) {
    WatchedPipeline watched;
    watched.feel(kFinger.forMs(100));
    watched.events.clear();
    watched.lately();
    const Algs before = watched.pipeline.algs();
    for (const std::uint8_t code : {std::uint8_t{1}, std::uint8_t{128}, std::uint8_t{255}}) {
        watched.send(firmwareReport(code));
        const std::vector<std::string> seen = watched.lately();
        ASSERT_EQ(seen.size(), 2U);
        EXPECT_EQ(seen[0].substr(0, 12), "report 10 2 ");
        EXPECT_EQ(seen[1].substr(0, 11), ("firmware " + std::to_string(code) + "  ").substr(0, 11));
    }
    EXPECT_EQ(firstDifference(watched.pipeline.algs(), before), std::nullopt);
    EXPECT_THAT(watched.events, IsEmpty());
}

// Events.

TEST(PipelineTest, EveryEventOfABatchIsStampedWithTheSameTime) {
    WatchedPipeline watched;
    watched.pipeline.setTime(42);
    watched.lately();
    const std::vector<HidEvent> batch = {Algs::createMayBeginEvent(PixelRegion{1}),
                                         Algs::createCancelEvent()};
    watched.pipeline.handleHIDEvents(batch);
    EXPECT_THAT(watched.lately(), ElementsAre("events 2"));
    EXPECT_THAT(watched.events,
                ElementsAre(AllOf(MayBegin(1), StampedAt(42)), AllOf(Cancel(), StampedAt(42))));
    watched.pipeline.handleHIDEvents({});
    EXPECT_THAT(watched.lately(), IsEmpty());
}

TEST(PipelineTest, EventsAreStampedEvenWithoutAProbe) {
    Pipeline pipeline;
    pipeline.setTime(42);
    const std::vector<HidEvent> batch = {Algs::createCancelEvent()};
    pipeline.handleHIDEvents(batch);
    EXPECT_EQ(batch[0].timestamp(), 42U);
}

TEST(PipelineTest, TheClockIsTheCallers) {
    WatchedPipeline watched;
    watched.pipeline.setTime(10);
    watched.feel(kFinger.forMs(100));
    watched.feel(nothing().forMs(500));
    EXPECT_THAT(watched.events,
                ElementsAre(AllOf(MayBegin(1), StampedAt(10)), AllOf(Tap(1), StampedAt(10))));
}

// Probes and copies.

TEST(PipelineTest, AClearedProbeIsSkipped) {
    WatchedPipeline watched;
    watched.pipeline.inputReportProbe = nullptr;
    watched.pipeline.invalidInputReportProbe = nullptr;
    watched.send({7});
    EXPECT_THAT(watched.lately(), IsEmpty());
}

TEST(PipelineTest, AProbeMadeOfAnEmptyFunctionIsEmpty) {
    Pipeline pipeline;
    pipeline.setTimeProbe = std::function<void(std::uint64_t)>();
    void (*nobody)(std::uint64_t) = nullptr;
    EXPECT_FALSE(pipeline.setTimeProbe);
    pipeline.setTime(7);
    pipeline.setTimeProbe = nobody;
    EXPECT_FALSE(pipeline.setTimeProbe);
    pipeline.setTime(8);
    EXPECT_EQ(pipeline.timeMach(), 8U);
}

TEST(PipelineTest, AProbeMayClearItself) {
    Pipeline pipeline;
    int calls = 0;
    pipeline.setTimeProbe = [&pipeline, &calls, alive = std::make_shared<int>(7)](std::uint64_t) {
        pipeline.setTimeProbe = nullptr;
        calls += *alive;
    };
    pipeline.setTime(1);
    pipeline.setTime(2);
    EXPECT_EQ(calls, 7);
}

TEST(PipelineTest, ACopySharesTheProbesClosures) {
    auto counter = std::make_shared<int>(0);
    Pipeline pipeline;
    // A closure with a state of its own: copies of the closure would count apart.
    pipeline.setTimeProbe = [counter, calls = 0](std::uint64_t) mutable { *counter = ++calls; };
    ASSERT_EQ(counter.use_count(), 2);
    Pipeline copy = pipeline;
    EXPECT_EQ(counter.use_count(), 2);
    pipeline.setTime(1);
    copy.setTime(2);
    EXPECT_EQ(*counter, 2);
    pipeline.setTimeProbe = nullptr;
    copy.setTime(3);
    EXPECT_EQ(*counter, 3);
    copy.setTimeProbe = nullptr;
    EXPECT_EQ(counter.use_count(), 1);
}

TEST(PipelineTest, ACopyHasTheTimeAndTheWholeAlgorithmForItself) {
    WatchedPipeline watched;
    watched.pipeline.setState("Algs.HoldTimeoutMilliseconds", 300);
    watched.feel(kFinger.forMs(100));
    watched.pipeline.setTime(5);
    Pipeline copy = watched.pipeline;
    EXPECT_EQ(copy.timeMach(), 5U);
    EXPECT_EQ(firstDifference(copy.algs(), watched.pipeline.algs()), std::nullopt);
    const Algs before = watched.pipeline.algs();
    copy.setTime(6);
    const Bytes reset = firmwareReport(0);
    copy.handleInputReport(reset.data(), reset.size());
    EXPECT_EQ(watched.pipeline.timeMach(), 5U);
    EXPECT_EQ(firstDifference(watched.pipeline.algs(), before), std::nullopt);
    EXPECT_NE(firstDifference(copy.algs(), before), std::nullopt);
}

// Failures end the process. What was thrown is not always told: the compiler may see that nothing
// can catch it.

constexpr const char* kTerminated = "terminate called";

struct BrokenAlgs : Algs {
    BrokenAlgs() { _virtual_image._maxPixelIndex.pop_back(); }
};

struct BrokenPipeline : Pipeline {
    BrokenPipeline() { _algs = BrokenAlgs(); }
};

TEST(PipelineDeathTest, ABrokenInvariantOfTheAlgorithmEndsTheProcess) {
    const Bytes report = imageReport(kFinger, 2, 20);
    EXPECT_THROW(BrokenAlgs().handleReset(), std::out_of_range);
    EXPECT_DEATH(BrokenPipeline().handleInputReport(report.data(), report.size()), kTerminated);
    const Bytes reset = firmwareReport(0);
    EXPECT_DEATH(BrokenPipeline().handleInputReport(reset.data(), reset.size()), kTerminated);
}

TEST(PipelineDeathTest, AFailingProbeEndsTheProcess) {
    const auto fail = [](const auto&...) { throw std::runtime_error(kTerminated); };
    const auto withProbe = [&](auto Pipeline::* probe) {
        Pipeline pipeline;
        pipeline.*probe = fail;
        return pipeline;
    };
    const Bytes image = imageReport(kFinger, 2, 20);
    const Bytes reset = firmwareReport(0);
    EXPECT_DEATH(withProbe(&Pipeline::setTimeProbe).setTime(1), kTerminated);
    EXPECT_DEATH(withProbe(&Pipeline::setStateProbe).setState("Algs.Key", 1), kTerminated);
    EXPECT_DEATH((void)withProbe(&Pipeline::getStateProbe).getState("Algs.Key"), kTerminated);
    EXPECT_DEATH(withProbe(&Pipeline::inputReportProbe).handleInputReport(nullptr, 0), kTerminated);
    EXPECT_DEATH(withProbe(&Pipeline::invalidInputReportProbe).handleInputReport(nullptr, 0),
                 kTerminated);
    EXPECT_DEATH(withProbe(&Pipeline::imageProbe).handleInputReport(image.data(), image.size()),
                 kTerminated);
    EXPECT_DEATH(
        withProbe(&Pipeline::firmwareEventProbe).handleInputReport(reset.data(), reset.size()),
        kTerminated);
    EXPECT_DEATH(withProbe(&Pipeline::hidEventsProbe).handleInputReport(reset.data(), reset.size()),
                 kTerminated);
}

}  // namespace
}  // namespace VexaTouch
