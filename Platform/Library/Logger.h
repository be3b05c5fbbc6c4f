#pragma once

#include "Platform/Library/Journal.h"
#include "Platform/Library/LogLimit.h"
#include "Platform/Library/LogMessage.h"
#include "Platform/Library/LogRing.h"
#include "Platform/Mutex.h"

#include <pthread.h>
#include <semaphore.h>
#include <sys/types.h>
#include <atomic>
#include <cstdint>
#include <string_view>

namespace Vexa::Library {

/// Brings messages to the sink, in order.
///
/// Threads that must not block put them into a ring that never makes them wait; a thread of the
/// logger's own takes them out. All other threads hold the lock while they give the sink first what
/// is in the ring and then their own message. So what a thread logged before it passed work on
/// comes before what is logged about that work, and only a full ring loses messages.
class Logger {
public:
    /// The one of the process, which lives until its very end.
    static Logger& shared();

    Logger();
    ~Logger() = default;
    Logger(const Logger&) = delete;
    Logger(Logger&&) = delete;
    Logger& operator=(const Logger&) = delete;
    Logger& operator=(Logger&&) = delete;

    void write(vexa_log_category category, vexa_log_level level, std::string_view text) noexcept;
    void setSink(vexa_log_sink sink, void* context, void (*destroy)(void*)) noexcept;
    bool setThreadMustNotBlock(bool mustNotBlock) noexcept;
    void flush() noexcept;
    [[nodiscard]] std::uint64_t dropped() const noexcept { return dropped_.load(); }
    /// Gives what is in the ring half a second to reach the sink, and ends the logger's thread.
    void finish() noexcept;

private:
    struct Sink {
        vexa_log_sink call = nullptr;
        void* context = nullptr;
        void (*destroy)(void*) = nullptr;

        void end() const noexcept {
            if (destroy != nullptr) destroy(context);
        }
    };

    void startWriter() noexcept;
    static void* runWriter(void* logger) noexcept;
    void writeAsTheyCome() noexcept;
    void wakeWriter() noexcept;
    [[nodiscard]] bool isBehind() const noexcept;

    /// For code that a sink calls, on the thread that holds the lock for it.
    void assertInSink() const noexcept ASSERT_CAPABILITY(mutex_);
    void drain() noexcept REQUIRES(mutex_);
    void reportDropped(std::uint64_t total) noexcept REQUIRES(mutex_);
    void deliver(const LogMessage& message) noexcept REQUIRES(mutex_);
    void writeByDefault(const LogMessage& message) noexcept REQUIRES(mutex_);
    void tellLeftOut() noexcept;

    Mutex mutex_;  // also for the front of the ring
    Sink sink_ GUARDED_BY(mutex_);
    bool isReplacedInCall_ GUARDED_BY(mutex_) = false;
    // Kept, so that telling of dropped messages needs no memory.
    LogMessage report_ GUARDED_BY(mutex_);
    LogLimit limit_ GUARDED_BY(mutex_);  // of standard error; the journal has its own
    const Journal journal_;

    std::atomic<LogRing*> ring_{nullptr};  // made with the first writer, kept to the end
    std::atomic<std::uint64_t> dropped_{0};
    std::atomic<std::uint64_t> reported_{0};  // how many of them; written with mutex_ held

    Mutex startMutex_;
    pthread_t writer_ GUARDED_BY(startMutex_){};
    pid_t writersProcess_ GUARDED_BY(startMutex_) = 0;  // a forked one has no writer
    std::atomic<bool> isWriterAsleep_{false};
    std::atomic<bool> isEnding_{false};
    sem_t wake_{};
    sem_t ended_{};
};

}  // namespace Vexa::Library
