#pragma once

#include "Tools/Daemon/Daemon.h"
#include "Tools/Daemon/EventLoop.h"

#include <functional>

namespace VexaTouch::Tools::Daemon {

/// Tells the service's manager that the daemon is alive, twice in each interval that the manager
/// asks for, as long as the input thread of every surface answers. Whoever has not answered is not
/// asked again and the manager not told, until the answer comes. One thread, the loop's.
class Watchdog {
public:
    /// Does nothing when the manager asks for nothing. `onAlive` is called after each time that the
    /// manager was told. Everything given must outlive it, and the loop must not run any more when
    /// it ends.
    Watchdog(EventLoop& loop, Daemon& daemon, std::function<void()> onAlive);

private:
    void look();

    Daemon& daemon_;
    std::function<void()> onAlive_;
    bool asked_ = false;
    EventLoop::WatchHandle timer_;
};

}  // namespace VexaTouch::Tools::Daemon
