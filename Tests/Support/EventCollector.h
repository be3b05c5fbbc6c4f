#pragma once

#include "Platform/HidEvent.h"

#include <vexa/plugin.h>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {

/// What a host's event callback got. Any thread.
class EventCollector {
public:
    struct Delivery {
        void* refcon = nullptr;
        void* sender = nullptr;
        std::uint32_t options = 0;

        friend bool operator==(const Delivery&, const Delivery&) = default;
    };

    /// To be set as the event callback, with the collector as target.
    static void callback(void* target, void* refcon, void* sender, vexa_event* event,
                         std::uint32_t options) noexcept {
        auto& self = *static_cast<EventCollector*>(target);
        const std::lock_guard lock(self.mutex_);
        self.events_.push_back(Vexa::HidEvent::share(event));
        self.deliveries_.push_back({refcon, sender, options});
        self.changed_.notify_all();
    }

    /// Blocks until so many events have come since the last take. False after a minute, which is a
    /// test's failure.
    [[nodiscard]] bool waitFor(std::size_t count) {
        std::unique_lock lock(mutex_);
        return changed_.wait_for(lock, std::chrono::minutes(1),
                                 [this, count] { return events_.size() >= count; });
    }
    [[nodiscard]] std::vector<Vexa::HidEvent> take() {
        const std::lock_guard lock(mutex_);
        return std::exchange(events_, {});
    }
    [[nodiscard]] std::vector<Delivery> takeDeliveries() {
        const std::lock_guard lock(mutex_);
        return std::exchange(deliveries_, {});
    }

private:
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<Vexa::HidEvent> events_;
    std::vector<Delivery> deliveries_;
};

}  // namespace VexaTouch::Testing
