// A process of its own, since it stands between the loop and its library when a time is set.

#include "Tools/Daemon/EventLoop.h"

#include <dlfcn.h>
#include <gmock/gmock.h>

#include <chrono>
#include <cstdint>
#include <ctime>
#include <vector>

struct sd_event_source;

namespace {

struct Asked {
    std::uint64_t time;  // both in microseconds
    std::uint64_t accuracy;

    friend bool operator==(const Asked&, const Asked&) = default;
};
std::vector<Asked> asked;

using Handler = int(sd_event_source* source, std::uint64_t due, void* context);

}  // namespace

extern "C" int sd_event_add_time_relative(sd_event* event, sd_event_source** source,
                                          clockid_t clock, std::uint64_t time,
                                          std::uint64_t accuracy, Handler* handler, void* context) {
    static const auto call = reinterpret_cast<decltype(&sd_event_add_time_relative)>(
        ::dlsym(RTLD_NEXT, "sd_event_add_time_relative"));
    asked.push_back({.time = time, .accuracy = accuracy});
    return call(event, source, clock, time, accuracy, handler, context);
}

namespace VexaTouch::Tools::Daemon {
namespace {

using ::testing::ElementsAre;

TEST(EventLoopTest, AfterHoursItIsNoLaterThanAfterMilliseconds) {
    EventLoop loop;
    asked.clear();
    const auto night = loop.after(std::chrono::hours(8), [] {});
    const auto moment = loop.after(std::chrono::nanoseconds(1'500), [] {});
    const auto past = loop.after(std::chrono::seconds(-1), [] {});
    // Not before its time, and with 0 the library would take its own accuracy.
    EXPECT_THAT(asked,
                ElementsAre(Asked{.time = 28'800'000'000, .accuracy = 1},
                            Asked{.time = 2, .accuracy = 1}, Asked{.time = 0, .accuracy = 1}));
}

TEST(EventLoopTest, AfterCallsBackOnceAndEveryAgainAndAgain) {
    EventLoop loop;
    int once = 0;
    int often = 0;
    const auto single = loop.after(std::chrono::nanoseconds(0), [&] { ++once; });
    const auto repeated = loop.every(std::chrono::microseconds(50), [&] {
        if (++often >= 10 && once > 0) {
            loop.stop();
        }
    });
    loop.run();
    EXPECT_EQ(once, 1);
    EXPECT_GE(often, 10);
}

TEST(EventLoopTest, WhatIsLetGoOfIsNotCalledBack) {
    EventLoop loop;
    bool called = false;
    auto ended = loop.after(std::chrono::nanoseconds(0), [&] { called = true; });
    ended.reset();
    const auto end = loop.after(std::chrono::microseconds(1), [&] { loop.stop(); });
    loop.run();
    EXPECT_FALSE(called);
}

}  // namespace
}  // namespace VexaTouch::Tools::Daemon
