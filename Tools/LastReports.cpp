#include "Tools/LastReports.h"

namespace VexaTouch::Tools {

bool LastReports::areTaken() {
    const Time now = std::chrono::steady_clock::now();
    if (!first_) {
        first_ = now;
    }
    if (now - *first_ >= patience_) {
        return true;
    }
    // The service's device passes no question on any more when the input thread has met its end,
    // which it does after the last report was handled.
    return device_.sent() <= device_.handled() && !session_.property(ObservedDevice::kReadsOnKey);
}

}  // namespace VexaTouch::Tools
