#pragma once

#include "Platform/Handle.h"
#include "Platform/Task.h"

#include <vexa/run_loop.h>
#include <cstdint>
#include <new>
#include <utility>

namespace Vexa {

/// A counted reference to a thread's run loop, or none; <vexa/run_loop.h> is its manual.
class RunLoop {
public:
    /// No loop.
    RunLoop() noexcept = default;
    /// The loop of the calling thread. Throws std::bad_alloc.
    static RunLoop current() {
        RunLoop loop;
        loop.handle_ = Reference::share(vexa_run_loop_current());
        if (!loop) throw std::bad_alloc();
        return loop;
    }

    /// Takes a reference of its own; NULL gives no loop.
    static RunLoop share(vexa_run_loop* borrowed) noexcept {
        RunLoop loop;
        loop.handle_ = Reference::share(borrowed);
        return loop;
    }

    /// Serves what is bound to the mode until stopped or the time is over. The loop's own thread.
    vexa_run_result run(const char* mode, std::uint64_t timeoutNanoseconds = VEXA_RUN_FOREVER,
                        bool returnAfterSource = false) const noexcept {
        return vexa_run_loop_run(handle_.get(), mode, timeoutNanoseconds, returnAfterSource);
    }
    /// Runs the callable (it must not throw) once when the loop runs in the mode, now or later;
    /// what has not run when the loop's thread ends is destroyed there. Any thread. False when it
    /// can never run: no memory inside, or the loop's thread has ended. Throws std::bad_alloc.
    template <typename Callable>
    // NOLINTNEXTLINE(modernize-use-nodiscard): who knows that the loop runs need not look
    bool submit(const char* mode, Callable&& callable) const {
        const auto take = [this, mode](vexa_task task, vexa_task drop, void* context) {
            return vexa_run_loop_submit(handle_.get(), mode, task, drop, context);
        };
        return Detail::submitTask(std::forward<Callable>(callable), take);
    }
    /// Ends the innermost run. Any thread.
    void stop() const noexcept { vexa_run_loop_stop(handle_.get()); }
    /// Any thread.
    void wake() const noexcept { vexa_run_loop_wake(handle_.get()); }

    [[nodiscard]] vexa_run_loop* get() const noexcept { return handle_.get(); }
    void reset() noexcept { handle_.reset(); }
    explicit operator bool() const noexcept { return static_cast<bool>(handle_); }
    friend bool operator==(const RunLoop&, const RunLoop&) = default;

private:
    using Reference = Handle<vexa_run_loop, &vexa_run_loop_retain, &vexa_run_loop_release>;

    Reference handle_;
};

}  // namespace Vexa
