#include "Platform/Library/RunLoop.h"

#include <vexa/clock.h>

#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <exception>
#include <limits>
#include <new>
#include <string_view>
#include <utility>

using Vexa::MutexLock;
using Vexa::Library::FileDescriptor;

namespace {

struct Task {
    vexa_task run;
    vexa_task drop;
    void* context;
};

struct Watch {
    std::uint64_t number;
    Vexa::Library::Source* source;
};

// The number in the epoll sets under which the loop itself is woken.
constexpr std::uint64_t kWake = 0;

bool add(const FileDescriptor& set, int descriptor, std::uint32_t events, std::uint64_t number) {
    epoll_event event{};
    event.events = events;
    event.data.u64 = number;
    return ::epoll_ctl(set.number(), EPOLL_CTL_ADD, descriptor, &event) == 0;
}

// A point in time in host ticks, or never.
class Deadline {
public:
    explicit Deadline(std::uint64_t timeoutNanoseconds) noexcept {
        if (timeoutNanoseconds == VEXA_RUN_FOREVER) return;
        const std::uint64_t now = vexa_clock_now();
        constexpr auto kLast = std::numeric_limits<std::uint64_t>::max();
        at_ = timeoutNanoseconds > kLast - now ? kLast : now + timeoutNanoseconds;
    }

    [[nodiscard]] bool isOver() const noexcept { return at_ != kNever && vexa_clock_now() >= at_; }

    // Milliseconds from now, rounded up, as epoll_wait takes them. A long time is cut: the wait
    // then ends early and is repeated.
    [[nodiscard]] int remaining() const noexcept {
        if (at_ == kNever) return -1;
        const std::uint64_t now = vexa_clock_now();
        if (now >= at_) return 0;
        constexpr std::uint64_t kMillisecond = 1'000'000;
        const std::uint64_t milliseconds = (at_ - now - 1) / kMillisecond + 1;
        return static_cast<int>(std::min<std::uint64_t>(milliseconds, INT_MAX));
    }

private:
    static constexpr auto kNever = std::numeric_limits<std::uint64_t>::max();
    std::uint64_t at_ = kNever;
};

}  // namespace

struct Vexa::Library::Mode {
    FileDescriptor set{::epoll_create1(EPOLL_CLOEXEC)};
    // Guarded by the loop's lock.
    std::deque<Task> tasks{};
    std::vector<Watch> watches{};
    // Whether there are tasks, to be asked without the lock.
    std::atomic<bool> hasTasks{false};
};

/// A run in progress, on the stack of the loop's thread.
struct vexa_run_loop::Run {
    Run* outer = nullptr;
    std::atomic<bool> stopped{false};
};

/// The reference that a thread holds of its loop. The thread-local pointers outlive it, so that
/// whatever ends later in the thread finds that the loop is gone.
class vexa_run_loop::OfThread {
public:
    OfThread() = default;
    OfThread(const OfThread&) = delete;
    OfThread(OfThread&&) = delete;
    OfThread& operator=(const OfThread&) = delete;
    OfThread& operator=(OfThread&&) = delete;
    ~OfThread() {
        vexa_run_loop* const loop = std::exchange(loop_, nullptr);
        over_ = true;
        if (!loop) return;
        loop->end();
        loop->release();
    }

    static vexa_run_loop* get() noexcept { return loop_; }
    static vexa_run_loop* make() noexcept {
        if (loop_ || over_) return loop_;
        static thread_local OfThread ofThread;
        try {
            loop_ = new vexa_run_loop;
        } catch (const std::exception&) {
            // No memory or no descriptors: no loop.
        }
        return loop_;
    }

private:
    static constinit thread_local vexa_run_loop* loop_;
    static constinit thread_local bool over_;
};

constinit thread_local vexa_run_loop* vexa_run_loop::OfThread::loop_ = nullptr;
constinit thread_local bool vexa_run_loop::OfThread::over_ = false;

vexa_run_loop* vexa_run_loop::current() noexcept {
    return OfThread::make();
}

