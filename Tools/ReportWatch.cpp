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

}  // namespace VexaTouch::Tools
