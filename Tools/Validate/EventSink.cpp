#include "Tools/Validate/EventSink.h"

#include <memory>

namespace VexaTouch::Tools {
namespace {

struct Active {
    Vexa::Mutex mutex;
    EventSink* sink GUARDED_BY(mutex) = nullptr;
};

Active& activeSink() {
    // Never destroyed: a batch that was on the queue may still land while the process ends.
    static Active& active = *std::make_unique<Active>().release();
    return active;
}

}  // namespace

EventSink::EventSink(const Vexa::SerialQueue& queue) : queue_(queue) {
    Active& active = activeSink();
    const Vexa::MutexLock lock(active.mutex);
    active.sink = this;
}

EventSink::~EventSink() {
    Active& active = activeSink();
    const Vexa::MutexLock lock(active.mutex);
    active.sink = nullptr;
}

template <int kNumber>
void EventSink::receive(void* target, void* refcon, void* sender, vexa_event* event,
                        std::uint32_t options) {
    const Delivery delivery{
        .callback = kNumber,
        .target = target,
        .refcon = refcon,
        .sender = sender,
        .hasEvent = event != nullptr,
        .type = event != nullptr ? vexa_event_get_type(event) : 0,
        .timestamp = event != nullptr ? vexa_event_get_timestamp(event) : 0,
        .options = options,
    };
    Active& active = activeSink();
    const Vexa::MutexLock lock(active.mutex);
    if (active.sink != nullptr) {
        active.sink->take(delivery);
    }
}

void EventSink::take(Delivery delivery) {
    delivery.onQueue = vexa_queue_is_current(queue_.get());
    const Vexa::MutexLock lock(mutex_);
    deliveries_.push_back(delivery);
}

vexa_event_callback EventSink::callback(int number) noexcept {
    return number == 0 ? &EventSink::receive<0> : &EventSink::receive<1>;
}

std::vector<EventSink::Delivery> EventSink::deliveries() const {
    const Vexa::MutexLock lock(mutex_);
    return deliveries_;
}

std::size_t EventSink::count() const {
    const Vexa::MutexLock lock(mutex_);
    return deliveries_.size();
}

void EventSink::clear() {
    const Vexa::MutexLock lock(mutex_);
    deliveries_.clear();
}

}  // namespace VexaTouch::Tools
