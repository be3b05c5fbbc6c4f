// A process of its own, since it replaces the heap's operators by counting ones.
//
// The figures are those of docs/plugin-abi.md.

#include "Tests/Support/CountedHeap.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"

#include "Platform/TraceListener.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <map>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using testing::ElementsAre;
using testing::Pair;

/// Counts on the input thread, from one report's arrival to the next one's: what a report costs.
class AllocationsPerReport {
public:
    [[nodiscard]] const std::vector<std::size_t>& costs() const { return costs_; }
    [[nodiscard]] std::map<std::size_t, std::size_t> histogram() const {
        std::map<std::size_t, std::size_t> counts;
        for (const std::size_t cost : costs_) ++counts[cost];
        return counts;
    }

private:
    void arrived() {
        if (begun_) costs_.push_back(allocations - before_);
        begun_ = true;
        if (costs_.size() == costs_.capacity()) costs_.reserve(2 * costs_.capacity() + 1000);
        before_ = allocations;
    }

    bool begun_ = false;
    std::size_t before_ = 0;
    std::vector<std::size_t> costs_;
    Vexa::TraceListener listener_{[this](std::uint32_t code, auto) {
        if (code == VEXA_TRACE_REPORT) arrived();
    }};
};

std::vector<std::vector<std::uint8_t>> reportsOf(FrameSequence& sequence,
                                                 std::initializer_list<Touch> touches) {
    std::vector<std::vector<std::uint8_t>> reports;
    for (const Touch& touch : touches) {
        for (auto& report : sequence.reports(touch)) reports.push_back(std::move(report));
    }
    return reports;
}

class ServiceAllocationTest : public testing::Test {
protected:
    void SetUp() override {
        stand.startUp();
        // The recording reaches its full size and is trimmed once.
        ASSERT_TRUE(stand.feed(reportsOf(sequence, {nothing().forMs(28'000)})));
    }
    void TearDown() override { stand.tearDown(); }

    FrameSequence sequence;
    ServiceStand stand{VEXATOUCH_PLUGIN_FILE};
};

TEST_F(ServiceAllocationTest, AReportCostsItsBytesAndEvery64thABlockOfFrames) {
    AllocationsPerReport counter;
    ASSERT_TRUE(stand.feed(reportsOf(sequence, {nothing().forMs(6410)})));
    EXPECT_THAT(counter.histogram(), ElementsAre(Pair(1U, 630U), Pair(2U, 10U)));
}

// The list that the algorithm gives, the event, the list that goes to the queue, the task that
// carries it, and the queue's place for the task.
TEST_F(ServiceAllocationTest, AnEventCostsFiveMore) {
    AllocationsPerReport counter;
    ASSERT_TRUE(stand.feed(
        reportsOf(sequence, {touch("A").at(350).with("B", 150).forMs(900), nothing().forMs(500)})));
    ASSERT_EQ(stand.events.take().size(), 3U);
    std::size_t withEvents = 0;
    for (const std::size_t cost : counter.costs()) {
        if (cost <= 2) continue;
        ++withEvents;
        EXPECT_GE(cost, 6U);
        EXPECT_LE(cost, 7U);
    }
    EXPECT_EQ(withEvents, 3U) << testing::PrintToString(counter.histogram());
}

}  // namespace
}  // namespace VexaTouch::Testing
