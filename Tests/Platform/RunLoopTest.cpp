#include "Platform/RunLoop.h"
#include "Tests/Support/FewDescriptors.h"

#include <gmock/gmock.h>

#include <sys/resource.h>
#include <unistd.h>
#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <latch>
#include <memory>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;

constexpr const char* kMode = "mode";
constexpr const char* kOther = "other";
// Only a failing test waits that long.
constexpr std::uint64_t kGuard = 60'000'000'000;

std::int64_t liveLoops() {
    return vexa_live_objects(VEXA_OBJECT_RUN_LOOP);
}

// Runs the body on a thread of its own, to its end.
template <typename Body>
void onThread(Body body) {
    std::jthread(std::move(body)).join();
}

TEST(RunLoop, IsTheSameForAThreadAndAnotherForEachOther) {
    const RunLoop loop = RunLoop::current();
    EXPECT_EQ(loop, RunLoop::current());
    onThread([&] { EXPECT_NE(loop, RunLoop::current()); });
    EXPECT_NE(loop, RunLoop());
}

TEST(RunLoop, IsBorrowedFromItsThread) {
    const std::int64_t before = liveLoops();
    onThread([&] {
        EXPECT_EQ(vexa_run_loop_current(), vexa_run_loop_current());
        EXPECT_EQ(liveLoops(), before + 1);
    });
    EXPECT_EQ(liveLoops(), before);
}

TEST(RunLoop, OutlivesItsThreadWhenRetainedAndNeverRunsAgain) {
    const std::int64_t before = liveLoops();
    RunLoop loop;
    onThread([&] { loop = RunLoop::current(); });
    EXPECT_EQ(liveLoops(), before + 1);
    EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_FAILED);
    EXPECT_FALSE(loop.submit(kMode, [] { ADD_FAILURE() << "nobody runs this"; }));
    loop.wake();
    loop.stop();
    loop.reset();
    EXPECT_EQ(liveLoops(), before);
}

TEST(RunLoop, RunsOnItsOwnThreadOnly) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        loop.submit(kMode, [] { ADD_FAILURE() << "on a foreign thread"; });
        onThread([&] { EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_FAILED); });
        EXPECT_EQ(vexa_run_loop_run(loop.get(), nullptr, 0, false), VEXA_RUN_FAILED);
    });
}

TEST(RunLoop, KeepsATaskThatCameBeforeTheRun) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        std::vector<int> ran;
        EXPECT_TRUE(loop.submit(kMode, [&] { ran.push_back(1); }));
        EXPECT_TRUE(loop.submit(kMode, [&] { ran.push_back(2); }));
        EXPECT_TRUE(loop.submit(kMode, [&] { ran.push_back(3); }));
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
        EXPECT_THAT(ran, ElementsAre(1, 2, 3));
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
        EXPECT_THAT(ran, ElementsAre(1, 2, 3));
    });
}

TEST(RunLoop, KeepsAStopThatCameBeforeTheRun) {
    RunLoop loop;
    std::latch known(1);
    std::latch submitted(1);
    std::jthread thread([&] {
        loop = RunLoop::current();
        known.count_down();
        submitted.wait();
        EXPECT_EQ(loop.run(kMode, kGuard), VEXA_RUN_STOPPED);
    });
    known.wait();
    loop.submit(kMode, [loop] { loop.stop(); });
    submitted.count_down();
}

// A thread whose loop runs, and must end by being stopped.
class RunningLoop {
public:
    RunningLoop() { running_.wait(); }

    const RunLoop& loop() const { return loop_; }

private:
    RunLoop loop_;
    std::latch running_{1};
    std::jthread thread_{[this] {
        loop_ = RunLoop::current();
        loop_.submit(kMode, [this] { running_.count_down(); });
        EXPECT_EQ(loop_.run(kMode, kGuard), VEXA_RUN_STOPPED);
    }};
};

TEST(RunLoop, IsWokenByATaskFromAnotherThread) {
    const RunningLoop running;
    running.loop().submit(kMode, [loop = running.loop()] { loop.stop(); });
}

TEST(RunLoop, ServesOnlyTheModeThatItRunsIn) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        std::vector<int> ran;
        loop.submit(kOther, [&] { ran.push_back(1); });
        loop.submit(kMode, [&] { ran.push_back(2); });
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
        EXPECT_THAT(ran, ElementsAre(2));
        EXPECT_EQ(loop.run(kOther, 0), VEXA_RUN_TIMED_OUT);
        EXPECT_THAT(ran, ElementsAre(2, 1));
    });
}

