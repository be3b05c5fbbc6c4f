#include "Platform/SerialQueue.h"
#include "Tests/Support/FewDescriptors.h"

#include <gmock/gmock.h>

#include <pthread.h>
#include <unistd.h>
#include <algorithm>
#include <array>
#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <latch>
#include <memory>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;

std::int64_t liveQueues() {
    return vexa_live_objects(VEXA_OBJECT_QUEUE);
}

// A queue that ends by itself does so after its last task: there is nothing else to wait for.
void waitForLiveQueues(std::int64_t count) {
    while (liveQueues() != count) std::this_thread::yield();
}

TEST(SerialQueue, RunsTasksInTheOrderTheyCame) {
    const SerialQueue queue("order");
    std::vector<int> ran;
    for (int i = 0; i < 1000; ++i) queue.submit([&ran, i] { ran.push_back(i); });
    queue.drain();
    ASSERT_EQ(ran.size(), 1000U);
    EXPECT_TRUE(std::ranges::is_sorted(ran));
}

TEST(SerialQueue, KeepsTheOrderOfTasksThatTasksSubmit) {
    const SerialQueue queue("order");
    std::vector<int> ran;
    std::latch release(1);
    queue.submit([&] {
        release.wait();
        queue.submit([&] { ran.push_back(3); });
        ran.push_back(1);
    });
    queue.submit([&] { ran.push_back(2); });
    release.count_down();
    queue.drain();
    queue.drain();
    EXPECT_THAT(ran, ElementsAre(1, 2, 3));
}

TEST(SerialQueue, RunsOnOneThreadThatIsNotTheCallers) {
    const SerialQueue queue("thread");
    std::vector<std::thread::id> threads;
    queue.submit([&] { threads.push_back(std::this_thread::get_id()); });
    queue.drain();
    queue.submit([&] { threads.push_back(std::this_thread::get_id()); });
    queue.drain();
    ASSERT_EQ(threads.size(), 2U);
    EXPECT_EQ(threads[0], threads[1]);
    EXPECT_NE(threads[0], std::this_thread::get_id());
}

TEST(SerialQueue, ReturnsFromSubmitAtOnce) {
    const SerialQueue queue("async");
    std::latch release(1);
    queue.submit([&] { release.wait(); });
    queue.submit([] {});
    release.count_down();
    queue.drain();
}

TEST(SerialQueue, KnowsItsOwnThread) {
    const SerialQueue queue("mine");
    const SerialQueue other("other");
    EXPECT_FALSE(vexa_queue_is_current(queue.get()));
    EXPECT_FALSE(vexa_queue_is_current(nullptr));
    queue.submit([&] {
        EXPECT_TRUE(vexa_queue_is_current(queue.get()));
        EXPECT_FALSE(vexa_queue_is_current(other.get()));
    });
    queue.drain();
}

TEST(SerialQueue, NamesItsThreadByTheFirst15BytesOfTheLabel) {
    const auto nameOf = [](const char* label) {
        const SerialQueue queue(label);
        std::array<char, 16> name{};
        queue.submit([&] { pthread_getname_np(pthread_self(), name.data(), name.size()); });
        queue.drain();
        return std::string(name.data());
    };
    EXPECT_EQ(nameOf("short"), "short");
    EXPECT_EQ(nameOf("exactly15bytes."), "exactly15bytes.");
    EXPECT_EQ(nameOf("a label that is too long"), "a label that is");
    EXPECT_FALSE(nameOf(nullptr).empty());
}

TEST(SerialQueue, LeavesSignalsToTheProgramsOwnThreads) {
    const SerialQueue queue("signals");
    sigset_t blocked{};
    queue.submit([&] { pthread_sigmask(SIG_SETMASK, nullptr, &blocked); });
    queue.drain();
    EXPECT_EQ(sigismember(&blocked, SIGINT), 1);
    sigset_t own{};
    pthread_sigmask(SIG_SETMASK, nullptr, &own);
    EXPECT_EQ(sigismember(&own, SIGINT), 0);
}

TEST(SerialQueue, RunsTasksThatOwnWhatCannotBeCopied) {
    const SerialQueue queue("owner");
    auto owned = std::make_unique<int>(7);
    int seen = 0;
    queue.submit([&seen, owned = std::move(owned)] { seen = *owned; });
    queue.drain();
    EXPECT_EQ(seen, 7);
}

