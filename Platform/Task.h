#pragma once

#include <vexa/queue.h>
#include <memory>
#include <type_traits>
#include <utility>

namespace Vexa::Detail {

/// Hands a callable to `submit(run, drop, context)`, which answers whether it took it and later
/// calls either of both. The callable (which may be move-only and must not throw) is destroyed once
/// it has run or can never run, or here when it was not taken.
template <typename Callable, typename Submit>
bool submitTask(Callable&& callable, const Submit& submit) {
    using Task = std::decay_t<Callable>;
    auto task = std::make_unique<Task>(std::forward<Callable>(callable));
    const vexa_task run = [](void* context) noexcept {
        const std::unique_ptr<Task> owned(static_cast<Task*>(context));
        (*owned)();
    };
    const vexa_task drop = [](void* context) noexcept {
        const std::unique_ptr<Task> owned(static_cast<Task*>(context));
    };
    if (!submit(run, drop, static_cast<void*>(task.get()))) return false;
    static_cast<void>(task.release());
    return true;
}

}  // namespace Vexa::Detail
