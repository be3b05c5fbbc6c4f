#pragma once

#include "Tools/FileDescriptor.h"

#include <chrono>
#include <optional>

namespace VexaTouch::Tools {

/// One thread waits here until another has something for it.
class WakeUp {
public:
    using Time = std::chrono::steady_clock::time_point;

    /// Throws Failure when the system gives no descriptor.
    WakeUp();

    /// Ends the waiting that is on or the next one. Any thread; never blocks.
    void notify() const noexcept;
    /// Waits until notified, at most until that time. The waiting thread.
    void wait(std::optional<Time> until) const noexcept;

private:
    FileDescriptor event_;
};

}  // namespace VexaTouch::Tools