vexa_run_loop::vexa_run_loop() : wake_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    if (!wake_) throw std::bad_alloc();
}

vexa_run_loop::~vexa_run_loop() = default;

// On the loop's thread, the last thing that it does with it.
void vexa_run_loop::end() noexcept {
    for (;;) {
        // Dropping calls whoever submitted, who may do anything but submit again.
        std::deque<Task> dropped;
        {
            const MutexLock lock(mutex_);
            ended_.store(true, std::memory_order_release);
            for (auto& [name, mode] : modes_) {
                if (mode->tasks.empty()) continue;
                dropped.swap(mode->tasks);
                mode->hasTasks = false;
                break;
            }
        }
        if (dropped.empty()) return;
        for (const Task& task : dropped) {
            if (task.drop) task.drop(task.context);
        }
    }
}

vexa_run_loop::Mode* vexa_run_loop::mode(const char* name) noexcept {
    if (!name) return nullptr;
    const MutexLock lock(mutex_);
    if (const auto found = modes_.find(std::string_view(name)); found != modes_.end()) {
        return found->second.get();
    }
    try {
        auto made = std::make_unique<Mode>();
        if (!made->set || !add(made->set, wake_.number(), EPOLLIN, kWake)) return nullptr;
        return modes_.emplace(name, std::move(made)).first->second.get();
    } catch (const std::exception&) {
        return nullptr;  // no memory
    }
}

vexa_run_result vexa_run_loop::run(const char* modeName, std::uint64_t timeoutNanoseconds,
                                   bool returnAfterSource) noexcept {
    if (OfThread::get() != this) return VEXA_RUN_FAILED;
    Mode* const bound = mode(modeName);
    if (!bound) return VEXA_RUN_FAILED;
    Run run;
    {
        const MutexLock lock(mutex_);
        run.outer = std::exchange(innermost_, &run);
    }
    const vexa_run_result result = serve(*bound, run, timeoutNanoseconds, returnAfterSource);
    const MutexLock lock(mutex_);
    innermost_ = run.outer;
    // A stop that came when all was over has ended this run as well.
    return run.stopped ? VEXA_RUN_STOPPED : result;
}

vexa_run_result vexa_run_loop::serve(Mode& mode, Run& run, std::uint64_t timeoutNanoseconds,
                                     bool returnAfterSource) noexcept {
    const Deadline deadline(timeoutNanoseconds);
    std::array<epoll_event, 8> events{};
    for (;;) {
        if (mode.hasTasks && runTasks(mode, run, returnAfterSource) && returnAfterSource) {
            return VEXA_RUN_HANDLED;
        }
        if (run.stopped) return VEXA_RUN_STOPPED;

        const int timeout = mode.hasTasks ? 0 : deadline.remaining();
        const int ready = ::epoll_wait(mode.set.number(), events.data(),
                                       static_cast<int>(events.size()), timeout);
        if (ready < 0 && errno != EINTR) return VEXA_RUN_FAILED;
        for (int i = 0; i < ready; ++i) {
            const epoll_event& event = events[static_cast<std::size_t>(i)];
            if (event.data.u64 == kWake) {
                takeSignal();
            } else if (serveSource(mode, event.data.u64, event.events) && returnAfterSource) {
                return VEXA_RUN_HANDLED;
            }
            // What else is ready shows itself to the next run again.
            if (run.stopped) return VEXA_RUN_STOPPED;
        }
        if (deadline.isOver()) return VEXA_RUN_TIMED_OUT;
    }
}

// The tasks that are there now: those that they submit wait until the descriptors had their turn.
bool vexa_run_loop::runTasks(Mode& mode, const Run& run, bool onlyOne) noexcept {
    std::size_t count = std::numeric_limits<std::size_t>::max();
    bool ran = false;
    while (count > 0 && !run.stopped) {
        Task task{};
        {
            const MutexLock lock(mutex_);
            // A run inside of a task may have taken what was counted.
            if (mode.tasks.empty()) break;
            count = onlyOne ? 1 : std::min(count, mode.tasks.size());
            task = mode.tasks.front();
            mode.tasks.pop_front();
            mode.hasTasks = !mode.tasks.empty();
        }
        task.run(task.context);
        ran = true;
        --count;
    }
    return ran;
}

