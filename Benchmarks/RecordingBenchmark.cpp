// A recording of 300,000 frames of a mixed session in memory: load, write, trim, copy.
// `ContainerParseToNothing` is the yardstick of loading: the same text through the JSON reader
// with a handler that does nothing. `RecordingSoak` records without end into a capped recording
// and reports by how much memory grew; VEXA_SOAK_FRAMES says how many frames (2 million).

#include "Pipeline/ContainerReader.h"
#include "Pipeline/ContainerWriter.h"
#include "Pipeline/PipelineRecording.h"
#include "Platform/HostClock.h"
#include "Platform/Json.h"
#include "Tests/Support/SessionGenerator.h"
#include "Tests/Support/Touch.h"

#include <benchmark/benchmark.h>

#include <malloc.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch {
namespace {

using Frame = PipelineRecording::Frame;
using Testing::SessionGenerator;

constexpr std::size_t kFrames = 300'000;
constexpr std::size_t kPieceBytes = 65'536;

FrameList makeFrames() {
    FrameList frames;
    SessionGenerator generator(1);
    std::uint64_t timestampNs = 5'000'000'000;
    for (const InputReport::Image& image : generator.mixed(kFrames)) {
        timestampNs += 8'000'123;
        Frame frame;
        frame.timestamp = timestampNs;
        // As many settings as a session of somebody who tunes has.
        const std::size_t position = frames.size() + 1;
        if (position % 1000 == 0) {
            frame.type = Frame::Type::State;
            frame.key = "Algs.ActivationThreshold";
            frame.value = 150.0 + static_cast<double>(position % 7000) / 100.0;
        } else {
            frame.report = Testing::imageReport(image.signedPixels, image.frameNumber,
                                                image.timestampMs, image.unsignedPixels);
        }
        frames.push_back(std::move(frame));
    }
    return frames;
}

const FrameList& frames() {
    static const FrameList all = makeFrames();
    return all;
}

const std::string& text() {
    static const std::string all = PipelineRecording(frames()).json();
    return all;
}

void setRates(benchmark::State& state, std::size_t bytes) {
    state.counters["frames/s"] =
        benchmark::Counter(static_cast<double>(state.iterations()) * static_cast<double>(kFrames),
                           benchmark::Counter::kIsRate);
    if (bytes != 0) {
        state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(bytes));
    }
}

class Nothing final : public Vexa::JsonHandler {
public:
    void onObjectBegin() override {}
    void onObjectEnd() override {}
    void onArrayBegin() override {}
    void onArrayEnd() override {}
    void onKey(std::string_view /*piece*/, bool /*last*/) override {}
    void onString(std::string_view /*piece*/, bool /*last*/) override {}
    void onNumber(const Vexa::JsonNumber& /*number*/) override {}
    void onBoolean(bool /*value*/) override {}
    void onNull() override {}
};

void ContainerParseToNothing(benchmark::State& state) {
    for ([[maybe_unused]] auto _ : state) {
        Nothing nothing;
        Vexa::JsonParser parser(nothing);
        if (!parser.write(text()) || !parser.finish()) {
            state.SkipWithError("not read");
        }
    }
    setRates(state, text().size());
}
BENCHMARK(ContainerParseToNothing)->Unit(benchmark::kMillisecond);

/// Freeing the frames is not part of loading them. The memory goes back to the system, so that each
/// round loads as a program does that loads one recording.
template <typename Load>
void load(benchmark::State& state, Load&& read) {
    for ([[maybe_unused]] auto _ : state) {
        auto loaded = read();
        benchmark::DoNotOptimize(&loaded);
        state.PauseTiming();
        if (loaded.size() != kFrames) {
            state.SkipWithError("not read");
        }
        loaded.clear();
        malloc_trim(0);
        state.ResumeTiming();
    }
    setRates(state, text().size());
}

void ContainerLoad(benchmark::State& state) {
    load(state, [] {
        ContainerReader reader;
        reader.write(text());
        return reader.finish();
    });
}
BENCHMARK(ContainerLoad)->Unit(benchmark::kMillisecond);

void ContainerLoadInPieces(benchmark::State& state) {
    load(state, [] {
        ContainerReader reader;
        for (std::string_view rest = text(); !rest.empty();) {
            const std::string_view piece = rest.substr(0, kPieceBytes);
            reader.write(piece);
            rest.remove_prefix(piece.size());
        }
        return reader.finish();
    });
}
BENCHMARK(ContainerLoadInPieces)->Unit(benchmark::kMillisecond);

void ContainerWrite(benchmark::State& state) {
    std::size_t bytes = 0;
    for ([[maybe_unused]] auto _ : state) {
        bytes = 0;
        ContainerWriter writer([&bytes](std::string_view piece) {
            bytes += piece.size();
            benchmark::DoNotOptimize(piece.data());
        });
        for (const Frame& frame : frames()) {
            writer.write(frame);
        }
        writer.finish();
    }
    setRates(state, bytes);
}
BENCHMARK(ContainerWrite)->Unit(benchmark::kMillisecond);

/// Into one text, as a host asks for it.
void RecordingToJson(benchmark::State& state) {
    PipelineRecording recording(frames());
    for ([[maybe_unused]] auto _ : state) {
        std::string json = recording.json();
        benchmark::DoNotOptimize(json.data());
    }
    setRates(state, text().size());
}
BENCHMARK(RecordingToJson)->Unit(benchmark::kMillisecond);

