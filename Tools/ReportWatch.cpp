#include "Tools/ReportWatch.h"

#include <utility>

namespace VexaTouch::Tools {

bool ReportWatch::look() noexcept {
    const std::uint64_t handled = device_.handled();
    const bool anyHandled = std::exchange(handled_, handled) != handled;
    const bool anyWaiting = device_.sent() > handled;
    inVain_ = anyWaiting && !anyHandled ? inVain_ + 1 : 0;
    return inVain_ >= kLooks;
}

}  // namespace VexaTouch::Tools
