#pragma once

#include "Platform/ThreadAnnotations.h"

#include <pthread.h>
#include <atomic>
#include <cstdlib>

namespace Vexa {

/// A mutex that lends its holder the priority of whoever waits for it, so that a real-time thread
/// never waits for a thread that in turn waits for the processor. Not recursive.
class CAPABILITY("mutex") Mutex {
public:
    Mutex() noexcept {
        pthread_mutexattr_t attributes;
        demand(pthread_mutexattr_init(&attributes));
        demand(pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_NORMAL));
        // A system without priority inheritance gets a plain mutex.
        static_cast<void>(pthread_mutexattr_setprotocol(&attributes, PTHREAD_PRIO_INHERIT));
        demand(pthread_mutex_init(&mutex_, &attributes));
        demand(pthread_mutexattr_destroy(&attributes));
    }
    ~Mutex() { static_cast<void>(pthread_mutex_destroy(&mutex_)); }
    Mutex(const Mutex&) = delete;
    Mutex(Mutex&&) = delete;
    Mutex& operator=(const Mutex&) = delete;
    Mutex& operator=(Mutex&&) = delete;

    void lock() noexcept ACQUIRE() {
        demand(pthread_mutex_lock(&mutex_));
        holder_.store(pthread_self(), std::memory_order_relaxed);
    }
    [[nodiscard]] bool tryLock() noexcept TRY_ACQUIRE(true) {
        if (pthread_mutex_trylock(&mutex_) != 0) return false;
        holder_.store(pthread_self(), std::memory_order_relaxed);
        return true;
    }
    void unlock() noexcept RELEASE() {
        holder_.store(pthread_t{}, std::memory_order_relaxed);
        demand(pthread_mutex_unlock(&mutex_));
    }

    /// Whether the calling thread holds it. For assertions.
    [[nodiscard]] bool isHeldByThisThread() const noexcept {
        return pthread_equal(holder_.load(std::memory_order_relaxed), pthread_self()) != 0;
    }

private:
    // Only misuse makes these fail (unlocking what is not held, locking twice).
    static void demand(int error) noexcept {
        if (error != 0) std::abort();
    }

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
