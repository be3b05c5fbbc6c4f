#include "Platform/Library/TraceSink.h"

#include <array>
#include <cstdio>
#include <cstdlib>

namespace Vexa::Library {

namespace {

thread_local bool isInSink = false;

}  // namespace

void TraceSink::callSet(std::uint32_t code, std::uint64_t a, std::uint64_t b, std::uint64_t c,
                        std::uint64_t d) noexcept {
    if (isInSink) return;  // a sink that passes trace points itself is not called for them
    callers_.fetch_add(1);
    // Either this sees that the sink is going, or set() sees this caller and waits.
    if (isSet_.load()) {
        const std::array<std::uint64_t, 4> arguments = {a, b, c, d};
        isInSink = true;
        sink_(context_, code, arguments.data());
        isInSink = false;
    }
    if (callers_.fetch_sub(1) == 1) callers_.notify_all();
}

void TraceSink::set(vexa_trace_sink sink, void* context) noexcept {
    if (isInSink) {
        std::fputs("vexa_trace_set_sink: called by the sink, for which it would wait\n", stderr);
        std::abort();
    }
    const std::lock_guard lock(mutex_);
    isSet_.store(false);
    for (std::uint32_t callers = callers_.load(); callers != 0; callers = callers_.load()) {
        callers_.wait(callers);
    }
    sink_ = sink;
    context_ = context;
    isSet_.store(sink != nullptr);
}

}  // namespace Vexa::Library
