// What a person waits for: `vexatouch replay` of a long recording from its start to its end, in a
// process of its own. Reported are frames and megabytes of text a second, the peak memory of that
// process, and that memory over what the recording in memory and its text take together.

#include "Pipeline/ContainerWriter.h"
#include "Tools/GestureScript.h"
#include "Tools/RecordingFile.h"
#include "Tools/Replay.h"
#include "Tools/SurfaceSynthesizer.h"

#include <benchmark/benchmark.h>

#include <malloc.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <memory>
#include <regex>
#include <stdexcept>
#include <string>

namespace VexaTouch::Tools {
namespace {

constexpr std::uint64_t kFrames = 300'000;
constexpr std::uint64_t kSeed = 1;

/// A mixed session of kFrames frames in a file that is gone at the end.
class LongRecording {
public:
    LongRecording() {
        std::string folder = std::filesystem::temp_directory_path() / "vexatouch-bench-XXXXXX";
        if (mkdtemp(folder.data()) == nullptr) {
            throw std::runtime_error("cannot make a temporary folder");
        }
        folder_ = folder;
        write();
        measure();
    }
    ~LongRecording() {
        std::error_code ignored;
        std::filesystem::remove_all(folder_, ignored);
    }
    LongRecording(const LongRecording&) = delete;
    LongRecording& operator=(const LongRecording&) = delete;

    static const LongRecording& instance() {
        static const LongRecording recording;
        return recording;
    }

    [[nodiscard]] std::string path() const { return folder_ / "long.json"; }
    [[nodiscard]] std::string statusPath() const { return folder_ / "status"; }
    [[nodiscard]] std::uint64_t textBytes() const { return textBytes_; }
    [[nodiscard]] std::uint64_t memoryBytes() const { return memoryBytes_; }

private:
    struct Enough {};

    void write() {
        std::ofstream file(path(), std::ios::binary);
        ContainerWriter writer([&file](std::string_view piece) { file << piece; });
        std::uint64_t written = 0;
        constexpr std::uint64_t msPerSession = 3'000'000;
        for (std::uint64_t seed = kSeed; written < kFrames; ++seed) {
            SurfaceSynthesizer synthesizer([&](const PipelineRecording::Frame& frame) {
                if (written == kFrames) {
                    throw Enough();
                }
                writer.write(frame);
                ++written;
            });
            try {
                synthesizer.perform(GestureScript::parse(randomScript(seed, msPerSession)));
            } catch (const Enough&) {
                break;
            }
        }
        writer.finish();
        file.close();
        textBytes_ = std::filesystem::file_size(path());
    }

    /// What the frames take on the heap.
    void measure() {
        Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
        const std::size_t before = mallinfo2().uordblks;
        const RecordingFile file = readRecording(path(), streams);
        memoryBytes_ = mallinfo2().uordblks - before;
    }

    std::filesystem::path folder_;
    std::uint64_t textBytes_ = 0;
    std::uint64_t memoryBytes_ = 0;
};

/// The peak memory that the program names in its summary, in bytes.
double peakMemory(const std::string& statusPath) {
    std::ifstream file(statusPath);
    const std::string status{std::istreambuf_iterator<char>(file), {}};
    std::smatch match;
    if (!std::regex_search(status, match, std::regex("peak memory ([0-9.]+) MB"))) {
        throw std::runtime_error("no peak memory in: " + status);
    }
    return std::stod(match[1]) * 1e6;
}

void ReplayEndToEnd(benchmark::State& state) {
    const LongRecording& recording = LongRecording::instance();
    const std::string command = std::string(VEXATOUCH_PROGRAM) + " replay --speed max " +
                                recording.path() + " > /dev/null 2> " + recording.statusPath();
    for ([[maybe_unused]] auto _ : state) {
        if (std::system(command.c_str()) != 0) {
            state.SkipWithError("vexatouch failed");
            break;
        }
    }
    const auto frames = static_cast<double>(state.iterations()) * static_cast<double>(kFrames);
    const auto text = static_cast<double>(recording.textBytes());
    const double peak = peakMemory(recording.statusPath());
    state.counters["frames/s"] = benchmark::Counter(frames, benchmark::Counter::kIsRate);
    state.counters["MB/s"] = benchmark::Counter(
        text * static_cast<double>(state.iterations()) / 1e6, benchmark::Counter::kIsRate);
    state.counters["text_MB"] = text / 1e6;
    state.counters["peak_MB"] = peak / 1e6;
    state.counters["peak/(memory+text)"] =
        peak / (static_cast<double>(recording.memoryBytes()) + text);
}
BENCHMARK(ReplayEndToEnd)->UseRealTime()->Unit(benchmark::kMillisecond);

/// The playing alone, the recording being in memory: pipeline, algorithm and the events' records.
void ReplayFromMemory(benchmark::State& state) {
    Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    const RecordingFile file = readRecording(LongRecording::instance().path(), streams);
    std::uint64_t events = 0;
    for ([[maybe_unused]] auto _ : state) {
        state.PauseTiming();
        auto replay = std::make_unique<Replay>(file.frames);
        state.ResumeTiming();
        while (replay->canContinue()) {
            events += replay->next().events.size();
        }
        state.PauseTiming();
        replay.reset();
        state.ResumeTiming();
    }
    benchmark::DoNotOptimize(events);
    state.counters["frames/s"] =
        benchmark::Counter(static_cast<double>(state.iterations()) * static_cast<double>(kFrames),
                           benchmark::Counter::kIsRate);
}
BENCHMARK(ReplayFromMemory)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace VexaTouch::Tools
