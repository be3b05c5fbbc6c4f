// The hexadecimal text of reports, both ways. `HexReadByStream` is what reading is held to: the
// standard library's formatted extraction.

#include "Shared/Util.h"

#include <benchmark/benchmark.h>

#include <cstdint>
#include <sstream>
#include <string>
#include <vector>

namespace VexaTouch::Util {
namespace {

std::vector<std::uint8_t> reportBytes() {
    constexpr std::size_t kImageReport = 73;
    std::vector<std::uint8_t> bytes(kImageReport);
    std::uint32_t state = 1;
    for (std::uint8_t& byte : bytes) {
        state = state * 1664525U + 1013904223U;
        byte = static_cast<std::uint8_t>(state >> 24U);
    }
    return bytes;
}

/// The rate is that of the text.
void setText(benchmark::State& state, const std::string& text) {
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(text.size()));
}

void HexWrite(benchmark::State& state) {
    const std::vector<std::uint8_t> bytes = reportBytes();
    std::string text;
    for ([[maybe_unused]] auto _ : state) {
        text.clear();
        appendHexString(text, bytes);
        benchmark::DoNotOptimize(text.data());
    }
    setText(state, text);
}
BENCHMARK(HexWrite);

void HexRead(benchmark::State& state) {
    const std::string text = hexStringFromBytes(reportBytes());
    for ([[maybe_unused]] auto _ : state) {
        std::vector<std::uint8_t> bytes = bytesFromHexString(text);
        benchmark::DoNotOptimize(bytes.data());
    }
    setText(state, text);
}
BENCHMARK(HexRead);

/// Numbers that are not written as the system writes them: every one takes the long way.
void HexReadUnusual(benchmark::State& state) {
    std::string text;
    for (const std::uint8_t byte : reportBytes()) {
        text += "0x" + hexStringFromBytes({byte}).substr(0, 2) + "\n";
    }
    for ([[maybe_unused]] auto _ : state) {
        std::vector<std::uint8_t> bytes = bytesFromHexString(text);
        benchmark::DoNotOptimize(bytes.data());
    }
    setText(state, text);
}
BENCHMARK(HexReadUnusual);

void HexReadByStream(benchmark::State& state) {
    const std::string text = hexStringFromBytes(reportBytes());
    for ([[maybe_unused]] auto _ : state) {
        std::istringstream stream(text);
        std::vector<std::uint8_t> bytes;
        std::uint16_t value = 0;
        while (stream >> std::hex >> value) {
            bytes.push_back(static_cast<std::uint8_t>(value));
        }
        benchmark::DoNotOptimize(bytes.data());
    }
    setText(state, text);
}
BENCHMARK(HexReadByStream);

}  // namespace
}  // namespace VexaTouch::Util