TEST(RunLoop, ComparesModesByTheirText) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        const std::string one = "a mode";
        const std::string same = "a mode";
        bool ran = false;
        loop.submit(one.c_str(), [&] { ran = true; });
        loop.run(same.c_str(), 0);
        EXPECT_TRUE(ran);
    });
}

TEST(RunLoop, ReturnsAfterOneSourceWhenAsked) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        std::vector<int> ran;
        loop.submit(kMode, [&] { ran.push_back(1); });
        loop.submit(kMode, [&] { ran.push_back(2); });
        EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_HANDLED);
        EXPECT_THAT(ran, ElementsAre(1));
        EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_HANDLED);
        EXPECT_THAT(ran, ElementsAre(1, 2));
        EXPECT_EQ(loop.run(kMode, 0, true), VEXA_RUN_TIMED_OUT);
    });
}

TEST(RunLoop, TimesOutNotBeforeTheTimeIsOver) {
    onThread([] {
        const auto start = std::chrono::steady_clock::now();
        EXPECT_EQ(RunLoop::current().run(kMode, 2'000'000), VEXA_RUN_TIMED_OUT);
        EXPECT_GE(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(2));
    });
}

TEST(RunLoop, TimesOutAlsoWhenATaskSubmitsItselfForever) {
    onThread([] {
        struct Again {
            RunLoop loop;
            void operator()() const { loop.submit(kMode, *this); }
        };
        const RunLoop loop = RunLoop::current();
        loop.submit(kMode, Again{loop});
        EXPECT_EQ(loop.run(kMode, 1'000'000), VEXA_RUN_TIMED_OUT);
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
    });
}

TEST(RunLoop, StopEndsTheInnermostRun) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        std::vector<int> order;
        loop.submit(kMode, [&] {
            loop.submit(kOther, [&] {
                order.push_back(1);
                loop.stop();
            });
            EXPECT_EQ(loop.run(kOther, kGuard), VEXA_RUN_STOPPED);
            order.push_back(2);
        });
        loop.submit(kMode, [&] {
            order.push_back(3);
            loop.stop();
        });
        EXPECT_EQ(loop.run(kMode, kGuard), VEXA_RUN_STOPPED);
        EXPECT_THAT(order, ElementsAre(1, 2, 3));
    });
}

TEST(RunLoop, RunsTheSameModeInsideOfItself) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        std::vector<int> order;
        loop.submit(kMode, [&] {
            EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
            order.push_back(2);
        });
        loop.submit(kMode, [&] { order.push_back(1); });
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
        EXPECT_THAT(order, ElementsAre(1, 2));
    });
}

TEST(RunLoop, StopLeavesWhatIsReadyToTheNextRun) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        std::vector<int> ran;
        loop.submit(kMode, [&] {
            ran.push_back(1);
            loop.stop();
        });
        loop.submit(kMode, [&] { ran.push_back(2); });
        EXPECT_EQ(loop.run(kMode, kGuard), VEXA_RUN_STOPPED);
        EXPECT_THAT(ran, ElementsAre(1));
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
        EXPECT_THAT(ran, ElementsAre(1, 2));
    });
}

TEST(RunLoop, StopCountsMoreThanOneSourceServed) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        loop.submit(kMode, [&] { loop.stop(); });
        EXPECT_EQ(loop.run(kMode, kGuard, true), VEXA_RUN_STOPPED);
    });
}

TEST(RunLoop, StopWithoutARunDoesNothing) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        loop.stop();
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
    });
}

TEST(RunLoop, StopFromAnotherThreadEndsAWaitingRun) {
    const RunningLoop running;
    running.loop().stop();
}

TEST(RunLoop, WakingServesNothing) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        loop.wake();
        onThread([&] { loop.wake(); });
        EXPECT_EQ(loop.run(kMode, 0, true), VEXA_RUN_TIMED_OUT);
        EXPECT_EQ(loop.run(kMode, 1'000'000, true), VEXA_RUN_TIMED_OUT);
    });
}

TEST(RunLoop, DestroysTasksThatCanNeverRun) {
    auto alive = std::make_shared<int>(1);
    const std::weak_ptr<int> watched = alive;
    onThread([&] {
        const RunLoop loop = RunLoop::current();
        loop.submit(kMode, [alive, loop] { ADD_FAILURE() << "the loop never runs"; });
        loop.submit(kOther, [alive = std::move(alive)] { ADD_FAILURE() << "nor in this mode"; });
        EXPECT_FALSE(watched.expired());
    });
    EXPECT_TRUE(watched.expired());
}

