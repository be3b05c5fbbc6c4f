// A process of its own, since it replaces system calls and the heap's operators by counting ones.
//
// The figure: a report costs the input thread one epoll_wait and one read, and no memory.

#include "Platform/HidDevice.h"
#include "Platform/ScriptedDevice.h"
#include "Tests/Support/CountedHeap.h"

#include <gtest/gtest.h>

#include <dlfcn.h>
#include <poll.h>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/uio.h>
#include <unistd.h>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <latch>
#include <memory>
#include <thread>
#include <vector>

namespace {

struct Counts {
    int waits = 0;
    int reads = 0;
    int others = 0;
    int allocations = 0;
};

// Of a thread that counts.
constinit thread_local Counts* counts = nullptr;

}  // namespace

// What a sanitizer puts in between must not be replaced: with one, only memory is counted.
#if defined(__SANITIZE_THREAD__) || defined(__SANITIZE_ADDRESS__)
#define VEXA_COUNTS 0
#elif defined(__has_feature)
#if __has_feature(thread_sanitizer) || __has_feature(address_sanitizer) || \
    __has_feature(memory_sanitizer)
#define VEXA_COUNTS 0
#endif
#endif
#ifndef VEXA_COUNTS
#define VEXA_COUNTS 1
#endif

#if VEXA_COUNTS

namespace {

// The function that would be called without us.
template <typename Function>
Function* next(const char* name) {
    return reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
}

void count(int Counts::* what) {
    if (counts) ++(counts->*what);
}

}  // namespace

#define VEXA_COUNTED(what, type, name, parameters, arguments)      \
    __attribute__((visibility("default"))) type name parameters {  \
        static const auto original = next<type parameters>(#name); \
        count(&Counts::what);                                      \
        return original arguments;                                 \
    }

extern "C" {

VEXA_COUNTED(reads, ssize_t, read, (int fd, void* buffer, std::size_t size), (fd, buffer, size))
VEXA_COUNTED(waits, int, epoll_wait, (int fd, epoll_event* events, int most, int timeout),
             (fd, events, most, timeout))
VEXA_COUNTED(others, int, epoll_ctl, (int set, int operation, int fd, epoll_event* event) noexcept,
             (set, operation, fd, event))
VEXA_COUNTED(others, ssize_t, write, (int fd, const void* buffer, std::size_t size),
             (fd, buffer, size))
VEXA_COUNTED(others, ssize_t, recv, (int fd, void* buffer, std::size_t size, int flags),
             (fd, buffer, size, flags))
VEXA_COUNTED(others, ssize_t, recvmsg, (int fd, msghdr* message, int flags), (fd, message, flags))
VEXA_COUNTED(others, ssize_t, readv, (int fd, const iovec* parts, int most), (fd, parts, most))
VEXA_COUNTED(others, int, poll, (pollfd * states, nfds_t most, int timeout),
             (states, most, timeout))
VEXA_COUNTED(others, int, setsockopt,
             (int fd, int level, int name, const void* value, socklen_t size) noexcept,
             (fd, level, name, value, size))

// The C heap, which C libraries below use; its functions must not be looked up, which allocates.
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);

__attribute__((visibility("default"))) void* malloc(std::size_t size) noexcept {
    count(&Counts::allocations);
    return __libc_malloc(size);
}
__attribute__((visibility("default"))) void* calloc(std::size_t number, std::size_t size) noexcept {
    count(&Counts::allocations);
    return __libc_calloc(number, size);
}
__attribute__((visibility("default"))) void* realloc(void* block, std::size_t size) noexcept {
    count(&Counts::allocations);
    return __libc_realloc(block, size);
}

}  // extern "C"

#endif

namespace Vexa {
namespace {

using VexaTouch::Testing::allocations;

constexpr const char* kMode = "input";
constexpr int kReports = 1000;

// Counts on the loop's thread from the first report to the one after the last.
struct Counter {
    RunLoop loop;
    Counts counted{};
    std::size_t allocated = 0;
    int reports = 0;

