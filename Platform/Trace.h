#pragma once

#include <vexa/trace.h>
#include <cstdint>

namespace Vexa {

/// Codes of the trace points; <vexa/trace.h> says what each carries and how to listen.
enum class TraceCode : std::uint32_t {
    Report = VEXA_TRACE_REPORT,
    Batch = VEXA_TRACE_BATCH,
    Event = VEXA_TRACE_EVENT,
    FirmwareEvent = VEXA_TRACE_FIRMWARE_EVENT,
};

/// Passes a trace point. Any thread.
inline void trace(TraceCode code, std::uint64_t a = 0, std::uint64_t b = 0, std::uint64_t c = 0,
                  std::uint64_t d = 0) noexcept {
    vexa_trace(static_cast<std::uint32_t>(code), a, b, c, d);
}

}  // namespace Vexa
