// The frame step, from an image to its events, and the classifier alone: each for the algorithm and
// for its literal reading in Tests/Reference, compiled with the same flags.
//
// `MixedSessionRatio` plays a mixed session through both in turn, so that a machine that changes
// its speed changes it for both, and prints the nanoseconds a frame and how many times faster the
// algorithm is.

#include "Algorithm/Algs.h"
#include "Tests/Reference/Algs.h"
#include "Tests/Support/SessionGenerator.h"

#include <benchmark/benchmark.h>

#include <cstddef>
#include <cstdint>
#include <ctime>
#include <type_traits>
#include <utility>
#include <vector>

namespace VexaTouch {
namespace {

using Images = Testing::SessionGenerator::Images;

constexpr std::uint64_t kSeed = 20;
constexpr std::size_t kFrames = 20'000;
constexpr std::size_t kMixedFrames = 100'000;

Images idleSession() {
    return Testing::SessionGenerator(kSeed).idle(kFrames);
}
Images noisySession() {
    return Testing::SessionGenerator(kSeed).noisy(kFrames);
}
Images touchingSession() {
    return Testing::SessionGenerator(kSeed).touching(kFrames);
}
Images mixedSession() {
    return Testing::SessionGenerator(kSeed).mixed(kMixedFrames);
}

template <typename Algorithm>
std::size_t playAll(Algorithm& algs, const Images& images) {
    std::size_t events = 0;
    for (const InputReport::Image& image : images) {
        events += algs.handleImage(image).size();
    }
    return events;
}

/// One iteration is one frame.
template <typename Algorithm, Images (*session)()>
void Frame(benchmark::State& state) {
    const Images images = session();
    Algorithm algs;
    std::size_t next = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(algs.handleImage(images[next]));
        next = next + 1 == images.size() ? 0 : next + 1;
    }
}
BENCHMARK(Frame<Algs, idleSession>)->Name("IdleFrame");
BENCHMARK(Frame<Reference::Algs, idleSession>)->Name("IdleFrame/literal");
BENCHMARK(Frame<Algs, noisySession>)->Name("NoisyFrame");
BENCHMARK(Frame<Reference::Algs, noisySession>)->Name("NoisyFrame/literal");
BENCHMARK(Frame<Algs, touchingSession>)->Name("TouchingFrame");
BENCHMARK(Frame<Reference::Algs, touchingSession>)->Name("TouchingFrame/literal");
BENCHMARK(Frame<Algs, mixedSession>)->Name("MixedFrame");
BENCHMARK(Frame<Reference::Algs, mixedSession>)->Name("MixedFrame/literal");

/// The part of the frames in which a finger touches.
double touchingShare(const Images& images) {
    Algs algs;
    double touching = 0;
    for (const InputReport::Image& image : images) {
        algs.handleImage(image);
        touching += algs.handStats()._isTouching ? 1 : 0;
    }
    return touching / static_cast<double>(images.size());
}

/// One iteration is the whole session, twice; times are the process's own, so that other work on
/// the machine does not count.
void MixedSessionRatio(benchmark::State& state) {
    const Images images = mixedSession();
    Algs algs;
    Reference::Algs literal;
    std::clock_t ticks = 0;
    std::clock_t literalTicks = 0;
    for (auto _ : state) {
        const std::clock_t begin = std::clock();
        benchmark::DoNotOptimize(playAll(algs, images));
        const std::clock_t middle = std::clock();
        benchmark::DoNotOptimize(playAll(literal, images));
        literalTicks += std::clock() - middle;
        ticks += middle - begin;
    }
    const auto nanosecondsPerFrame = [&](std::clock_t total) {
        const double frames = static_cast<double>(state.iterations()) * kMixedFrames;
        return static_cast<double>(total) / CLOCKS_PER_SEC * 1e9 / frames;
    };
    state.counters["ns/frame"] = nanosecondsPerFrame(ticks);
    state.counters["literal"] = nanosecondsPerFrame(literalTicks);
    // How busy the session is, since the ratio depends on it.
    state.counters["touching"] = touchingShare(images);
    state.counters["ratio"] = static_cast<double>(literalTicks) / static_cast<double>(ticks);
}
BENCHMARK(MixedSessionRatio)->Unit(benchmark::kMillisecond);

/// On one frame after another of a touch, so that the order of the channels changes as it does in
/// use.
template <typename Algorithm>
void Classifier(benchmark::State& state) {
    const Images images = Testing::SessionGenerator(kSeed).touching(500);
    Algorithm algs;
    auto classifier = algs.handStats()._svm;
    using Pixels = std::decay_t<decltype(algs.touchPixels())>;
    using VirtualPixels = std::decay_t<decltype(algs.virtualPixels())>;
    std::vector<std::pair<Pixels, VirtualPixels>> frames;
    for (const InputReport::Image& image : images) {
        algs.handleImage(image);
        frames.emplace_back(algs.touchPixels(), algs.virtualPixels());
    }
    std::size_t next = 0;
    for (auto _ : state) {
        const auto& [pixels, virtualPixels] = frames[next];
        classifier.updateSVMScore(pixels, virtualPixels, 200.0F, 0);
        benchmark::DoNotOptimize(classifier.getSVMScore());
        next = next + 1 == frames.size() ? 0 : next + 1;
    }
}
BENCHMARK(Classifier<Algs>)->Name("Classifier");
BENCHMARK(Classifier<Reference::Algs>)->Name("Classifier/literal");

}  // namespace
}  // namespace VexaTouch