    static void receive(void* context, vexa_status, vexa_device*, vexa_report_type, std::uint32_t,
                        const std::uint8_t*, std::size_t, std::uint64_t) {
        auto& self = *static_cast<Counter*>(context);
        if (self.reports == 0) {
            counts = &self.counted;
            self.allocated = allocations;
        }
        if (self.reports == kReports) {
            counts = nullptr;
            self.allocated = allocations - self.allocated;
            self.loop.stop();
        }
        ++self.reports;
    }
};

TEST(InputThreadCalls, AreOneWaitAndOneReadForEachReport) {
    const auto scripted = std::make_shared<ScriptedDevice>();
    const DeviceRegistration registration(scripted);
    const HidDevice device = HidDevice::create(registration.service());
    Counter counter;
    std::latch scheduled(1);
    std::jthread input([&] {
        std::array<std::uint8_t, 512> buffer{};
        counter.loop = RunLoop::current();
        device.setInputReportCallback(buffer, &Counter::receive, &counter);
        device.schedule(counter.loop, kMode);
        scheduled.count_down();
        counter.loop.run(kMode);
        device.unschedule(counter.loop, kMode);
        counter.loop.reset();
    });
    scheduled.wait();
    ASSERT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
    const std::vector<std::uint8_t> report(64, 0x31);
    for (int i = 0; i <= kReports; ++i) {
        scripted->sendReport(report);
        // Most of the time the thread waits anew for each.
        if (i % 4 != 0) {
            ASSERT_TRUE(scripted->waitUntilHandled(static_cast<std::uint64_t>(i) + 1));
        }
    }
    input.join();
    EXPECT_EQ(counter.reports, kReports + 1);
    EXPECT_EQ(counter.allocated, 0U);
#if VEXA_COUNTS
    EXPECT_EQ(counter.counted.waits, kReports);
    EXPECT_EQ(counter.counted.reads, kReports);
    EXPECT_EQ(counter.counted.others, 0);
    EXPECT_EQ(counter.counted.allocations, 0);
#endif
}

#if VEXA_COUNTS

// Were the descriptor still watched, each wait would come back at once.
TEST(InputThreadCalls, EndWithTheUnplug) {
    const auto scripted = std::make_shared<ScriptedDevice>();
    const DeviceRegistration registration(scripted);
    const HidDevice device = HidDevice::create(registration.service());
    std::jthread([&] {
        std::array<std::uint8_t, 512> buffer{};
        const RunLoop loop = RunLoop::current();
        Counter counter;
        device.setInputReportCallback(buffer, &Counter::receive, &counter);
        device.schedule(loop, kMode);
        ASSERT_EQ(device.open(0), VEXA_STATUS_SUCCESS);
        scripted->unplug();
        EXPECT_EQ(loop.run(kMode, 0), VEXA_RUN_TIMED_OUT);
        EXPECT_FALSE(device.isPresent());
        Counts later;
        counts = &later;
        EXPECT_EQ(loop.run(kMode, 20'000'000), VEXA_RUN_TIMED_OUT);
        counts = nullptr;
        // Two, or one more when the clock of the wait lags behind.
        EXPECT_LE(later.waits, 3);
        EXPECT_EQ(later.reads, 0);
        device.unschedule(loop, kMode);
    }).join();
}

TEST(InputThreadCalls, AreCountedAtAll) {
    Counts seen;
    std::array<int, 2> ends{};
    ASSERT_EQ(::pipe(ends.data()), 0);
    char byte = 'a';
    counts = &seen;
    const ssize_t written = ::write(ends[1], &byte, 1);
    const ssize_t got = ::read(ends[0], &byte, 1);
    std::free(::strdup("a"));
    counts = nullptr;
    EXPECT_EQ(written + got, 2);
    EXPECT_EQ(seen.others, 1);
    EXPECT_EQ(seen.reads, 1);
    EXPECT_GE(seen.allocations, 1);
    ::close(ends[0]);
    ::close(ends[1]);
}

#endif

}  // namespace
}  // namespace Vexa
