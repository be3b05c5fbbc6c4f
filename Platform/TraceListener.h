#pragma once

#include <vexa/trace.h>
#include <cstdint>
#include <functional>
#include <span>
#include <utility>

namespace Vexa {

/// Calls a function for every trace point of the process, as long as it lives; one listener at a
/// time, the last one made. The function runs on the thread that passes the trace point, on several
/// at once if need be, and must neither block nor throw. Trace points that it passes itself are not
/// listened to.
class TraceListener {
public:
    using Arguments = std::span<const std::uint64_t, 4>;

    explicit TraceListener(std::function<void(std::uint32_t code, Arguments)> function)
        : function_(std::move(function)) {
        vexa_trace_set_sink(
            [](void* context, std::uint32_t code, const std::uint64_t arguments[4]) noexcept {
                static_cast<TraceListener*>(context)->function_(code, Arguments(arguments, 4));
            },
            this);
    }
    ~TraceListener() { vexa_trace_set_sink(nullptr, nullptr); }
    TraceListener(const TraceListener&) = delete;
    TraceListener(TraceListener&&) = delete;
    TraceListener& operator=(const TraceListener&) = delete;
    TraceListener& operator=(TraceListener&&) = delete;

private:
    std::function<void(std::uint32_t code, Arguments)> function_;
};

}  // namespace Vexa
