#pragma once

#include <memory>

struct event;
struct event_base;

namespace Vexa::Library {

struct FreeEventBase {
    void operator()(event_base* base) const noexcept;
};
struct FreeEvent {
    void operator()(event* freed) const noexcept;
};

/// What libevent waits with: for one thread at a time, since it is made without libevent's locks.
using EventBase = std::unique_ptr<event_base, FreeEventBase>;
/// Something that a base waits for. Ends before its base.
using Event = std::unique_ptr<event, FreeEvent>;

/// On epoll whatever the environment says, so that edges and the closing of a socket's far end are
/// told. Null: no memory, no descriptors.
EventBase makeEventBase() noexcept;

}  // namespace Vexa::Library
