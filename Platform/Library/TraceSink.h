#pragma once

#include <vexa/trace.h>
#include <atomic>
#include <cstdint>
#include <mutex>

namespace Vexa::Library {

/// The process's sink for trace points. Passing one costs a load when there is no sink and takes
/// no lock when there is; whoever replaces the sink waits for its calls to end.
class TraceSink {
public:
    constexpr TraceSink() noexcept = default;

    void call(std::uint32_t code, std::uint64_t a, std::uint64_t b, std::uint64_t c,
              std::uint64_t d) noexcept {
        if (isSet_.load(std::memory_order_relaxed)) callSet(code, a, b, c, d);
    }
    void set(vexa_trace_sink sink, void* context) noexcept;

private:
    void callSet(std::uint32_t code, std::uint64_t a, std::uint64_t b, std::uint64_t c,
                 std::uint64_t d) noexcept;

    std::mutex mutex_;  // of those who set it
    std::atomic<bool> isSet_{false};
    std::atomic<std::uint32_t> callers_{0};  // that may see the sink as set
    // Written while it is not set and has no callers.
    vexa_trace_sink sink_ = nullptr;
    void* context_ = nullptr;
};

}  // namespace Vexa::Library
