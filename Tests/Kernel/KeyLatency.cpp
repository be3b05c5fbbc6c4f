// usage: KeyLatency TAPS
//
// Plugs a surface in, waits until somebody has it open and types on "Vexa Touch media keys", and
// sends short taps, 1000 reports a second. Prints percentiles of the time from the writing of the
// report that ends a tap to the moment at which a program has read the key.

#include "Tests/Kernel/KeyDevice.h"
#include "Tests/Kernel/UhidDevice.h"
#include "Tools/LatencyRun.h"
#include "Tools/LatencySummary.h"
#include "Tools/Replay.h"
#include "Tools/SurfaceSynthesizer.h"

#include <sys/prctl.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <iostream>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace VexaTouch;
using Clock = std::chrono::steady_clock;

constexpr std::chrono::seconds kLimit{20};
constexpr std::chrono::milliseconds kPeriod{1};

FrameList framesOf(std::size_t taps) {
    std::string script;
    for (std::size_t tap = 0; tap < taps; tap += 3) {
        script += Tools::kLatencyGestures;
    }
    return Tools::synthesize(Tools::GestureScript::parse(script));
}

/// Of each frame, whether a tap is its event.
std::vector<bool> endsOfTaps(FrameList frames) {
    std::vector<bool> ends(frames.size());
    Tools::Replay replay(std::move(frames));
    for (std::size_t frame = 0; replay.canContinue(); ++frame) {
        for (const Tools::EventRecord& event : replay.next().events) {
            ends.at(frame) = ends.at(frame) || event.kind == Host::EventKind::Tap;
        }
    }
    return ends;
}

std::uint64_t nanoseconds(Clock::duration duration) {
    return static_cast<std::uint64_t>(
        std::chrono::duration_cast<std::chrono::nanoseconds>(duration).count());
}

/// When each key was pressed, as its reader saw it, and by the time stamp of the kernel.
struct Presses {
    std::vector<Clock::time_point> read;
    std::vector<Clock::time_point> stamped;
};

Presses readPresses(const Testing::KeyDevice& device, std::size_t count) {
    Presses presses;
    presses.read.reserve(count);
    presses.stamped.reserve(count);
    input_event event{};
    while (presses.read.size() < count && device.read(event)) {
        if (event.type == EV_KEY && event.value == 1) {
            presses.read.push_back(Clock::now());
            presses.stamped.emplace_back(std::chrono::seconds(event.input_event_sec) +
                                         std::chrono::microseconds(event.input_event_usec));
        }
    }
    return presses;
}

void print(const char* what, const std::vector<Clock::time_point>& sent,
           const std::vector<Clock::time_point>& arrived) {
    std::vector<std::uint64_t> latencies;
    for (std::size_t i = 0; i < sent.size(); ++i) {
        latencies.push_back(nanoseconds(arrived.at(i) - sent[i]));
    }
    const auto summary = Tools::LatencySummary::of(std::move(latencies));
    const auto us = [](std::uint64_t ns) { return static_cast<double>(ns) / 1000.0; };
    std::printf("figure: %s p50 %.0f p90 %.0f p99 %.0f p99.9 %.0f max %.0f us (%zu taps)\n", what,
                us(summary.p50), us(summary.p90), us(summary.p99), us(summary.p999),
                us(summary.most), summary.samples);
}

void measure(std::size_t taps) {
    Testing::UhidDevice surface({});
    const FrameList frames = framesOf(taps);
    const std::vector<bool> ends = endsOfTaps(frames);
    const Testing::KeyDevice keys("Vexa Touch media keys", kLimit);
    if (!surface.waitUntilOpen(true, kLimit)) {
        throw std::runtime_error("nobody opened the surface");
    }
    std::vector<Clock::time_point> sent;
    const auto count = static_cast<std::size_t>(std::ranges::count(ends, true));
    sent.reserve(count);
    Presses presses;
    std::thread reader([&] { presses = readPresses(keys, count); });
    Clock::time_point due = Clock::now();
    std::size_t index = 0;
    for (const auto& frame : frames) {
        std::this_thread::sleep_until(due);
        due += kPeriod;
        if (ends.at(index++)) {
            sent.push_back(Clock::now());
        }
        surface.send(frame.report);
    }
    reader.join();
    if (count == 0 || presses.read.size() != count) {
        throw std::runtime_error(std::to_string(presses.read.size()) + " keys for " +
                                 std::to_string(count) + " taps");
    }
    print("uhid to uinput", sent, presses.stamped);
    print("uhid to key read", sent, presses.read);
}

}  // namespace

int main(int count, char** arguments) {
    prctl(PR_SET_TIMERSLACK, 1UL, 0UL, 0UL, 0UL);
    try {
        measure(count == 2 ? std::strtoul(arguments[1], nullptr, 10) : 1000);
        return 0;
    } catch (const std::exception& fault) {
        std::cerr << "KeyLatency: " << fault.what() << '\n';
        return 1;
    }
}
