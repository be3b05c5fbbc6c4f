#include "Platform/Mutex.h"

#include <cstdlib>

namespace Vexa {

namespace {

// Only misuse makes these fail (unlocking what is not held, locking twice).
void demand(int error) noexcept {
    if (error != 0) std::abort();
}

}  // namespace

Mutex::Mutex() {
    pthread_mutexattr_t attributes;
    demand(pthread_mutexattr_init(&attributes));
    demand(pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_NORMAL));
    // A system without priority inheritance gets a plain mutex.
    static_cast<void>(pthread_mutexattr_setprotocol(&attributes, PTHREAD_PRIO_INHERIT));
    demand(pthread_mutex_init(&mutex_, &attributes));
    demand(pthread_mutexattr_destroy(&attributes));
}

Mutex::~Mutex() {
    static_cast<void>(pthread_mutex_destroy(&mutex_));
}

void Mutex::lock() noexcept {
    demand(pthread_mutex_lock(&mutex_));
    holder_.store(pthread_self(), std::memory_order_relaxed);
}

bool Mutex::tryLock() noexcept {
    if (pthread_mutex_trylock(&mutex_) != 0) return false;
    holder_.store(pthread_self(), std::memory_order_relaxed);
    return true;
}

void Mutex::unlock() noexcept {
    holder_.store(pthread_t{}, std::memory_order_relaxed);
    demand(pthread_mutex_unlock(&mutex_));
}

bool Mutex::isHeldByThisThread() const noexcept {
    return pthread_equal(holder_.load(std::memory_order_relaxed), pthread_self()) != 0;
}

}  // namespace Vexa
