/* Run loops: one a thread, waiting in the kernel for descriptors and tasks.
 *
 * A mode is a name. Devices and tasks are bound to a mode and served only while the loop runs in
 * it. Modes come into being when they are first named.
 */
#ifndef VEXA_RUN_LOOP_H
#define VEXA_RUN_LOOP_H

#include <vexa/abi.h>
#include <vexa/queue.h>

typedef struct vexa_run_loop vexa_run_loop;

/* Why a run returned. */
typedef enum vexa_run_result VEXA_ENUM {
    VEXA_RUN_STOPPED = 0,   /* vexa_run_loop_stop ended it */
    VEXA_RUN_TIMED_OUT = 1, /* the time was over */
    VEXA_RUN_HANDLED = 2,   /* one source was served and the caller asked for no more */
    VEXA_RUN_FAILED = 3     /* it could not run: no memory, or called on another thread */
} vexa_run_result;

/* A time-out that never comes. */
#define VEXA_RUN_FOREVER UINT64_MAX

VEXA_BEGIN_C

/* [any] The run loop of the calling thread, made when first asked for and borrowed: it lives as
 * long as the thread unless retained. NULL: no memory, no descriptors, or the thread is ending and
 * its loop is gone. */
VEXA_API vexa_run_loop* vexa_run_loop_current(void) VEXA_NOEXCEPT;
/* [any] A loop may outlive its thread; it then never runs again. */
VEXA_API vexa_run_loop* vexa_run_loop_retain(vexa_run_loop* loop) VEXA_NOEXCEPT;
VEXA_API void vexa_run_loop_release(vexa_run_loop* loop) VEXA_NOEXCEPT;

/* [loop] Serves what is bound to `mode` until the run is stopped, `timeout_ns` nanoseconds are over
 * (rounded up to whole milliseconds; with 0 what is ready is served once) or, with
 * `return_after_source`, one source (a task or a report) was served. May be called again from
 * within a source; the inner run then ends first. A run with nothing to wait for waits all the
 * same. */
VEXA_API vexa_run_result vexa_run_loop_run(vexa_run_loop* loop, const char* mode,
                                           uint64_t timeout_ns,
                                           bool return_after_source) VEXA_NOEXCEPT;

/* [any] Runs `task(context)` once on the loop's thread when it runs in `mode`, now or later: a task
 * submitted before the loop runs is kept, tasks of a mode run in the order they came. The loop
 * is woken. False when there is no memory or the loop's thread has ended; nothing is called then.
 * A task that has not run when the loop's thread ends never does: `drop(context)` is called instead
 * (on that thread, unless `drop` is NULL), so that the context can be freed. Just one of both is
 * called, once. */
VEXA_API bool vexa_run_loop_submit(vexa_run_loop* loop, const char* mode, vexa_task task,
                                   vexa_task drop, void* context) VEXA_NOEXCEPT;

/* [any] Wakes the loop if it waits. Submitting does it already. */
VEXA_API void vexa_run_loop_wake(vexa_run_loop* loop) VEXA_NOEXCEPT;

/* [any] Ends the innermost run once the source being served has returned. Without a run it does
 * nothing: to stop a loop from another thread, whether it runs already or not, submit a task that
 * calls this. */
VEXA_API void vexa_run_loop_stop(vexa_run_loop* loop) VEXA_NOEXCEPT;

VEXA_END_C

#endif
