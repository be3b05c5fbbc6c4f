#pragma once

#include "Platform/ThreadAnnotations.h"

#include <pthread.h>
#include <cstdlib>

namespace Vexa::Library {

/// A mutex that lends its holder the priority of whoever waits, since real-time input threads meet
/// ordinary ones in here. Not recursive.
class CAPABILITY("mutex") Mutex {
public:
    Mutex() noexcept {
        pthread_mutexattr_t attributes;
        demand(pthread_mutexattr_init(&attributes));
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

    void lock() noexcept ACQUIRE() { demand(pthread_mutex_lock(&mutex_)); }
    void unlock() noexcept RELEASE() { demand(pthread_mutex_unlock(&mutex_)); }

private:
    // Only misuse makes these fail.
    static void demand(int error) noexcept {
        if (error != 0) std::abort();
    }

    pthread_mutex_t mutex_;
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

}  // namespace Vexa::Library
