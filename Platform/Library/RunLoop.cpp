#include "Platform/Library/RunLoop.h"

#include "Platform/Library/EventBase.h"

#include <vexa/clock.h>

#include <event2/event.h>
#include <sys/eventfd.h>
#include <sys/time.h>
#include <algorithm>
#include <array>
#include <climits>
#include <cstddef>
#include <exception>
#include <limits>
#include <list>
#include <new>
#include <string_view>
#include <utility>

using Vexa::Mutex;
using Vexa::MutexLock;
using Vexa::Library::Event;
using Vexa::Library::EventBase;
using Vexa::Library::FileDescriptor;
using Vexa::Library::makeEventBase;

namespace {

struct Task {
    vexa_task run;
    vexa_task drop;
    void* context;
};

// What a wait found: the numbers of watches. What has no room shows itself to the next.
class Ready {
public:
    struct Entry {
        std::uint64_t watch;
        bool isClosed;
    };

    void add(Entry entry) noexcept { entries_[count_++] = entry; }
    [[nodiscard]] bool isFull() const noexcept { return count_ == entries_.size(); }
    [[nodiscard]] const Entry* begin() const noexcept { return entries_.data(); }
    [[nodiscard]] const Entry* end() const noexcept { return entries_.data() + count_; }

private:
    std::array<Entry, 32> entries_;  // set as far as count_
    std::size_t count_ = 0;
};

struct Watch {
    std::uint64_t number;
    Vexa::Library::Source* source;
    Vexa::Library::Mode* mode;
    Event event;
};

// The watch of no source: the loop itself is woken.
constexpr std::uint64_t kWake = 0;

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

    // Milliseconds from now, rounded up, or -1 for ever. A long time is cut: the wait then
    // ends early and is repeated.
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

/// libevent's own locks are not used: their callbacks are the whole process's, which may use
/// libevent itself and have chosen others, and none of those that it brings lend priority. Instead
/// who waits or changes what is waited for holds `inside`; who cannot get it, since the loop waits,
/// stands in the `door`, through which the loop must pass before it waits again.
struct Vexa::Library::Mode {
    Mutex door{};
    Mutex inside{};
    EventBase base{makeEventBase()};
    Watch wake{.number = kWake, .source = nullptr, .mode = this, .event = {}};
    Event timer{};
    Ready* ready GUARDED_BY(inside) = nullptr;

    // Guarded by the loop's lock.
    std::deque<Task> tasks{};
    std::list<Watch> watches{};
    // Whether there are tasks, to be asked without the lock.
    std::atomic<bool> hasTasks{false};

    bool begin(const FileDescriptor& wakeDescriptor) noexcept;
    bool wait(int milliseconds, Ready& found) noexcept;

