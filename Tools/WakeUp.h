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
    /// Waits until notified, at most until that time, or until the other descriptor (-1: none)
    /// hangs up. Whether it has. The waiting thread.
    // NOLINTNEXTLINE(modernize-use-nodiscard): who gives no descriptor need not look
    bool wait(std::optional<Time> until, int hangUp = -1) const noexcept;

    /// For those who wait for several things at once: readable when notified, until cleared.
    [[nodiscard]] int descriptor() const noexcept { return event_.get(); }
    void clear() const noexcept;

private:
    FileDescriptor event_;
};

}  // namespace VexaTouch::Tools