bool vexa_run_loop::serveSource(Mode& mode, std::uint64_t watch, std::uint32_t events) noexcept {
    Source* source = nullptr;
    {
        const MutexLock lock(mutex_);
        const auto found = std::ranges::find(mode.watches, watch, &Watch::number);
        if (found == mode.watches.end() || !found->source->tryRetain()) return false;
        source = found->source;
    }
    const bool served = source->serve(watch, events);
    source->release();
    return served;
}

bool vexa_run_loop::submit(const char* modeName, vexa_task task, vexa_task drop,
                           void* context) noexcept {
    Mode* const bound = mode(modeName);
    if (!bound) return false;
    {
        const MutexLock lock(mutex_);
        if (hasEnded()) return false;
        try {
            bound->tasks.push_back({.run = task, .drop = drop, .context = context});
        } catch (const std::bad_alloc&) {
            return false;
        }
        bound->hasTasks = true;
        // A run that begins later looks for tasks before it waits.
        if (!innermost_) return true;
    }
    wake();
    return true;
}

void vexa_run_loop::stop() noexcept {
    {
        const MutexLock lock(mutex_);
        if (!innermost_) return;
        innermost_->stopped = true;
    }
    wake();
}

void vexa_run_loop::wake() noexcept {
    // The loop's own thread is not waiting.
    if (OfThread::get() == this || signalled_.exchange(true)) return;
    const std::uint64_t one = 1;
    static_cast<void>(::write(wake_.number(), &one, sizeof one));
}

void vexa_run_loop::takeSignal() noexcept {
    std::uint64_t count = 0;
    static_cast<void>(::read(wake_.number(), &count, sizeof count));
    // In this order: who submits after the exchange writes again, who did before is seen.
    signalled_.exchange(false);
}

std::uint64_t vexa_run_loop::watch(Mode& mode, Source& source, int descriptor) noexcept {
    const MutexLock lock(mutex_);
    const std::uint64_t number = ++lastWatch_;
    try {
        mode.watches.push_back({.number = number, .source = &source});
    } catch (const std::bad_alloc&) {
        return 0;
    }
    if (add(mode.set, descriptor, EPOLLIN | EPOLLRDHUP, number)) return number;
    mode.watches.pop_back();
    return 0;
}

void vexa_run_loop::unwatch(Mode& mode, std::uint64_t watch, int descriptor) noexcept {
    const MutexLock lock(mutex_);
    static_cast<void>(::epoll_ctl(mode.set.number(), EPOLL_CTL_DEL, descriptor, nullptr));
    std::erase_if(mode.watches, [watch](const Watch& each) { return each.number == watch; });
}

extern "C" {

vexa_run_loop* vexa_run_loop_current(void) noexcept {
    return vexa_run_loop::current();
}

vexa_run_loop* vexa_run_loop_retain(vexa_run_loop* loop) noexcept {
    if (loop) loop->retain();
    return loop;
}

void vexa_run_loop_release(vexa_run_loop* loop) noexcept {
    if (loop) loop->release();
}

vexa_run_result vexa_run_loop_run(vexa_run_loop* loop, const char* mode, uint64_t timeout_ns,
                                  bool return_after_source) noexcept {
    return loop->run(mode, timeout_ns, return_after_source);
}

bool vexa_run_loop_submit(vexa_run_loop* loop, const char* mode, vexa_task task, vexa_task drop,
                          void* context) noexcept {
    return loop->submit(mode, task, drop, context);
}

void vexa_run_loop_wake(vexa_run_loop* loop) noexcept {
    loop->wake();
}

void vexa_run_loop_stop(vexa_run_loop* loop) noexcept {
    loop->stop();
}

}  // extern "C"
