// A process of its own, since it replaces the heap's operators by counting ones.

#include "Algorithm/Algs.h"
#include "Pipeline/FrameList.h"
#include "Pipeline/PipelineRecording.h"
#include "Pipeline/TrimRule.h"
#include "Tests/Support/CountedHeap.h"
#include "Tests/Support/FakeHostClock.h"
#include "Tests/Support/SessionGenerator.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <new>
#include <optional>
#include <utility>
#include <vector>

namespace VexaTouch {
namespace {

using Testing::allocations;
using Testing::releases;

TEST(FrameAllocation, TheHeapIsCounted) {
    const std::size_t before = allocations;
    // A direct call, which no compiler may leave out as it may a new expression.
    void* const memory = ::operator new(16);
    EXPECT_EQ(allocations, before + 1);
    ::operator delete(memory);
}

TEST(FrameAllocation, AFrameWithoutAnEventAllocatesNothing) {
    Testing::SessionGenerator generator(1);
    Testing::SessionGenerator::Images images = generator.mixed(50'000);
    for (const auto& image : generator.noisy(2000)) {
        images.push_back(image);
    }
    Algs algs;
    std::size_t quietFrames = 0;
    std::size_t touchingFrames = 0;
    std::size_t events = 0;
    for (const InputReport::Image& image : images) {
        const std::size_t before = allocations;
        const std::size_t made = algs.handleImage(image).size();
        const std::size_t used = allocations - before;
        events += made;
        if (made == 0) {
            ASSERT_EQ(used, 0U) << "frame " << image.frameNumber;
            ++quietFrames;
            touchingFrames += algs.handStats()._isTouching ? 1U : 0U;
        } else {
            // The list of one event and the event itself.
            ASSERT_LE(used, 2U) << "frame " << image.frameNumber;
        }
    }
    // What was counted is worth it.
    EXPECT_GT(quietFrames, 50'000U);
    EXPECT_GT(touchingFrames, 5'000U);
    EXPECT_GT(events, 300U);
}

TEST(FrameAllocation, ASettingDoesNotMakeTheNextFrameAllocate) {
    Testing::SessionGenerator generator(2);
    Algs algs;
    for (const InputReport::Image& image : generator.touching(100)) {
        algs.handleImage(image);
    }
    algs.setState("ActivationThreshold", 180.0);
    algs.setState("VirtualNormalizationFactors.3", 0.5);
    for (const InputReport::Image& image : generator.touching(100)) {
        const std::size_t before = allocations;
        const bool none = algs.handleImage(image).empty();
        EXPECT_TRUE(!none || allocations == before);
    }
}

/// A recording with the cap that a service sets, which takes reports of a session without an event.
class CappedRecording {
public:
    static constexpr std::size_t kCap = 1350;

    CappedRecording() {
        recording_.setMaxFrameCount(kCap);
        for (const InputReport::Image& image : Testing::SessionGenerator(1).idle(500)) {
            reports_.push_back(Testing::imageReport(image.signedPixels, image.frameNumber,
                                                    image.timestampMs, image.unsignedPixels));
        }
    }

    /// Gives the allocations that it took.
    std::size_t record() {
        const std::vector<std::uint8_t>& report = reports_[next_++ % reports_.size()];
        clock_.ticks += 1'000'000;
        const std::size_t before = allocations;
        recording_.handleInputReport(report.data(), report.size());
        return allocations - before;
    }
    [[nodiscard]] const PipelineRecording& recording() const { return recording_; }
    [[nodiscard]] std::size_t size() const { return recording_.frames().size(); }

private:
    Testing::FakeHostClock clock_;
    PipelineRecording recording_{clock_};
    std::vector<std::vector<std::uint8_t>> reports_;
    std::size_t next_ = 0;
};

/// How many reports took 0, 1, 2, ... allocations (more counts as the last), and the trims.
struct RecordingCost {
    std::array<std::size_t, 8> reports{};
    std::size_t mostOfATrim = 0;
    std::size_t trims = 0;
};

template <typename AfterEach>
RecordingCost costOfRecording(AfterEach&& afterEach) {
    CappedRecording capped;
    for (std::size_t i = 0; i < 3 * CappedRecording::kCap; ++i) {
        capped.record();
        afterEach(capped);
    }
    RecordingCost cost;
    for (std::size_t i = 0; i < 64 * CappedRecording::kCap; ++i) {
        const std::size_t before = capped.size();
        const std::size_t used = capped.record();
        if (capped.size() < before) {
            ++cost.trims;
            cost.mostOfATrim = std::max(cost.mostOfATrim, used);
        } else {
            ++cost.reports.at(std::min(used, cost.reports.size() - 1));
        }
        afterEach(capped);
    }
    return cost;
}

TEST(RecordingAllocation, AReportTakesItsBytesAndEvery64thABlock) {
    const RecordingCost cost = costOfRecording([](const CappedRecording&) {});
    constexpr std::size_t kReports = 64 * CappedRecording::kCap;
    EXPECT_EQ(cost.trims, 64U);
    EXPECT_EQ(cost.reports[0], 0U);
    EXPECT_EQ(cost.reports[1] + cost.reports[2], kReports - cost.trims);
    EXPECT_LE(cost.reports[2], kReports / FrameList::kBlockFrames);
    // Every 1350th report: its own two, which frames are kept, the list of blocks, and a block for
    // what is left of the oldest one.
    EXPECT_LE(cost.mostOfATrim, 5U);
}

TEST(RecordingAllocation, ACopyHeldMeanwhileDoesNotMakeReportsDearer) {
    std::optional<PipelineRecording> copy;
    const RecordingCost cost =
        costOfRecording([&](const CappedRecording& capped) { copy.emplace(capped.recording()); });
    constexpr std::size_t kReports = 64 * CappedRecording::kCap;
    EXPECT_EQ(cost.reports[1] + cost.reports[2], kReports - cost.trims);
    EXPECT_LE(cost.reports[2], kReports / FrameList::kBlockFrames);
    // The frames kept of a block that lost some are copied.
    EXPECT_LE(cost.mostOfATrim, 5U + FrameList::kBlockFrames);
}

TEST(RecordingAllocation, ACopyTakesNoMoreThanItsAlgorithmAndAListOfBlocks) {
    CappedRecording capped;
    while (capped.size() < 2 * CappedRecording::kCap - 1) {
        capped.record();
    }
    const std::size_t before = allocations;
    const Algs algs = capped.recording().algs();
    const std::size_t algorithm = allocations - before;
    const PipelineRecording copy = capped.recording();
    EXPECT_EQ(allocations - before, 2 * algorithm + 1);
    EXPECT_EQ(copy.frames().size(), 2699U);
}

std::size_t live() {
    return allocations - releases;
}

TEST(FrameListAllocation, ErasedFramesAreReleased) {
    const std::size_t before = live();
    FrameList frames;
    for (std::uint64_t i = 0; i < 640; ++i) {
        RecordedFrame frame;
        frame.timestamp = i;
        frame.report.assign(73, 7);
        frames.push_back(std::move(frame));
    }
    std::optional<FrameList> copy = frames;
    EXPECT_EQ(live(), before + 640 + 10 + 2);
    frames.retain([](const RecordedFrame& frame) { return frame.timestamp >= 600; });
    copy.reset();
    EXPECT_EQ(live(), before + 40 + 1 + 1);
    frames = FrameList();
    EXPECT_EQ(live(), before);
}

/// What is kept of each trim is little; it comes to lie in few blocks all the same.
TEST(FrameListAllocation, FewFramesNeverTakeManyBlocks) {
    const std::size_t before = live();
    FrameList frames;
    std::size_t kept = 0;
    for (std::uint64_t i = 0; i < 100; ++i) {
        for (std::uint64_t k = 0; k < 70; ++k) {
            RecordedFrame frame;
            frame.timestamp = 70 * i + k;
            frames.push_back(std::move(frame));
        }
        frames.retain([&](const RecordedFrame& frame) { return frame.timestamp % 70 == 0; });
        ++kept;
        ASSERT_EQ(frames.size(), kept);
        ASSERT_LE(live(), before + 1 + 2 * kept / FrameList::kBlockFrames + 1);
    }
}

}  // namespace
}  // namespace VexaTouch
