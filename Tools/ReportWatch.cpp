#include "Tools/ReportWatch.h"

#include <utility>

namespace VexaTouch::Tools {

bool ReportWatch::look() noexcept {
    const std::uint64_t handled = device_.handled();
    const bool anyHandled = std::exchange(handled_, handled) != handled;
    // What a live device has for a service that does not read it cannot be seen; that none does
    // can.
    const bool anyWaiting = device_.sent() > handled || !device_.isServed();
    inVain_ = anyWaiting && !anyHandled ? inVain_ + 1 : 0;
    return inVain_ >= kLooks;
}

bool ReportWatch::lookIfDue(Time now) noexcept {
    const bool isDue = nextLook_ && now >= *nextLook_;
    if (isDue || !nextLook_) {
        nextLook_ = now + std::chrono::duration_cast<Time::duration>(interval_);
    }
    return isDue && look();
}

}  // namespace VexaTouch::Tools