/// To half of its reports.
void RecordingTrim(benchmark::State& state) {
    for ([[maybe_unused]] auto _ : state) {
        state.PauseTiming();
        FrameList copy = makeFrames();  // which shares nothing
        state.ResumeTiming();
        PipelineRecording::trimFrames(copy, kFrames / 2);
        benchmark::DoNotOptimize(&copy);
        state.PauseTiming();
        copy.clear();
        state.ResumeTiming();
    }
    setRates(state, 0);
}
BENCHMARK(RecordingTrim)->Unit(benchmark::kMillisecond);

/// Freeing the copies is not part of making them.
template <typename Original>
void copyOften(benchmark::State& state, const Original& original) {
    constexpr std::size_t kCopies = 32;
    std::vector<Original> copies;
    copies.reserve(kCopies);
    for ([[maybe_unused]] auto _ : state) {
        copies.push_back(original);
        if (copies.size() == kCopies) {
            state.PauseTiming();
            copies.clear();
            state.ResumeTiming();
        }
    }
}

/// As a host that asks for the recording makes the input thread wait. A capped recording at its
/// fullest has 2,699 frames.
void RecordingCopy(benchmark::State& state) {
    const auto count = static_cast<std::size_t>(state.range(0));
    PipelineRecording recording;
    for (const Frame& frame : frames()) {
        if (recording.frames().size() == count) {
            break;
        }
        recording.appendFrame(frame);
    }
    copyOften(state, recording);
}
BENCHMARK(RecordingCopy)->Arg(0)->Arg(2'699)->Arg(kFrames);

/// What of it is the algorithm's state.
void AlgorithmCopy(benchmark::State& state) {
    copyOften(state, Algs());
}
BENCHMARK(AlgorithmCopy);

/// A clock that goes by the device's.
class TickingClock final : public Vexa::HostClock {
public:
    std::uint64_t now() override { return ticks += 8'000'123; }
    void sleepMicroseconds(std::uint64_t /*microseconds*/) override {}

    std::uint64_t ticks = 0;
};

double residentMegabytes() {
    std::ifstream file("/proc/self/statm");
    double total = 0;
    double resident = 0;
    file >> total >> resident;
    return resident * static_cast<double>(sysconf(_SC_PAGESIZE)) / 1e6;
}

double heapMegabytes() {
    return static_cast<double>(mallinfo2().uordblks) / 1e6;
}

std::uint64_t soakFrames() {
    const char* count = std::getenv("VEXA_SOAK_FRAMES");
    return count == nullptr ? 2'000'000 : std::strtoull(count, nullptr, 10);
}

/// Feeds reports of a mixed session over and over, the device's counters going on and wrapping,
/// with settings, resets and reports that are none.
class SoakDevice {
public:
    explicit SoakDevice(PipelineRecording& recording) : recording_(recording) {
        SessionGenerator generator(2);
        for (const InputReport::Image& image : generator.mixed(20'000)) {
            reports_.push_back(Testing::imageReport(image.signedPixels, 0, 0));
        }
    }

    void sendNext() {
        if (frame_ % 5000 == 4999) {
            recording_.setState("Algs.HoldTimeoutMilliseconds", 300 + frame_ % 3 * 100);
        }
        if (frame_ % 7001 == 7000) {
            recording_.handleInputReport(reset_.data(), reset_.size());
        }
        if (frame_ % 9001 == 9000) {
            recording_.handleInputReport(nullptr, 0);
        }
        std::vector<std::uint8_t>& report = reports_[frame_ % reports_.size()];
        putLittle(&report[1], static_cast<std::uint32_t>(frame_));
        putLittle(&report[5], static_cast<std::uint32_t>(frame_ * 8));
        recording_.handleInputReport(report.data(), report.size());
        ++frame_;
    }

private:
    static void putLittle(std::uint8_t* bytes, std::uint32_t value) {
        for (unsigned i = 0; i < 4; ++i) {
            bytes[i] = static_cast<std::uint8_t>(value >> (8 * i));
        }
    }

    PipelineRecording& recording_;
    std::vector<std::vector<std::uint8_t>> reports_;
    const std::vector<std::uint8_t> reset_ = Testing::firmwareReport(0);
    std::uint64_t frame_ = 0;
};

void RecordingSoak(benchmark::State& state) {
    constexpr std::size_t kCap = 1350;
    constexpr std::uint64_t kWarmUp = 100'000;
    const std::uint64_t count = soakFrames();
    double heapGrowth = 0;
    double residentGrowth = 0;
    std::uint64_t events = 0;
    for ([[maybe_unused]] auto _ : state) {
        state.PauseTiming();
        TickingClock clock;
        PipelineRecording recording(clock);
        recording.setMaxFrameCount(kCap);
        recording.hidEventsProbe = [&events](const std::vector<Vexa::HidEvent>& batch) {
            events += batch.size();
        };
        SoakDevice device(recording);
        for (std::uint64_t i = 0; i < kWarmUp; ++i) {
            device.sendNext();
        }
        recording.setMaxFrameCount(kCap);  // so that both measures are of a full cap
        const double heapBefore = heapMegabytes();
        const double residentBefore = residentMegabytes();
        state.ResumeTiming();
        for (std::uint64_t i = 0; i < count; ++i) {
            device.sendNext();
        }
        recording.setMaxFrameCount(kCap);
        heapGrowth = heapMegabytes() - heapBefore;
        residentGrowth = residentMegabytes() - residentBefore;
    }
    state.counters["frames/s"] =
        benchmark::Counter(static_cast<double>(state.iterations()) * static_cast<double>(count),
                           benchmark::Counter::kIsRate);
    state.counters["frames"] = static_cast<double>(count);
    state.counters["events"] = static_cast<double>(events);
    state.counters["heap_growth_MB"] = heapGrowth;
    state.counters["resident_growth_MB"] = residentGrowth;
}
BENCHMARK(RecordingSoak)->Iterations(1)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace VexaTouch
