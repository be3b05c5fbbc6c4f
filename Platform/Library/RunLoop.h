#pragma once

#include "Platform/Library/FileDescriptor.h"
#include "Platform/Library/LiveObjects.h"
#include "Platform/Mutex.h"

#include <vexa/run_loop.h>
#include <atomic>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace Vexa::Library {

/// Something with a descriptor that a run loop watches. Counted by itself.
class Source {
public:
    /// One more reference, or false when the last one is gone already. Takes no lock.
    virtual bool tryRetain() noexcept = 0;
    virtual void release() noexcept = 0;
    /// The descriptor of this watch can be read; whether it is a socket whose far end has closed.
    /// What else ends a descriptor (EPOLLHUP, EPOLLERR) shows itself as readable. Answers whether
    /// something was served. The watch may have ended meanwhile.
    virtual bool serve(std::uint64_t watch, bool isClosed) noexcept = 0;

protected:
    Source() = default;
    ~Source() = default;
    Source(const Source&) = default;
    Source(Source&&) = default;
    Source& operator=(const Source&) = default;
    Source& operator=(Source&&) = default;
};

/// What is bound to one mode of a loop. Lives as long as the loop.
struct Mode;

}  // namespace Vexa::Library

/// The loop waits in libevent, in a base of its own for each mode, in which a descriptor stays from
/// its first moment to its last. Since libevent's epoll is level-triggered, a report costs one wait
/// and one read. libevent only says what is ready; the loop serves it when the wait is over, so
/// that runs inside of runs never enter libevent twice.
///
/// In the steady state no lock of the loop is held while anything is called, and those taken lend
/// priority.
struct vexa_run_loop final : private Vexa::Library::Counted<VEXA_OBJECT_RUN_LOOP> {
public:
    using Mode = Vexa::Library::Mode;
    using Source = Vexa::Library::Source;

    static vexa_run_loop* current() noexcept;

    void retain() noexcept { references_.fetch_add(1, std::memory_order_relaxed); }
    void release() noexcept {
        if (references_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
    }

    vexa_run_result run(const char* mode, std::uint64_t timeoutNanoseconds,
                        bool returnAfterSource) noexcept;
    bool submit(const char* mode, vexa_task task, vexa_task drop, void* context) noexcept;
    void wake() noexcept;
    void stop() noexcept;

    /// Its thread is gone: it never runs again.
    [[nodiscard]] bool hasEnded() const noexcept { return ended_.load(std::memory_order_acquire); }

    /// The mode by name, made when it is new; null: no memory, no descriptors.
    Mode* mode(const char* name) noexcept;
    /// Watches a descriptor in the mode; answers the watch's number, 0 when it cannot be watched.
    /// On another thread this and `unwatch` wake the loop and wait until it is out of its wait.
    std::uint64_t watch(Mode& mode, Source& source, int descriptor) noexcept;
    /// To be called before the descriptor is closed.
    void unwatch(Mode& mode, std::uint64_t watch) noexcept;

private:
    struct Run;
    class OfThread;
    class Outside;

    vexa_run_loop();
    ~vexa_run_loop();

    void end() noexcept;
    vexa_run_result serve(Mode& mode, Run& run, std::uint64_t timeoutNanoseconds,
                          bool returnAfterSource) noexcept;
    bool runTasks(Mode& mode, const Run& run, bool onlyOne) noexcept;
    bool serveSource(Mode& mode, std::uint64_t watch, bool isClosed) noexcept;
    void takeSignal() noexcept;

    std::atomic<std::uint32_t> references_{1};
    std::atomic<bool> ended_{false};
    Vexa::Library::FileDescriptor wake_;
    // Between a write to wake_ and the read that takes it.
    std::atomic<bool> signalled_{false};

    Vexa::Mutex mutex_;
    std::map<std::string, std::unique_ptr<Mode>, std::less<>> modes_ GUARDED_BY(mutex_);
    Run* innermost_ GUARDED_BY(mutex_) = nullptr;
    std::uint64_t lastWatch_ GUARDED_BY(mutex_) = 0;
};
