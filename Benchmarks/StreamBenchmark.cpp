// What a streamed recording costs each report: on the input thread, which puts it into a feed, and
// on the writing thread, which takes it out again and writes it into a file in $TMPDIR (/tmp), one
// by one or many at once.

#include "Tests/Support/Touch.h"
#include "Tools/AppendTarget.h"
#include "Tools/FrameFeed.h"
#include "Tools/RecordingStream.h"

#include <benchmark/benchmark.h>

#include <cstdint>
#include <filesystem>
#include <iostream>
#include <memory>
#include <string>
#include <vector>

namespace VexaTouch::Tools {
namespace {

const std::vector<std::uint8_t>& report() {
    static const std::vector<std::uint8_t> bytes =
        Testing::imageReport(Testing::Samples{10, 20, 30}, 1, 2);
    return bytes;
}

void StreamPut(benchmark::State& state) {
    FrameFeed feed([] {});
    std::uint64_t now = 0;
    for (auto _ : state) {
        feed.putReport(report(), ++now);
        const auto readable = feed.readable();
        feed.consume(readable[0].size() + readable[1].size());
    }
}
BENCHMARK(StreamPut);

void StreamPutWithoutRoom(benchmark::State& state) {
    FrameFeed feed([] {}, FrameFeed::kFewestBytes);
    std::uint64_t now = 0;
    while (feed.lost().reports == 0) {
        feed.putReport(report(), ++now);
    }
    for (auto _ : state) {
        feed.putReport(report(), ++now);
    }
}
BENCHMARK(StreamPutWithoutRoom);

void StreamWrite(benchmark::State& state) {
    const std::string path = std::filesystem::temp_directory_path() / "vexatouch-benchmark.json";
    std::filesystem::remove(path);
    Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    RecordingStream stream(openAppendTarget(path, true, streams), path);
    FrameFeed feed([] {});
    FrameDecoder decoder({.onFrame = [&](const RecordedFrame& frame) { stream.add(frame); },
                          .onGap = [](const FrameGap&) {}});
    std::uint64_t now = 0;
    for (auto _ : state) {
        for (std::int64_t i = 0; i < state.range(0); ++i) {
            feed.putReport(report(), ++now);
        }
        drain(feed, decoder);
        stream.flush();
    }
    state.counters["frames/s"] =
        benchmark::Counter(static_cast<double>(stream.frames()), benchmark::Counter::kIsRate);
    stream.finish();
    std::filesystem::remove(path);
}
BENCHMARK(StreamWrite)->Arg(1)->Arg(10)->Arg(1000);

}  // namespace
}  // namespace VexaTouch::Tools
