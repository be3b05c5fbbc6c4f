#pragma once

#include "Platform/SerialQueue.h"

#include <vexa/plugin.h>

namespace VexaTouch {

/// Where and how events are delivered to the host.
struct DispatchEventContext {
    Vexa::SerialQueue queue;
    vexa_event_callback callback = nullptr;
    void* target = nullptr;
    void* refcon = nullptr;
    /// The service interface reference.
    void* sender = nullptr;
};

}  // namespace VexaTouch
