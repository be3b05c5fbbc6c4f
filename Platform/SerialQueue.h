#pragma once

#include "Platform/Handle.h"
#include "Platform/Task.h"

#include <vexa/queue.h>
#include <new>
#include <utility>

namespace Vexa {

/// A counted reference to a serial queue, or none; <vexa/queue.h> is its manual.
class SerialQueue {
public:
    /// No queue.
    SerialQueue() noexcept = default;
    /// Throws std::bad_alloc when there is no memory, no thread or no descriptor.
    explicit SerialQueue(const char* label) : handle_(Reference::adopt(vexa_queue_create(label))) {
        if (!handle_) throw std::bad_alloc();
    }
    static SerialQueue share(vexa_queue* borrowed) noexcept {
        SerialQueue queue;
        queue.handle_ = Reference::share(borrowed);
        return queue;
    }

    /// Runs the callable (move-only is fine, it must not throw) on the queue's thread, after all
    /// that was submitted before. Any thread. Throws std::bad_alloc.
    template <typename Callable>
    void submit(Callable&& callable) const {
        // A queue runs all that it takes, so nothing is ever dropped.
        const auto take = [this](vexa_task task, vexa_task /*drop*/, void* context) {
            return vexa_queue_submit(handle_.get(), task, context);
        };
        if (!Detail::submitTask(std::forward<Callable>(callable), take)) throw std::bad_alloc();
    }
    /// Returns once all that was submitted before has run. Any thread but the queue's own.
    void drain() const noexcept { vexa_queue_drain(handle_.get()); }

    [[nodiscard]] vexa_queue* get() const noexcept { return handle_.get(); }
    void reset() noexcept { handle_.reset(); }
    explicit operator bool() const noexcept { return static_cast<bool>(handle_); }
    friend bool operator==(const SerialQueue&, const SerialQueue&) = default;

private:
    using Reference = Handle<vexa_queue, &vexa_queue_retain, &vexa_queue_release>;

    Reference handle_;
};

}  // namespace Vexa
