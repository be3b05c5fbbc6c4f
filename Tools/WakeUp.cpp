#include "Tools/WakeUp.h"

#include "Tools/Failure.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <ctime>
#include <string>

namespace VexaTouch::Tools {

WakeUp::WakeUp() : event_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    if (!event_) {
        throw Failure(std::string("no event descriptor: ") + std::strerror(errno));
    }
}

void WakeUp::notify() const noexcept {
    const std::uint64_t one = 1;
    // A counter that is full has woken already.
    static_cast<void>(::write(event_.get(), &one, sizeof one) == sizeof one);
}

bool WakeUp::wait(std::optional<Time> until, int hangUp) const noexcept {
    // A negative descriptor is passed over.
    std::array<pollfd, 2> waiting = {{{.fd = event_.get(), .events = POLLIN, .revents = 0},
                                      {.fd = hangUp, .events = 0, .revents = 0}}};
    timespec left{};
    if (until) {
        const auto ns = std::max(std::chrono::nanoseconds::zero(),
                                 std::chrono::duration_cast<std::chrono::nanoseconds>(
                                     *until - std::chrono::steady_clock::now()));
        const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(ns);
        left = {.tv_sec = seconds.count(), .tv_nsec = (ns - seconds).count()};
    }
    if (ppoll(waiting.data(), waiting.size(), until ? &left : nullptr, nullptr) <= 0) {
        return false;
    }
    if (waiting[0].revents != 0) {
        clear();
    }
    return (waiting[1].revents & (POLLHUP | POLLERR)) != 0;
}

void WakeUp::clear() const noexcept {
    std::uint64_t count = 0;
    static_cast<void>(::read(event_.get(), &count, sizeof count) == sizeof count);
}

}  // namespace VexaTouch::Tools
