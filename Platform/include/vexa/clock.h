/* The host's tick clock, in which time stamps of reports and events are given. */
#ifndef VEXA_CLOCK_H
#define VEXA_CLOCK_H

#include <vexa/abi.h>

VEXA_BEGIN_C

/* [any] Host ticks now: nanoseconds of the monotonic clock, never decreasing. No system call where
 * the kernel lends the clock to the process. */
VEXA_API uint64_t vexa_clock_now(void) VEXA_NOEXCEPT;

VEXA_END_C

#endif
