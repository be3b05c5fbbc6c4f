#pragma once

#include <semaphore.h>
#include <cerrno>
#include <cstdlib>

namespace VexaTouch {

/// A counting semaphore that starts at 0. Not std::counting_semaphore: that of g++ 12 may miss a
/// signal (GCC bug 104928). Whoever signals and whoever waits each keep it alive.
class CountingSemaphore {
public:
    CountingSemaphore() noexcept { demand(sem_init(&semaphore_, 0, 0) == 0); }
    ~CountingSemaphore() { static_cast<void>(sem_destroy(&semaphore_)); }
    CountingSemaphore(const CountingSemaphore&) = delete;
    CountingSemaphore(CountingSemaphore&&) = delete;
    CountingSemaphore& operator=(const CountingSemaphore&) = delete;
    CountingSemaphore& operator=(CountingSemaphore&&) = delete;

    void signal() noexcept { demand(sem_post(&semaphore_) == 0); }
    /// Waits for one signal, however long it takes.
    void wait() noexcept {
        while (sem_wait(&semaphore_) != 0) {
            demand(errno == EINTR);
        }
    }
    /// Takes a signal if one is there.
    [[nodiscard]] bool tryWait() noexcept {
        while (sem_trywait(&semaphore_) != 0) {
            if (errno == EAGAIN) return false;
            demand(errno == EINTR);
        }
        return true;
    }

private:
    // Only misuse makes these calls fail.
    static void demand(bool succeeded) noexcept {
        if (!succeeded) std::abort();
    }

    sem_t semaphore_{};
};

}  // namespace VexaTouch
