#include "Platform/Library/TraceSink.h"

#include <sys/sdt.h>
#include <vexa/trace.h>

namespace {

constinit Vexa::Library::TraceSink sink;

}  // namespace

extern "C" {

void vexa_trace(uint32_t code, uint64_t a, uint64_t b, uint64_t c, uint64_t d) noexcept {
    switch (code) {
        case VEXA_TRACE_REPORT:
            DTRACE_PROBE4(vexatouch, report, a, b, c, d);
            break;
        case VEXA_TRACE_FIRMWARE_EVENT:
            DTRACE_PROBE2(vexatouch, firmware_event, a, b);
            break;
        case VEXA_TRACE_BATCH:
            DTRACE_PROBE1(vexatouch, batch, a);
            break;
        case VEXA_TRACE_EVENT:
            DTRACE_PROBE2(vexatouch, event, a, b);
            break;
        default:
            DTRACE_PROBE5(vexatouch, trace, code, a, b, c, d);
            break;
    }
    sink.call(code, a, b, c, d);
}

void vexa_trace_set_sink(vexa_trace_sink new_sink, void* context) noexcept {
    sink.set(new_sink, context);
}

}  // extern "C"
