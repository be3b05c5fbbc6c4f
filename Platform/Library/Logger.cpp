#include "Platform/Library/Logger.h"

#include "Platform/Library/LogLevels.h"
#include "Platform/Library/StandardError.h"
#include "Platform/SignalsBlocked.h"

#include <pthread.h>
#include <sched.h>
#include <unistd.h>
#include <array>
#include <cassert>
#include <cerrno>
#include <charconv>
#include <chrono>
#include <ctime>
#include <memory>
#include <utility>

namespace Vexa::Library {

namespace {

using Clock = std::chrono::system_clock;

constexpr long kLongestExit = 500'000'000;  // ns

thread_local bool mustNotBlock = false;
// Whether this thread is inside a sink's call. It then holds the lock.
thread_local bool isInSink = false;

pid_t threadId() noexcept {
    static thread_local const pid_t id = gettid();
    return id;
}

bool startThread(pthread_t& thread, void* (*body)(void*), void* context) noexcept {
    pthread_attr_t attributes;
    if (pthread_attr_init(&attributes) != 0) return false;
    // An ordinary thread, even when a real-time one is the first to need it.
    const sched_param ordinary{};
    pthread_attr_setinheritsched(&attributes, PTHREAD_EXPLICIT_SCHED);
    pthread_attr_setschedpolicy(&attributes, SCHED_OTHER);
    pthread_attr_setschedparam(&attributes, &ordinary);
    // Signals are for the program's own threads, and a broken pipe must not end the program here.
    bool isStarted = false;
    {
        const SignalsBlocked blocked;
        isStarted = pthread_create(&thread, &attributes, body, context) == 0;
    }
    pthread_attr_destroy(&attributes);
    if (isStarted) pthread_setname_np(thread, "vexa-log");
    return isStarted;
}

}  // namespace

Logger& Logger::shared() {
    // Never destroyed: detached threads may log until the process ends.
    static Logger& logger = *std::make_unique<Logger>().release();
    return logger;
}

Logger::Logger() {
    sem_init(&wake_, 0, 0);
    sem_init(&ended_, 0, 0);
    report_.text.reserve(64);
}

void Logger::write(vexa_log_category category, vexa_log_level level,
                   std::string_view text) noexcept {
    if (isInSink) return;
    if (mustNotBlock) {
        LogRing* const ring = ring_.load(std::memory_order_acquire);
        if (ring == nullptr || !ring->push(category, level, Clock::now(), threadId(), text,
                                           dropped_.load(std::memory_order_relaxed))) {
            dropped_.fetch_add(1);
        }
        wakeWriter();
        return;
    }
    try {
        const LogMessage message{category, level, Clock::now(), threadId(), std::string(text)};
        const MutexLock lock(mutex_);
        drain();
        deliver(message);
    } catch (...) {
        return;  // no memory: the message is lost, the caller is not disturbed
    }
}

void Logger::setSink(vexa_log_sink sink, void* context, void (*destroy)(void*)) noexcept {
    const Sink next{sink, context, destroy};
    if (isInSink) {
        assertInSink();
        const Sink previous = std::exchange(sink_, next);
        // The sink that is being called ends when it returns.
        if (std::exchange(isReplacedInCall_, true)) previous.end();
        return;
    }
    Sink previous;
    {
        const MutexLock lock(mutex_);
        drain();
        previous = std::exchange(sink_, next);
    }
    previous.end();
}

void Logger::flush() noexcept {
    if (isInSink) return;
    const MutexLock lock(mutex_);
    drain();
}

void Logger::assertInSink() const noexcept {
    assert(isInSink);
}

void Logger::drain() noexcept {
    LogRing* const ring = ring_.load(std::memory_order_acquire);
    if (ring != nullptr) {
        // Not what comes meanwhile: a thread that logs without pause must not keep us here.
        for (const std::uint64_t end = ring->end(); ring->begin() != end; ring->dropFront()) {
            const LogRing::Entry& entry = ring->front();
            reportDropped(entry.droppedBefore);
            if (!entry.isLost) deliver(entry.message);
        }
    }
    const std::uint64_t dropped = dropped_.load();
    // Else what was kept before some were dropped is still on its way.
    if (ring == nullptr || ring->begin() == ring->end()) reportDropped(dropped);
}

void Logger::reportDropped(std::uint64_t total) noexcept {
    const std::uint64_t reported = reported_.load(std::memory_order_relaxed);
    if (total <= reported) return;
    if (LogLevels::isEnabled(VEXA_LOG_HID_SERVICE, VEXA_LOG_ERROR)) {
        std::array<char, 24> digits{};
        const auto [end, error] =
            std::to_chars(digits.data(), digits.data() + digits.size(), total - reported);
        report_.text.assign(digits.data(), end).append(" log message(s) dropped");
        report_.category = VEXA_LOG_HID_SERVICE;
        report_.level = VEXA_LOG_ERROR;
        report_.time = Clock::now();
        report_.thread = threadId();
        deliver(report_);
    }
    reported_.store(total);
}

void Logger::deliver(const LogMessage& message) noexcept {
    const Sink called = sink_;
    isReplacedInCall_ = false;
    isInSink = true;
    if (called.call != nullptr) {
        called.call(called.context, message.category, message.level, message.text.c_str(),
                    message.text.size());
    } else {
        writeByDefault(message);
    }
    if (isReplacedInCall_) called.end();
    isInSink = false;
}

void Logger::writeByDefault(const LogMessage& message) noexcept {
    try {
        if (journal_.isStandardError() && journal_.send(message)) return;
        limit_.pass(message, std::chrono::steady_clock::now(), &StandardError::write);
    } catch (...) {
        return;  // no memory: the message is lost
    }
}

void Logger::tellLeftOut() noexcept {
    try {
        const MutexLock lock(mutex_);
        limit_.tellAll(std::chrono::steady_clock::now(), &StandardError::write);
    } catch (...) {
        return;  // no memory: likewise
    }
}

bool Logger::setThreadMustNotBlock(bool value) noexcept {
    if (value) {
        static_cast<void>(threadId());
        startWriter();
    }
    return std::exchange(mustNotBlock, value);
}

void Logger::startWriter() noexcept {
    try {
        const MutexLock lock(startMutex_);
        if (writersProcess_ == getpid()) return;
        auto ring = ring_.load() == nullptr ? std::make_unique<LogRing>() : nullptr;
        // Without a writer there is no ring: messages are dropped and counted, and the next thread
        // that must not block tries again.
        if (!startThread(writer_, &runWriter, this)) return;
        writersProcess_ = getpid();
        if (ring) ring_.store(ring.release());
    } catch (...) {
        return;  // no memory: likewise
    }
}

void* Logger::runWriter(void* logger) noexcept {
    static_cast<Logger*>(logger)->writeAsTheyCome();
    return nullptr;
}

void Logger::writeAsTheyCome() noexcept {
    for (;;) {
        const bool isEnding = isEnding_.load();
        flush();
        if (isEnding) {
            tellLeftOut();
            sem_post(&ended_);
            return;
        }
        // Either this thread sees the message, or whoever logs it sees this thread asleep.
        isWriterAsleep_.store(true);
        if (isBehind()) {
            isWriterAsleep_.store(false);
        } else {
            while (sem_wait(&wake_) != 0 && errno == EINTR) {
            }
        }
    }
}

void Logger::wakeWriter() noexcept {
    if (isWriterAsleep_.exchange(false)) sem_post(&wake_);
}

bool Logger::isBehind() const noexcept {
    const LogRing* const ring = ring_.load();
    return (ring != nullptr && ring->begin() != ring->end()) || reported_.load() != dropped_.load();
}

void Logger::finish() noexcept {
    const MutexLock lock(startMutex_);
    if (writersProcess_ != getpid()) return;
    isEnding_.store(true);
    sem_post(&wake_);
    timespec deadline{};
    clock_gettime(CLOCK_MONOTONIC, &deadline);
    deadline.tv_nsec += kLongestExit;
    deadline.tv_sec += deadline.tv_nsec / 1'000'000'000;
    deadline.tv_nsec %= 1'000'000'000;
    int result = 0;
    do {
        result = sem_clockwait(&ended_, CLOCK_MONOTONIC, &deadline);
    } while (result != 0 && errno == EINTR);
    if (result == 0) pthread_join(writer_, nullptr);
}

}  // namespace Vexa::Library
