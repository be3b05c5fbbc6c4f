#pragma once

#include "Platform/Mutex.h"
#include "Platform/SerialQueue.h"
#include "Platform/ThreadAnnotations.h"

#include <vexa/plugin.h>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace VexaTouch::Tools {

/// Where a service delivers its events: notes each call with all that came with it, and trusts
/// none of it. One at a time in a process, since it must not rely on the target it is called with.
class EventSink {
public:
    struct Delivery {
        int callback = 0;  ///< number of the function that was called
        void* target = nullptr;
        void* refcon = nullptr;
        void* sender = nullptr;
        bool hasEvent = false;
        std::uint32_t type = 0;
        std::uint64_t timestamp = 0;  ///< host ticks
        std::uint32_t options = 0;
        bool onQueue = false;
    };

    explicit EventSink(const Vexa::SerialQueue& queue);
    EventSink(const EventSink&) = delete;
    EventSink(EventSink&&) = delete;
    EventSink& operator=(const EventSink&) = delete;
    EventSink& operator=(EventSink&&) = delete;
    /// What comes afterwards is ignored.
    ~EventSink();

    /// Two functions, so that it shows which of them a service has kept.
    static constexpr int kCallbacks = 2;
    [[nodiscard]] static vexa_event_callback callback(int number = 0) noexcept;

    [[nodiscard]] std::vector<Delivery> deliveries() const;
    [[nodiscard]] std::size_t count() const;
    void clear();

private:
    template <int kNumber>
    static void receive(void* target, void* refcon, void* sender, vexa_event* event,
                        std::uint32_t options);

    void take(Delivery delivery);

    Vexa::SerialQueue queue_;
    mutable Vexa::Mutex mutex_;
    std::vector<Delivery> deliveries_ GUARDED_BY(mutex_);
};

}  // namespace VexaTouch::Tools
