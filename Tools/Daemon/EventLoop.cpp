#include "Tools/Daemon/EventLoop.h"

#include "Tools/Failure.h"

#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <systemd/sd-event.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <exception>
#include <string>
#include <utility>

namespace VexaTouch::Tools::Daemon {
namespace {

void check(int result) {
    if (result < 0) {
        throw Failure(std::string("no event loop: ") + std::strerror(-result));
    }
}

}  // namespace

class EventLoop::Watch {
public:
    explicit Watch(EventLoop& loop) noexcept : loop_(loop) {}
    ~Watch() { sd_event_source_disable_unref(source_); }
    Watch(const Watch&) = delete;
    Watch(Watch&&) = delete;
    Watch& operator=(const Watch&) = delete;
    Watch& operator=(Watch&&) = delete;

    void watchDescriptor(int descriptor, std::uint32_t events) {
        check(sd_event_add_io(loop_.get(), &source_, descriptor, events, &ready, this));
    }
    void setEvents(std::uint32_t events) { check(sd_event_source_set_io_events(source_, events)); }
    void watchClock(std::chrono::microseconds interval) {
        interval_ = static_cast<std::uint64_t>(interval.count());
        addTime(interval_, interval_ / 16 + 1);
        check(sd_event_source_set_enabled(source_, SD_EVENT_ON));
    }
    void waitFor(std::chrono::microseconds time) {
        // The least there is; 0 would be a quarter of a second.
        addTime(static_cast<std::uint64_t>(time.count()), 1);
    }

    std::function<void(std::uint32_t events)> callback;

private:
    // Made enabled for once.
    void addTime(std::uint64_t time, std::uint64_t accuracy) {
        check(sd_event_add_time_relative(loop_.get(), &source_, CLOCK_MONOTONIC, time, accuracy,
                                         &elapsed, this));
    }
    // The callback may end the watch: it is kept until it has returned.
    static int ready(sd_event_source* /*source*/, int /*descriptor*/, std::uint32_t events,
                     void* context) {
        Watch& self = *static_cast<Watch*>(context);
        EventLoop& loop = self.loop_;
        const auto kept = self.callback;
        loop.guarded([&] { kept(events); });
        return 0;
    }
    static int elapsed(sd_event_source* source, std::uint64_t /*due*/, void* context) {
        Watch& self = *static_cast<Watch*>(context);
        EventLoop& loop = self.loop_;
        static_cast<void>(sd_event_source_set_time_relative(source, self.interval_));
        const auto kept = self.callback;
        loop.guarded([&] { kept(0); });
        return 0;
    }

    EventLoop& loop_;
    sd_event_source* source_ = nullptr;
    std::uint64_t interval_ = 0;
};

void EventLoop::EndWatch::operator()(Watch* watch) const noexcept {
    delete watch;
}

void EventLoop::Release::operator()(sd_event* event) const noexcept {
    sd_event_unref(event);
}

EventLoop::EventLoop() {
    sd_event* event = nullptr;
    check(sd_event_new(&event));
    event_.reset(event);
    posted_ = FileDescriptor(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
    check(posted_ ? 0 : -errno);
    postedWatch_ = watch(posted_.get(), EPOLLIN, [this](std::uint32_t) { takePosted(); });
}

EventLoop::~EventLoop() = default;

EventLoop::WatchHandle EventLoop::watch(int descriptor, std::uint32_t events,
                                        std::function<void(std::uint32_t events)> callback) {
    WatchHandle made(new Watch(*this));
    made->callback = std::move(callback);
    made->watchDescriptor(descriptor, events);
    return made;
}

void EventLoop::setEvents(const WatchHandle& watch, std::uint32_t events) {
    watch->setEvents(events);
}

EventLoop::WatchHandle EventLoop::watch(const WakeUp& wake, std::function<void()> callback) {
    return watch(wake.descriptor(), EPOLLIN,
                 [&wake, callback = std::move(callback)](std::uint32_t) {
                     wake.clear();
                     callback();
                 });
}

EventLoop::WatchHandle EventLoop::every(std::chrono::microseconds interval,
                                        std::function<void()> callback) {
    WatchHandle made(new Watch(*this));
    made->callback = [callback = std::move(callback)](std::uint32_t) { callback(); };
    made->watchClock(interval);
    return made;
}

EventLoop::WatchHandle EventLoop::after(std::chrono::nanoseconds time,
                                        std::function<void()> callback) {
    WatchHandle made(new Watch(*this));
    made->callback = [callback = std::move(callback)](std::uint32_t) { callback(); };
    // Rounded up: not before its time.
    made->waitFor(std::chrono::ceil<std::chrono::microseconds>(
        std::max(time, std::chrono::nanoseconds::zero())));
    return made;
}

void EventLoop::post(std::function<void()> callback) {
    {
        const Vexa::MutexLock guard(lock_);
        callbacks_.push_back(std::move(callback));
    }
    const std::uint64_t one = 1;
    // A counter that is full has woken already.
    static_cast<void>(::write(posted_.get(), &one, sizeof one) == sizeof one);
}

void EventLoop::takePosted() {
    std::uint64_t count = 0;
    static_cast<void>(::read(posted_.get(), &count, sizeof count) == sizeof count);
    std::deque<std::function<void()>> taken;
    {
        const Vexa::MutexLock guard(lock_);
        taken.swap(callbacks_);
    }
    for (const auto& callback : taken) {
        guarded(callback);
    }
}

template <typename Callback>
void EventLoop::guarded(Callback&& callback) noexcept {
    try {
        callback();
    } catch (...) {
        if (!failure_) {
            failure_ = std::current_exception();
        }
        stop();
    }
}

void EventLoop::run() {
    const int result = sd_event_loop(event_.get());
    if (failure_) {
        std::rethrow_exception(std::exchange(failure_, nullptr));
    }
    check(result);
}

void EventLoop::stop() noexcept {
    static_cast<void>(sd_event_exit(event_.get(), 0));
}

}  // namespace VexaTouch::Tools::Daemon