    static Event makeEvent(Watch& watch, int descriptor) noexcept {
        return Event(event_new(watch.mode->base.get(), descriptor, EV_READ | EV_CLOSED | EV_PERSIST,
                               &Mode::takeDown, &watch));
    }
    static void takeDown(evutil_socket_t descriptor, short what, void* watch) noexcept;
};

// False: no memory, no descriptors.
bool Vexa::Library::Mode::begin(const FileDescriptor& wakeDescriptor) noexcept {
    if (!base) return false;
    timer.reset(event_new(base.get(), -1, 0, [](evutil_socket_t, short, void*) {}, nullptr));
    wake.event = makeEvent(wake, wakeDescriptor.number());
    return timer && wake.event && event_add(wake.event.get(), nullptr) == 0;
}

// Waits, -1 for ever, and takes down what is ready. Nothing when it was interrupted or when the
// time is over, roughly: libevent reads a clock that may be a few milliseconds behind. False: it
// failed.
bool Vexa::Library::Mode::wait(int milliseconds, Ready& found) noexcept {
    // Who stands in the door goes first.
    door.lock();
    door.unlock();
    const MutexLock lock(inside);
    int flags = EVLOOP_ONCE;
    if (milliseconds == 0) flags |= EVLOOP_NONBLOCK;
    if (milliseconds > 0) {
        const timeval time{.tv_sec = milliseconds / 1000,
                           .tv_usec = suseconds_t{milliseconds % 1000} * 1000};
        if (event_add(timer.get(), &time) != 0) return false;
    }
    ready = &found;
    const bool isDone = event_base_loop(base.get(), flags) >= 0;
    ready = nullptr;
    if (milliseconds > 0) static_cast<void>(event_del(timer.get()));
    return isDone;
}

// From within `wait`.
void Vexa::Library::Mode::takeDown(evutil_socket_t /*descriptor*/, short what,
                                   void* watch) noexcept NO_THREAD_SAFETY_ANALYSIS {
    const Watch& found = *static_cast<const Watch*>(watch);
    const Mode& mode = *found.mode;
    mode.ready->add({.watch = found.number, .isClosed = (what & EV_CLOSED) != 0});
    if (mode.ready->isFull()) static_cast<void>(event_base_loopbreak(mode.base.get()));
}

/// While it lives, the loop is not in the mode's wait, which it leaves for that, and what is waited
/// for may be changed.
class SCOPED_CAPABILITY vexa_run_loop::Outside {
public:
    Outside(vexa_run_loop& loop, Mode& mode) noexcept ACQUIRE(mode.inside) NO_THREAD_SAFETY_ANALYSIS
        : lock_(mode.door),
          inside_(mode.inside) {
        if (inside_.tryLock()) return;
        loop.wake();
        inside_.lock();
    }
    ~Outside() RELEASE() NO_THREAD_SAFETY_ANALYSIS { inside_.unlock(); }
    Outside(const Outside&) = delete;
    Outside(Outside&&) = delete;
    Outside& operator=(const Outside&) = delete;
    Outside& operator=(Outside&&) = delete;

private:
    const MutexLock lock_;
    Mutex& inside_;
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
        if (!made->begin(wake_)) return nullptr;
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
    for (;;) {
        if (mode.hasTasks && runTasks(mode, run, returnAfterSource) && returnAfterSource) {
            return VEXA_RUN_HANDLED;
        }
        if (run.stopped) return VEXA_RUN_STOPPED;

        Ready ready;
        if (!mode.wait(mode.hasTasks ? 0 : deadline.remaining(), ready)) return VEXA_RUN_FAILED;
        for (const auto& [watch, isClosed] : ready) {
            if (watch == kWake) {
                takeSignal();
            } else if (serveSource(mode, watch, isClosed) && returnAfterSource) {
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

bool vexa_run_loop::serveSource(Mode& mode, std::uint64_t watch, bool isClosed) noexcept {
    Source* source = nullptr;
    {
        const MutexLock lock(mutex_);
        const auto found = std::ranges::find(mode.watches, watch, &Watch::number);
        if (found == mode.watches.end() || !found->source->tryRetain()) return false;
        source = found->source;
    }
    const bool served = source->serve(watch, isClosed);
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
    static_cast<void>(::write(wake_.number(), &one, sizeof one) == sizeof one);
}

void vexa_run_loop::takeSignal() noexcept {
    std::uint64_t count = 0;
    static_cast<void>(::read(wake_.number(), &count, sizeof count) == sizeof count);
    // In this order: who submits after the exchange writes again, who did before is seen.
    signalled_.exchange(false);
}

std::uint64_t vexa_run_loop::watch(Mode& mode, Source& source, int descriptor) noexcept {
    // Made aside: an event cannot be in the base before it can be found.
    std::list<Watch> made;
    try {
        made.push_back({.number = 0, .source = &source, .mode = &mode, .event = {}});
    } catch (const std::bad_alloc&) {
        return 0;
    }
    Watch& watch = made.front();
    watch.event = Mode::makeEvent(watch, descriptor);
    if (!watch.event) return 0;
    const Outside outside(*this, mode);
    const MutexLock lock(mutex_);
    watch.number = ++lastWatch_;
    if (event_add(watch.event.get(), nullptr) != 0) {
        made.clear();  // while we are outside
        return 0;
    }
    mode.watches.splice(mode.watches.end(), made);
    return watch.number;
}

void vexa_run_loop::unwatch(Mode& mode, std::uint64_t watch) noexcept {
    const Outside outside(*this, mode);
    const MutexLock lock(mutex_);
    mode.watches.remove_if([watch](const Watch& each) { return each.number == watch; });
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
