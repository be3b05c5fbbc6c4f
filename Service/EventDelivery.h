#pragma once

#include "Platform/HidEvent.h"
#include "Platform/Log.h"
#include "Service/DispatchEventContext.h"
#include "Service/VexaHIDService.h"

#include <vector>

namespace VexaTouch {

/// Carries batches of events from the input thread to the host's queue and there, one by one, to
/// the host's callback. Callback, target, refcon, sender and queue are those it was made with.
///
/// Copyable, as what a probe holds must be; copies deliver to the same place. It keeps the service
/// and the queue alive, and so does each batch that is on its way.
class EventDelivery {
public:
    EventDelivery(ServiceReference<VexaHIDService> service, DispatchEventContext context,
                  Vexa::Log log) noexcept;

    /// Submits the batch and returns at once; an empty one never reaches the queue. Without a queue
    /// the events have nowhere to go and are dropped. Throws std::bad_alloc.
    void operator()(const std::vector<Vexa::HidEvent>& events) const;

private:
    void land(const std::vector<Vexa::HidEvent>& events) const noexcept;

    ServiceReference<VexaHIDService> service_;
    DispatchEventContext context_;
    Vexa::Log log_;
};

}  // namespace VexaTouch
