#include "Tools/SimulatedSurface.h"

#include "Tools/SurfaceSynthesizer.h"

#include <limits>
#include <random>
#include <utility>

namespace VexaTouch::Tools {
namespace {

/// Random gestures are made up in pieces of this length.
constexpr std::uint64_t kPieceMs = 60'000;

std::uint64_t seedOf(const SimulatedPlay& play) {
    if (play.seed) {
        return *play.seed;
    }
    // 32 bits: short enough to be typed again.
    return play.script ? kDefaultSeed : std::random_device()();
}

PlayedDevice::FrameSource randomSource(std::uint64_t seed) {
    return [seed](const PlayedDevice::FrameSink& sink) {
        SurfaceSynthesizer synthesizer(sink, seed);
        for (std::uint64_t piece = 0;; ++piece) {
            synthesizer.perform(GestureScript::parse(randomScript(seed + piece, kPieceMs)));
        }
    };
}

PlayedDevice::FrameSource sourceOf(SimulatedPlay& play, std::uint64_t seed) {
    return play.script ? gestureSource(*std::move(play.script), play.seed, play.endless)
                       : randomSource(seed);
}

PlayedPace paceOf(const SimulatedPlay& play) {
    if (play.asFastAsTaken) {
        return {.speed = std::numeric_limits<double>::infinity(), .lossless = true};
    }
    return {.speed = 1.0, .rate = play.rate, .lossless = false};
}

}  // namespace

PlayedDevice::FrameSource gestureSource(GestureScript script, std::optional<std::uint64_t> seed,
                                        bool endless) {
    // A script without frames would be repeated without ever waiting.
    const bool repeats = endless && script.frames != 0;
    return [script = std::move(script), seed, repeats](const PlayedDevice::FrameSink& sink) {
        SurfaceSynthesizer synthesizer(sink, seed);
        synthesizer.perform(script);
        if (repeats) {
            for (;;) {
                synthesizer.perform(script);
            }
        }
    };
}

SimulatedSurface::SimulatedSurface(SimulatedPlay play, SurfaceIdentity identity,
                                   Vexa::HostClock& clock)
    : SimulatedSurface(seedOf(play), play, std::move(identity), clock) {}

SimulatedSurface::SimulatedSurface(std::uint64_t seed, SimulatedPlay& play,
                                   SurfaceIdentity identity, Vexa::HostClock& clock)
    : PlayedDevice(sourceOf(play, seed), paceOf(play), std::move(identity), clock), seed_(seed) {}

}  // namespace VexaTouch::Tools