TEST(RunLoop, DestroysATaskOnceItHasRun) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        auto alive = std::make_unique<int>(1);
        std::shared_ptr<int> shared = std::make_shared<int>(2);
        const std::weak_ptr<int> watched = shared;
        loop.submit(kMode, [alive = std::move(alive), shared = std::move(shared)] {});
        EXPECT_FALSE(watched.expired());
        loop.run(kMode, 0);
        EXPECT_TRUE(watched.expired());
    });
}

TEST(RunLoop, CallsEitherTheTaskOrItsDropOnce) {
    struct Counts {
        int ran = 0;
        int dropped = 0;
    };
    Counts first;
    Counts second;
    onThread([&] {
        const auto run = [](void* context) { ++static_cast<Counts*>(context)->ran; };
        const auto drop = [](void* context) { ++static_cast<Counts*>(context)->dropped; };
        vexa_run_loop* const loop = vexa_run_loop_current();
        EXPECT_TRUE(vexa_run_loop_submit(loop, kMode, run, drop, &first));
        EXPECT_EQ(vexa_run_loop_run(loop, kMode, 0, false), VEXA_RUN_TIMED_OUT);
        EXPECT_TRUE(vexa_run_loop_submit(loop, kMode, run, drop, &second));
        // Dropped without a word.
        EXPECT_TRUE(vexa_run_loop_submit(loop, kMode, run, nullptr, &second));
    });
    EXPECT_EQ(first.ran, 1);
    EXPECT_EQ(first.dropped, 0);
    EXPECT_EQ(second.ran, 0);
    EXPECT_EQ(second.dropped, 1);
}

TEST(RunLoop, IsGoneForWhatEndsAfterItInItsThread) {
    onThread([] {
        struct Late {
            ~Late() { EXPECT_EQ(vexa_run_loop_current(), nullptr); }
        };
        // Made before the loop, so it ends after it.
        static thread_local Late late;
        static_cast<void>(late);
        EXPECT_NE(vexa_run_loop_current(), nullptr);
    });
}

// A mode takes three descriptors.
TEST(RunLoop, FailsToRunInANewModeWithoutDescriptorsLeft) {
    onThread([] {
        const RunLoop loop = RunLoop::current();
        for (const rlim_t left : std::to_array<rlim_t>({0, 1, 2})) {
            const VexaTouch::Testing::FewDescriptors few(left);
            EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_FAILED) << left;
        }
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
    });
}

TEST(RunLoop, TakesNullWhereItMay) {
    EXPECT_EQ(vexa_run_loop_retain(nullptr), nullptr);
    vexa_run_loop_release(nullptr);
    onThread([] {
        EXPECT_FALSE(
            vexa_run_loop_submit(vexa_run_loop_current(), nullptr, [](void*) {}, nullptr, nullptr));
    });
}

// Many threads submit while the loop runs, is stopped and runs again: each task runs once, those of
// one thread in their order.
TEST(RunLoop, LosesNoTaskUnderStress) {
    constexpr int kThreads = 4;
    constexpr int kTasks = 2000;
    RunLoop loop;
    std::latch known(1);
    std::vector<std::vector<int>> ran(kThreads);
    std::atomic<bool> finished = false;
    std::jthread thread([&] {
        loop = RunLoop::current();
        known.count_down();
        while (!finished) loop.run(kMode, kGuard);
        // What came between the last stop and the end.
        loop.run(kMode, 0);
    });
    known.wait();
    {
        std::vector<std::jthread> submitters;
        for (std::size_t who = 0; who < kThreads; ++who) {
            submitters.emplace_back([&, who] {
                for (int i = 0; i < kTasks; ++i) {
                    loop.submit(kMode, [&ran, who, i] { ran[who].push_back(i); });
                    if (i % 16 == 0) loop.stop();
                    if (i % 7 == 0) loop.wake();
                }
            });
        }
    }
    const RunLoop shared = loop;
    loop.submit(kMode, [&finished, shared] {
        finished = true;
        shared.stop();
    });
    thread.join();
    for (const std::vector<int>& tasks : ran) {
        ASSERT_EQ(tasks.size(), kTasks);
        EXPECT_TRUE(std::ranges::is_sorted(tasks));
    }
}

}  // namespace
}  // namespace Vexa
