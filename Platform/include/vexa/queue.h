/* Serial queues: tasks run one after the other, in the order they came, on a thread of the queue.
 */
#ifndef VEXA_QUEUE_H
#define VEXA_QUEUE_H

#include <vexa/abi.h>

typedef struct vexa_queue vexa_queue;
typedef void (*vexa_task)(void* context);

VEXA_BEGIN_C

/* [any] A queue with a thread of its own, named `label` (the first 15 bytes; may be NULL) and with
 * all signals blocked. The caller owns one reference. NULL when there is no memory, no thread or no
 * descriptor (it takes four).
 *
 * The end of the process waits for no queue: tasks that have not run by then do not. Who wants them
 * to releases the queue before. */
VEXA_API vexa_queue* vexa_queue_create(const char* label) VEXA_NOEXCEPT;
/* [any] One more reference; returns its argument. */
VEXA_API vexa_queue* vexa_queue_retain(vexa_queue* queue) VEXA_NOEXCEPT;
/* [any] One reference fewer. The last one lets the tasks that were submitted run to their end and
 * then ends the thread: called elsewhere it waits for that (so hold no lock that a task takes), on
 * the queue's own thread it does not. */
VEXA_API void vexa_queue_release(vexa_queue* queue) VEXA_NOEXCEPT;

/* [any] Runs `task(context)` on the queue's thread, after all that was submitted before. Takes no
 * lock and makes one system call, to wake the thread. Returns at once; false when there is no
 * memory (the task is then not run). The caller holds a reference to the queue until this returns,
 * whatever the task does, and keeps what `context` points at alive until the task has run. */
VEXA_API bool vexa_queue_submit(vexa_queue* queue, vexa_task task, void* context) VEXA_NOEXCEPT;

/* [any] Returns once all tasks that were submitted before have run; on the queue's own thread,
 * where that cannot come, at once. */
VEXA_API void vexa_queue_drain(vexa_queue* queue) VEXA_NOEXCEPT;

/* [any] Whether the caller runs on this queue's thread. */
VEXA_API bool vexa_queue_is_current(const vexa_queue* queue) VEXA_NOEXCEPT;

VEXA_END_C

#endif
