#pragma once

#include "Platform/Mutex.h"
#include "Platform/ThreadAnnotations.h"
#include "Tools/DeliveredEvent.h"
#include "Tools/WakeUp.h"

#include <vector>

namespace VexaTouch::Tools {

/// Events on their way from the host's queue to the thread that prints them.
class EventInbox {
public:
    /// `wake` (which must outlive it) is notified of each event.
    explicit EventInbox(const WakeUp& wake) noexcept : wake_(wake) {}

    /// The queue's thread.
    void put(const DeliveredEvent& event) {
        {
            const Vexa::MutexLock guard(lock_);
            events_.push_back(event);
        }
        wake_.notify();
    }
    /// All that have come, in their order.
    [[nodiscard]] std::vector<DeliveredEvent> take() {
        std::vector<DeliveredEvent> taken;
        const Vexa::MutexLock guard(lock_);
        taken.swap(events_);
        return taken;
    }

private:
    const WakeUp& wake_;
    Vexa::Mutex lock_;
    std::vector<DeliveredEvent> events_ GUARDED_BY(lock_);
};

}  // namespace VexaTouch::Tools
