/* The log: four categories, a level for each, one place where the messages go.
 *
 * Levels and sink belong to the process. Messages below a category's level cost one load. They go
 * to standard error, a line each with its time; when standard error is the journal's stream (a
 * service run by systemd) they go to the journal with their fields instead. On standard error, of
 * errors that differ in their digits alone 20 a minute are written; a line tells how many more were
 * left out. The journal has a limit of its own, and a sink gets everything.
 *
 * The environment variable VEXATOUCH_LOG sets the levels when the library is loaded: a level for
 * all categories ("debug") or a list ("HIDService=debug,Algs=info"). What it does not know it says
 * on standard error and ignores.
 *
 * At the end of the process, messages that still wait for the sink are given half a second to go
 * there; a sink that takes nothing does not hold the exit up any longer.
 */
#ifndef VEXA_LOG_H
#define VEXA_LOG_H

#include <vexa/abi.h>

typedef enum vexa_log_category VEXA_ENUM {
    VEXA_LOG_HID_SERVICE = 0,
    VEXA_LOG_PIPELINE = 1,
    VEXA_LOG_RECORDING = 2,
    VEXA_LOG_ALGS = 3
} vexa_log_category;

/* A message is written when its level is at or above the level of its category. */
typedef enum vexa_log_level VEXA_ENUM {
    VEXA_LOG_DEBUG = 0,
    VEXA_LOG_INFO = 1,
    VEXA_LOG_ERROR = 2,
    VEXA_LOG_OFF = 3 /* a threshold only */
} vexa_log_level;

/* Called for each message, one call at a time, in the order of logging, on any thread. `message`
 * has `length` bytes and a zero byte behind. It may log (such messages are lost) but not wait for
 * other threads that log. */
typedef void (*vexa_log_sink)(void* context, vexa_log_category category, vexa_log_level level,
                              const char* message, size_t length);

VEXA_BEGIN_C

/* [any] Whether a message of this level would be written: test it before building a text. */
VEXA_API bool vexa_log_is_enabled(vexa_log_category category, vexa_log_level level) VEXA_NOEXCEPT;
/* [any] Writes a message of `length` bytes if its level is enabled. On a thread that must not block
 * (below) it never waits: when there is no room the message is dropped and counted, and the count
 * is written ("%ju log message(s) dropped", HIDService, error) when there is room again. On any
 * other thread it returns once the message, and all before it, were handed to the sink. */
VEXA_API void vexa_log_write(vexa_log_category category, vexa_log_level level, const char* message,
                             size_t length) VEXA_NOEXCEPT;
/* [any] The level of a category. It starts at VEXA_LOG_ERROR unless the environment says else. */
VEXA_API void vexa_log_set_level(vexa_log_category category, vexa_log_level level) VEXA_NOEXCEPT;
VEXA_API vexa_log_level vexa_log_get_level(vexa_log_category category) VEXA_NOEXCEPT;
/* [any] How a category ("HIDService") or level ("debug") is written; "?" for an unknown one. */
VEXA_API const char* vexa_log_category_name(vexa_log_category category) VEXA_NOEXCEPT;
VEXA_API const char* vexa_log_level_name(vexa_log_level level) VEXA_NOEXCEPT;

/* [any] Where messages go from now on; NULL restores the default. Everything logged before goes to
 * the previous sink first, and it is no longer being called when this returns; then its `destroy`
 * (may be NULL) is called with its context, once. A sink may replace itself: its own call is then
 * its last, and `destroy` follows it. A sink that is never replaced may be called until the process
 * ends. */
VEXA_API void vexa_log_set_sink(vexa_log_sink sink, void* context,
                                void (*destroy)(void* context)) VEXA_NOEXCEPT;

/* [any] Declares whether the calling thread must not block in a log call. Returns what it was
 * before. The first thread that declares it starts the thread that writes for it. */
VEXA_API bool vexa_log_set_thread_must_not_block(bool must_not_block) VEXA_NOEXCEPT;
/* [any] Returns once everything logged before has gone to the sink, also on a thread that must not
 * block. In a sink's call it does nothing. */
VEXA_API void vexa_log_flush(void) VEXA_NOEXCEPT;
/* [any] How many messages were dropped since the library was loaded. */
VEXA_API uint64_t vexa_log_get_dropped(void) VEXA_NOEXCEPT;

VEXA_END_C

#endif