TEST(SerialQueue, DestroysATaskOnceItHasRun) {
    const SerialQueue queue("tidy");
    auto shared = std::make_shared<int>(7);
    const std::weak_ptr<int> watched = shared;
    queue.submit([shared = std::move(shared)] {});
    queue.drain();
    EXPECT_TRUE(watched.expired());
}

TEST(SerialQueue, LastReleaseElsewhereWaitsForAllTasks) {
    const std::int64_t before = liveQueues();
    std::latch release(1);
    int ran = 0;
    SerialQueue queue("drained");
    queue.submit([&] { release.wait(); });
    for (int i = 0; i < 100; ++i) queue.submit([&] { ++ran; });
    std::jthread later([&] { release.count_down(); });
    queue.reset();
    EXPECT_EQ(ran, 100);
    EXPECT_EQ(liveQueues(), before);
}

TEST(SerialQueue, LastReleaseOnItsOwnThreadWaitsForNothing) {
    const std::int64_t before = liveQueues();
    std::latch released(1);
    std::latch last(1);
    {
        SerialQueue queue("orphan");
        queue.submit([&, queue]() mutable {
            released.wait();
            queue.reset();
        });
        queue.submit([&] { last.count_down(); });
    }
    released.count_down();
    // What was submitted runs all the same.
    last.wait();
    waitForLiveQueues(before);
}

TEST(SerialQueue, LivesAsLongAsATaskHoldsIt) {
    const std::int64_t before = liveQueues();
    std::latch done(1);
    {
        const SerialQueue queue("held");
        queue.submit([queue, &done] {
            // A task from a task from the last one who holds it.
            queue.submit([queue, &done] { queue.submit([&done] { done.count_down(); }); });
        });
    }
    done.wait();
    waitForLiveQueues(before);
}

TEST(SerialQueue, DrainOnItsOwnThreadReturns) {
    const SerialQueue queue("self");
    bool ran = false;
    queue.submit([&] {
        queue.drain();
        ran = true;
    });
    queue.drain();
    EXPECT_TRUE(ran);
}

TEST(SerialQueue, DrainWithNothingToDoReturns) {
    const SerialQueue queue("idle");
    queue.drain();
    queue.drain();
}

TEST(SerialQueue, SharesOneQueueAmongHandles) {
    const std::int64_t before = liveQueues();
    SerialQueue queue("shared");
    SerialQueue second = SerialQueue::share(queue.get());
    EXPECT_EQ(queue, second);
    EXPECT_EQ(vexa_queue_retain(queue.get()), queue.get());
    vexa_queue_release(queue.get());
    queue.reset();
    EXPECT_FALSE(queue);
    bool ran = false;
    second.submit([&] { ran = true; });
    second.reset();
    EXPECT_TRUE(ran);
    EXPECT_EQ(liveQueues(), before);
}

// A queue takes four descriptors.
TEST(SerialQueue, IsNotMadeWithoutDescriptorsLeft) {
    const std::int64_t before = liveQueues();
    for (const rlim_t left : std::to_array<rlim_t>({0, 1, 2, 3})) {
        const VexaTouch::Testing::FewDescriptors few(left);
        EXPECT_EQ(vexa_queue_create("few"), nullptr) << left;
    }
    EXPECT_EQ(liveQueues(), before);
    const VexaTouch::Testing::FewDescriptors enough(4);
    vexa_queue* const queue = vexa_queue_create("enough");
    EXPECT_NE(queue, nullptr);
    vexa_queue_release(queue);
}

// Others push, and let go, while a task that is running lets go: what they pushed runs before the
// queue ends, whoever is the last.
TEST(SerialQueue, RunsWhatCameWhileItsLastTaskLetGo) {
    constexpr int kPushers = 3;
    struct Context {
        vexa_queue* queue;
        bool isLast;                       // the task, in any case
        std::latch running{kPushers + 1};  // the task, and those who push
        std::latch released{kPushers};
        std::atomic<int> ran{0};
    };
    for (int round = 0; round < 200; ++round) {
        const std::int64_t before = liveQueues();
        Context context{.queue = vexa_queue_create("last"), .isLast = round % 2 == 0};
        ASSERT_NE(context.queue, nullptr);
        // The first reference is the task's.
        for (int i = 0; i < kPushers; ++i) vexa_queue_retain(context.queue);
        ASSERT_TRUE(vexa_queue_submit(
            context.queue,
            [](void* pointer) {
                Context& of = *static_cast<Context*>(pointer);
                of.running.arrive_and_wait();
                if (of.isLast) of.released.wait();
                vexa_queue_release(of.queue);
            },
            &context));
        std::vector<std::thread> pushers;
        for (int i = 0; i < kPushers; ++i) {
            pushers.emplace_back([&context] {
                context.running.arrive_and_wait();
                EXPECT_TRUE(vexa_queue_submit(
                    context.queue, [](void* pointer) { ++static_cast<Context*>(pointer)->ran; },
                    &context));
                vexa_queue_release(context.queue);
                context.released.count_down();
            });
        }
        for (std::thread& pusher : pushers) pusher.join();
        waitForLiveQueues(before);
        EXPECT_EQ(context.ran, kPushers) << round;
    }
}

