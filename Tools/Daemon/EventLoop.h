#pragma once

#include "Platform/Mutex.h"
#include "Platform/ThreadAnnotations.h"
#include "Tools/FileDescriptor.h"
#include "Tools/WakeUp.h"

#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>

struct sd_event;

namespace VexaTouch::Tools::Daemon {

/// The one loop of the daemon and its clients: it waits for descriptors and what other threads
/// hand to it, and wakes for nothing else. One thread, but for post().
///
/// What is called back may throw; the exception ends the run and comes out of it.
class EventLoop {
public:
    /// Something that is watched, until this is destroyed.
    class Watch;
    struct EndWatch {
        void operator()(Watch* watch) const noexcept;
    };
    using WatchHandle = std::unique_ptr<Watch, EndWatch>;

    /// Throws Failure.
    EventLoop();
    ~EventLoop();
    EventLoop(const EventLoop&) = delete;
    EventLoop(EventLoop&&) = delete;
    EventLoop& operator=(const EventLoop&) = delete;
    EventLoop& operator=(EventLoop&&) = delete;

    /// Calls back with the events of poll that the descriptor shows; `events` 0 waits for the far
    /// end to hang up.
    [[nodiscard]] WatchHandle watch(int descriptor, std::uint32_t events,
                                    std::function<void(std::uint32_t events)> callback);
    /// Waits for other events from now on, of a watch that was made for a descriptor.
    static void setEvents(const WatchHandle& watch, std::uint32_t events);
    /// Calls back when notified; `wake` must outlive the watch, and nobody else waits for it.
    [[nodiscard]] WatchHandle watch(const WakeUp& wake, std::function<void()> callback);
    /// Calls back again and again, each time up to a sixteenth of the interval late, so that the
    /// system may wake for several things at once.
    [[nodiscard]] WatchHandle every(std::chrono::microseconds interval,
                                    std::function<void()> callback);

    /// Calls back once when the time is over, as late as the system makes it and no later. A time
    /// of 0 calls back in the next turn of the loop.
    [[nodiscard]] WatchHandle after(std::chrono::nanoseconds time, std::function<void()> callback);

    /// Calls back once, in the order of posting. Any thread. May throw std::bad_alloc.
    void post(std::function<void()> callback);

    /// Serves until stopped.
    void run();
    /// Ends the run, from within it.
    void stop() noexcept;

    [[nodiscard]] sd_event* get() const noexcept { return event_.get(); }

private:
    struct Release {
        void operator()(sd_event* event) const noexcept;
    };

    void takePosted();
    /// Runs the callback; what it throws is kept for run().
    template <typename Callback>
    void guarded(Callback&& callback) noexcept;

    std::unique_ptr<sd_event, Release> event_;
    FileDescriptor posted_;
    WatchHandle postedWatch_;
    std::exception_ptr failure_;
    Vexa::Mutex lock_;
    std::deque<std::function<void()>> callbacks_ GUARDED_BY(lock_);
};

}  // namespace VexaTouch::Tools::Daemon
