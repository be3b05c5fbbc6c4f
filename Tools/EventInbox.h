#pragma once

#include "Platform/Mutex.h"
#include "Platform/ThreadAnnotations.h"
#include "Tools/DeliveredEvent.h"
#include "Tools/WakeUp.h"

#include <cstddef>
#include <cstdint>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {

/// Events on their way from the host's queue to the thread that prints them. Has room for a fixed
/// number: what comes while it is full is left out and counted.
class EventInbox {
public:
    /// More than a surface makes in half a day.
    static constexpr std::size_t kUsualRoom = 65'536;

    struct Taken {
        std::vector<DeliveredEvent> events;
        std::uint64_t lost = 0;  ///< came after these and found no room
    };

    /// `wake` (which must outlive it) is notified of each event.
    explicit EventInbox(const WakeUp& wake, std::size_t room = kUsualRoom) noexcept
        : wake_(wake), room_(room) {}

    /// The queue's thread; waits for nobody.
    void put(const DeliveredEvent& event) {
        {
            const Vexa::MutexLock guard(lock_);
            if (waiting_.events.size() < room_) {
                waiting_.events.push_back(event);
            } else {
                ++waiting_.lost;
            }
        }
        wake_.notify();
    }
    /// All that have come, in their order.
    [[nodiscard]] Taken take() {
        const Vexa::MutexLock guard(lock_);
        return std::exchange(waiting_, {});
    }

private:
    const WakeUp& wake_;
    const std::size_t room_;
    Vexa::Mutex lock_;
    Taken waiting_ GUARDED_BY(lock_);
};

}  // namespace VexaTouch::Tools