TEST(SerialQueue, TakesNullWhereItMay) {
    EXPECT_EQ(vexa_queue_retain(nullptr), nullptr);
    vexa_queue_release(nullptr);
    vexa_queue* const unnamed = vexa_queue_create(nullptr);
    ASSERT_NE(unnamed, nullptr);
    vexa_queue_release(unnamed);
}

TEST(SerialQueue, LosesNoTaskUnderStress) {
    constexpr int kThreads = 4;
    constexpr int kTasks = 5000;
    const std::int64_t before = liveQueues();
    std::vector<std::vector<int>> ran(kThreads);
    std::atomic<int> inside = 0;
    {
        std::vector<std::jthread> submitters;
        SerialQueue queue("stress");
        for (std::size_t who = 0; who < kThreads; ++who) {
            submitters.emplace_back([&ran, &inside, queue, who] {
                for (int i = 0; i < kTasks; ++i) {
                    queue.submit([&ran, &inside, who, i] {
                        EXPECT_EQ(++inside, 1);
                        ran[who].push_back(i);
                        --inside;
                    });
                    if (i % 1000 == 0) queue.drain();
                }
            });
        }
        queue.reset();
    }
    waitForLiveQueues(before);
    for (const std::vector<int>& tasks : ran) {
        ASSERT_EQ(tasks.size(), kTasks);
        EXPECT_TRUE(std::ranges::is_sorted(tasks));
    }
}

// Queues made and released all the time, by both ways to the end.
TEST(SerialQueue, EndsCleanlyAgainAndAgain) {
    const std::int64_t before = liveQueues();
    std::atomic<int> ran = 0;
    for (int i = 0; i < 300; ++i) {
        const SerialQueue queue("brief");
        queue.submit([&ran] { ++ran; });
        if (i % 2 == 0) queue.submit([queue, &ran] { ++ran; });
    }
    waitForLiveQueues(before);
    EXPECT_EQ(ran, 450);
}

// The child process is a copy of this one, so no other thread may be there when it is made.
TEST(SerialQueueDeathTest, ProcessExitsWhileATaskRuns) {
    const auto leave = [] {
        std::latch running(1);
        std::latch never(1);
        // Not released: nobody waits for a task that never ends.
        vexa_queue* const queue = vexa_queue_create("busy");
        struct Latches {
            std::latch& running;
            std::latch& never;
        } latches{running, never};
        vexa_queue_submit(
            queue,
            [](void* context) {
                auto& both = *static_cast<Latches*>(context);
                both.running.count_down();
                both.never.wait();
            },
            &latches);
        for (int i = 0; i < 100; ++i) vexa_queue_submit(queue, [](void*) {}, nullptr);
        running.wait();
        std::exit(7);
    };
    EXPECT_EXIT(leave(), testing::ExitedWithCode(7), "");
}

TEST(SerialQueueDeathTest, ProcessExitsWhileTasksComeAndGo) {
    const auto leave = [] {
        static std::atomic<int> ran = 0;
        vexa_queue* const queue = vexa_queue_create("busy");
        // Keeps itself going.
        struct Again {
            static void run(void* context) {
                ++ran;
                vexa_queue_submit(static_cast<vexa_queue*>(context), &run, context);
            }
        };
        vexa_queue_submit(queue, &Again::run, queue);
        while (ran < 100) std::this_thread::yield();
        std::exit(7);
    };
    EXPECT_EXIT(leave(), testing::ExitedWithCode(7), "");
}

TEST(SerialQueueDeathTest, StaticQueueRunsItsTasksAtExit) {
    const auto leave = [] {
        static const SerialQueue queue("static");
        queue.submit([] { static_cast<void>(::write(STDERR_FILENO, "ran\n", 4) == 4); });
        std::exit(7);
    };
    EXPECT_EXIT(leave(), testing::ExitedWithCode(7), "ran");
}

}  // namespace
}  // namespace Vexa
