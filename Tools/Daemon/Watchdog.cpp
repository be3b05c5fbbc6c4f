#include "Tools/Daemon/Watchdog.h"

#include "Tools/Daemon/ServiceNotify.h"

#include <utility>

namespace VexaTouch::Tools::Daemon {

Watchdog::Watchdog(EventLoop& loop, Daemon& daemon, std::function<void()> onAlive)
    : daemon_(daemon), onAlive_(std::move(onAlive)) {
    if (const auto interval = ServiceNotify::watchdog()) {
        timer_ = loop.every(*interval / 2, [this] { look(); });
    }
}

void Watchdog::look() {
    if (std::exchange(asked_, true)) {
        return;
    }
    daemon_.ping([this] {
        asked_ = false;
        ServiceNotify::alive();
        onAlive_();
    });
}

}  // namespace VexaTouch::Tools::Daemon
