/* Trace points: fixed codes that mark each stage of a report.
 *
 * Each is a static user-space probe of the provider "vexatouch" in libvexaplatform, to be listened
 * to by name (`bpftrace -e 'usdt:...:vexatouch:report { ... }'`), and costs nothing when nobody
 * does. A sink inside the process sees the same.
 *
 *   code         probe           arguments
 *   0x2B150180   report          the report's bytes 0 to 3, 0 where it is shorter
 *   0x2B15018C   firmware_event  code; the eight data bytes as a big-endian number
 *   0x2B150184   batch           number of events that landed on the host's queue
 *   0x2B150188   event           type; phase of an event about to be delivered
 *   any other    trace           code; the four arguments
 */
#ifndef VEXA_TRACE_H
#define VEXA_TRACE_H

#include <vexa/abi.h>

#define VEXA_TRACE_REPORT 0x2B150180u
#define VEXA_TRACE_BATCH 0x2B150184u
#define VEXA_TRACE_EVENT 0x2B150188u
#define VEXA_TRACE_FIRMWARE_EVENT 0x2B15018Cu

/* Called on the thread that passes the trace point; must not block. */
typedef void (*vexa_trace_sink)(void* context, uint32_t code, const uint64_t arguments[4]);

VEXA_BEGIN_C

/* [any] Passes a trace point. Arguments that a code does not have are 0. */
VEXA_API void vexa_trace(uint32_t code, uint64_t a, uint64_t b, uint64_t c,
                         uint64_t d) VEXA_NOEXCEPT;
/* [any but a sink's call] The sink of the process; NULL for none. Returns when the previous one is
 * no longer being called. */
VEXA_API void vexa_trace_set_sink(vexa_trace_sink sink, void* context) VEXA_NOEXCEPT;

VEXA_END_C

#endif
