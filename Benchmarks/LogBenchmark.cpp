// What a log call and a trace point cost the thread that passes them.

#include "Platform/Log.h"
#include "Platform/Trace.h"
#include "Platform/TraceListener.h"

#include <benchmark/benchmark.h>

#include <cstdint>
#include <string>
#include <string_view>

namespace Vexa {
namespace {

const Log kLog(LogCategory::HIDService);
const std::string kText = "HID events probe: 1 event(s)";

/// Messages go nowhere, as long as it lives.
class SilentLog {
public:
    SilentLog() {
        Log::setSink([](LogCategory, LogLevel, std::string_view) {});
    }
    ~SilentLog() { Log::setSink({}); }
    SilentLog(const SilentLog&) = delete;
    SilentLog(SilentLog&&) = delete;
    SilentLog& operator=(const SilentLog&) = delete;
    SilentLog& operator=(SilentLog&&) = delete;
};

void LogDisabled(benchmark::State& state) {
    for ([[maybe_unused]] auto _ : state) kLog.write(LogLevel::Debug, kText);
}
BENCHMARK(LogDisabled);

/// Up to where the log's own thread takes over; bursts that fit, so nothing is dropped.
void LogWithoutBlockingBurst(benchmark::State& state) {
    constexpr std::int64_t kBurst = 1000;
    const SilentLog silent;
    const LogWithoutBlocking here;
    const std::uint64_t dropped = vexa_log_get_dropped();
    while (state.KeepRunningBatch(kBurst)) {
        for (std::int64_t i = 0; i < kBurst; ++i) kLog.write(LogLevel::Error, kText);
        state.PauseTiming();
        Log::flush();
        state.ResumeTiming();
    }
    state.counters["dropped"] = static_cast<double>(vexa_log_get_dropped() - dropped);
}
BENCHMARK(LogWithoutBlockingBurst);

void LogBlocking(benchmark::State& state) {
    const SilentLog silent;
    for ([[maybe_unused]] auto _ : state) kLog.write(LogLevel::Error, kText);
}
BENCHMARK(LogBlocking);

void TraceUnheard(benchmark::State& state) {
    for ([[maybe_unused]] auto _ : state) trace(TraceCode::Report, 0x74, 1, 2, 3);
}
BENCHMARK(TraceUnheard);

void TraceHeard(benchmark::State& state) {
    std::uint64_t sum = 0;
    const TraceListener listener(
        [&sum](std::uint32_t, TraceListener::Arguments arguments) { sum += arguments[0]; });
    for ([[maybe_unused]] auto _ : state) trace(TraceCode::Report, 0x74, 1, 2, 3);
    benchmark::DoNotOptimize(sum);
}
BENCHMARK(TraceHeard);

}  // namespace
}  // namespace Vexa
