#include "Platform/Trace.h"
#include "Platform/TraceListener.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstdint>
#include <cstdio>
#include <map>
#include <memory>
#include <ostream>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

namespace Vexa {
namespace {

using testing::ElementsAre;
using testing::Pair;
using testing::UnorderedElementsAre;

struct Point {
    std::uint32_t code = 0;
    std::array<std::uint64_t, 4> arguments{};

    friend bool operator==(const Point&, const Point&) = default;
    friend std::ostream& operator<<(std::ostream& stream, const Point& point) {
        stream << std::hex << point.code;
        for (const std::uint64_t argument : point.arguments) stream << ' ' << argument;
        return stream << std::dec;
    }
};

Point pointOf(std::uint32_t code, TraceListener::Arguments arguments) {
    Point point{code, {}};
    std::copy(arguments.begin(), arguments.end(), point.arguments.begin());
    return point;
}

TEST(TraceTest, AListenerSeesEveryPointWithItsArguments) {
    std::vector<Point> points;
    {
        const TraceListener listener([&points](std::uint32_t code, auto arguments) {
            points.push_back(pointOf(code, arguments));
        });
        trace(TraceCode::Report, 0x74, 1, 0, 255);
        trace(TraceCode::FirmwareEvent, 2, 0x0102030405060708u);
        trace(TraceCode::Batch, 3);
        trace(TraceCode::Event, 11, 4);
        vexa_trace(7, 1, 2, 3, UINT64_MAX);
    }
    trace(TraceCode::Batch, 99);
    EXPECT_THAT(points,
                ElementsAre(Point{0x2B150180, {0x74, 1, 0, 255}},
                            Point{0x2B15018C, {2, 0x0102030405060708u}}, Point{0x2B150184, {3}},
                            Point{0x2B150188, {11, 4}}, Point{7, {1, 2, 3, UINT64_MAX}}));
}

TEST(TraceTest, TheLastListenerListens) {
    std::vector<std::string> calls;
    const auto noting = [&calls](const char* name) {
        return
            [&calls, name](std::uint32_t, TraceListener::Arguments) { calls.emplace_back(name); };
    };
    auto first = std::make_unique<TraceListener>(noting("first"));
    trace(TraceCode::Batch);
    const TraceListener second(noting("second"));
    trace(TraceCode::Batch);
    EXPECT_THAT(calls, ElementsAre("first", "second"));
}

TEST(TraceTest, PointsThatAListenerPassesAreNotListenedTo) {
    int calls = 0;
    const TraceListener listener([&calls](std::uint32_t, TraceListener::Arguments) {
        ++calls;
        trace(TraceCode::Batch);
    });
    trace(TraceCode::Batch);
    EXPECT_EQ(calls, 1);
}

TEST(TraceTest, AListenerThatIsGoneIsNotCalled) {
    std::atomic<bool> isOver{false};
    std::array<std::thread, 2> passing;
    for (std::thread& thread : passing) {
        thread = std::thread([&isOver] {
            while (!isOver) trace(TraceCode::Report, 1, 2, 3, 4);
        });
    }
    for (int round = 0; round < 60; ++round) {
        std::atomic<int> seen{0};
        auto isAlive = std::make_unique<bool>(true);
        {
            const TraceListener listener([&seen, &isAlive](std::uint32_t, auto arguments) {
                EXPECT_TRUE(*isAlive);
                EXPECT_EQ(arguments[3], 4u);
                ++seen;
            });
            while (seen == 0) std::this_thread::yield();
        }
        isAlive.reset();
    }
    isOver = true;
    for (std::thread& thread : passing) thread.join();
}

TEST(TraceDeathTest, AListenerMayNotReplaceItself) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const TraceListener listener(
        [](std::uint32_t, TraceListener::Arguments) { vexa_trace_set_sink(nullptr, nullptr); });
    EXPECT_DEATH(trace(TraceCode::Batch),
                 "vexa_trace_set_sink: called by the sink, for which it would wait");
}

struct ProbeNote {
    std::string provider;
    int argumentCount = 0;

    friend bool operator==(const ProbeNote&, const ProbeNote&) = default;
    friend std::ostream& operator<<(std::ostream& stream, const ProbeNote& note) {
        return stream << note.provider << '/' << note.argumentCount;
    }
};

std::string outputOf(const std::string& command) {
    const std::unique_ptr<FILE, int (*)(FILE*)> pipe(popen(command.c_str(), "r"), &pclose);
    EXPECT_NE(pipe, nullptr);
    std::string output;
    std::array<char, 4096> piece{};
    while (const std::size_t length = fread(piece.data(), 1, piece.size(), pipe.get())) {
        output.append(piece.data(), length);
    }
    return output;
}

/// The static probes in a binary's notes, by name.
std::multimap<std::string, ProbeNote> probesIn(const std::string& file) {
    std::istringstream lines(outputOf("LC_ALL=C readelf --wide --notes '" + file + "'"));
    std::multimap<std::string, ProbeNote> probes;
    std::string provider;
    std::string name;
    for (std::string line; std::getline(lines, line);) {
        // The first label stands behind the note's own columns.
        const std::size_t start = line.find("Provider:");
        std::istringstream words(start == std::string::npos ? line : line.substr(start));
        std::string label;
        words >> label;
        if (label == "Provider:") words >> provider;
        if (label == "Name:") words >> name;
        if (label == "Arguments:") {
            int count = 0;
            for (std::string argument; words >> argument;) ++count;
            probes.emplace(name, ProbeNote{provider, count});
        }
    }
    return probes;
}

TEST(TraceTest, TheLibraryHoldsAStaticProbeForEachKindOfPoint) {
    Dl_info library{};
    ASSERT_NE(dladdr(reinterpret_cast<void*>(&vexa_trace), &library), 0);
    EXPECT_THAT(probesIn(library.dli_fname),
                UnorderedElementsAre(Pair("report", ProbeNote{"vexatouch", 4}),
                                     Pair("firmware_event", ProbeNote{"vexatouch", 2}),
                                     Pair("batch", ProbeNote{"vexatouch", 1}),
                                     Pair("event", ProbeNote{"vexatouch", 2}),
                                     Pair("trace", ProbeNote{"vexatouch", 5})));
}

}  // namespace
}  // namespace Vexa
