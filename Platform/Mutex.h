#pragma once

#include "Platform/ThreadAnnotations.h"

#include <pthread.h>
#include <atomic>

namespace Vexa {

/// A mutex that lends its holder the priority of whoever waits for it, so that a real-time thread
/// never waits for a thread that in turn waits for the processor. Not recursive.
class CAPABILITY("mutex") Mutex {
public:
    Mutex();
    ~Mutex();
    Mutex(const Mutex&) = delete;
    Mutex(Mutex&&) = delete;
    Mutex& operator=(const Mutex&) = delete;
    Mutex& operator=(Mutex&&) = delete;

    void lock() noexcept ACQUIRE();
    [[nodiscard]] bool tryLock() noexcept TRY_ACQUIRE(true);
    void unlock() noexcept RELEASE();

    /// Whether the calling thread holds it. For assertions.
    [[nodiscard]] bool isHeldByThisThread() const noexcept;

    [[nodiscard]] pthread_mutex_t* native() noexcept { return &mutex_; }

private:
    pthread_mutex_t mutex_;
    std::atomic<pthread_t> holder_{};
};

/// Holds a mutex for as long as it lives.
class SCOPED_CAPABILITY MutexLock {
public:
    explicit MutexLock(Mutex& mutex) noexcept ACQUIRE(mutex) : mutex_(mutex) { mutex_.lock(); }
    ~MutexLock() RELEASE() { mutex_.unlock(); }
    MutexLock(const MutexLock&) = delete;
    MutexLock(MutexLock&&) = delete;
    MutexLock& operator=(const MutexLock&) = delete;
    MutexLock& operator=(MutexLock&&) = delete;

private:
    Mutex& mutex_;
};

}  // namespace Vexa
