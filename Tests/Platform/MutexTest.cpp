#include "Platform/Mutex.h"

#include <gtest/gtest.h>

#include <pthread.h>
#include <thread>
#include <vector>

namespace Vexa {
namespace {

TEST(Mutex, KnowsWhoHoldsIt) {
    Mutex mutex;
    EXPECT_FALSE(mutex.isHeldByThisThread());
    {
        const MutexLock lock(mutex);
        EXPECT_TRUE(mutex.isHeldByThisThread());
        std::jthread([&] { EXPECT_FALSE(mutex.isHeldByThisThread()); }).join();
    }
    EXPECT_FALSE(mutex.isHeldByThisThread());
}

TEST(Mutex, IsTriedWithoutWaiting) {
    Mutex mutex;
    const auto tried = [&mutex] {
        bool got = false;
        std::jthread([&] {
            if (!mutex.tryLock()) return;
            got = true;
            mutex.unlock();
        }).join();
        return got;
    };
    EXPECT_TRUE(tried());
    {
        const MutexLock lock(mutex);
        EXPECT_FALSE(tried());
    }
    EXPECT_TRUE(tried());
}

TEST(Mutex, HolderThatTriedIsKnownToo) {
    Mutex mutex;
    if (mutex.tryLock()) {
        EXPECT_TRUE(mutex.isHeldByThisThread());
        mutex.unlock();
    } else {
        FAIL() << "nobody holds it";
    }
}

TEST(Mutex, AdmitsOneAtATime) {
    Mutex mutex;
    int count = 0;
    {
        std::vector<std::jthread> threads;
        for (int i = 0; i < 4; ++i) {
            threads.emplace_back([&] {
                for (int j = 0; j < 20'000; ++j) {
                    const MutexLock lock(mutex);
                    ++count;
                }
            });
        }
    }
    EXPECT_EQ(count, 80'000);
}

}  // namespace
}  // namespace Vexa
