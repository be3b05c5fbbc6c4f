// A process of its own, which watches every system call of another one's input thread.
//
// The figure: a report costs the input thread one wait and one read, and a batch of events at most
// one wake of the host's queue.

#include "Tests/Support/Sanitized.h"
#include "Tests/Support/ServiceUnderTest.h"
#include "Tests/Support/Touch.h"

#include "Platform/TraceListener.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sys/ptrace.h>
#include <sys/syscall.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <unistd.h>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstring>
#include <map>
#include <stdexcept>
#include <thread>
#include <vector>

namespace VexaTouch::Testing {
namespace {

using testing::Pair;
using testing::UnorderedElementsAre;

constexpr int kReports = 1000;
/// A report that is none: the input thread then makes a system call that nobody else makes.
constexpr std::uint8_t kMarker = 0xEE;
constexpr std::uint64_t kMark = SYS_getppid;

/// How often each system call was made.
using Calls = std::map<std::uint64_t, int>;

/// A pipe between two processes.
class Pipe {
public:
    Pipe() {
        if (::pipe(ends_.data()) != 0) throw std::runtime_error("no pipe");
    }
    void give(pid_t number) const {
        if (::write(ends_[1], &number, sizeof number) != sizeof number) ::_exit(2);
    }
    [[nodiscard]] pid_t take() const {
        pid_t number = 0;
        if (::read(ends_[0], &number, sizeof number) != sizeof number) ::_exit(2);
        return number;
    }

private:
    std::array<int, 2> ends_{};
};

/// The process that is watched: a service that gets reports, with a mark before and behind each
/// kind of them.
[[noreturn]] void beWatched(const Pipe& ready, const Pipe& go) {
    ServiceStand stand(VEXATOUCH_PLUGIN_FILE);
    pid_t inputThread = 0;
    const Vexa::TraceListener listener([&](std::uint32_t code, auto arguments) {
        if (code != VEXA_TRACE_REPORT || arguments[0] != kMarker) return;
        if (inputThread == 0) {
            inputThread = ::gettid();
        } else {
            ::syscall(kMark);
        }
    });
    const auto send = [&stand](const std::vector<std::uint8_t>& report) {
        if (!stand.device->sendReport(report)) ::_exit(3);
    };
    if (stand.service.start(stand.registration.service()) != 0) ::_exit(3);
    // Nobody keeps the events, so the heap does not grow for them.
    stand.service.setEventCallback([](void*, void*, void*, vexa_event*, std::uint32_t) {}, nullptr,
                                   nullptr);
    stand.service.schedule(stand.queue);
    if (!stand.service.open()) ::_exit(3);
    std::uint32_t frame = 0;
    const auto quiet = [&] {
        ++frame;
        return imageReport(nothing(), frame, 10 * frame);
    };
    // The recording reaches its full size, and the heap too.
    std::vector<std::vector<std::uint8_t>> warmUp;
    for (int i = 0; i < 3 * kReports; ++i) warmUp.push_back(firmwareReport(0));
    for (int i = 0; i < 6 * kReports; ++i) warmUp.push_back(quiet());
    warmUp.push_back({kMarker});
    if (!stand.feed(warmUp)) ::_exit(4);
    ready.give(inputThread);
    static_cast<void>(go.take());

    send({kMarker});
    for (int i = 0; i < kReports; ++i) send(quiet());
    send({kMarker});
    for (int i = 0; i < kReports; ++i) {
        // Each event has landed before the next one, and nobody makes the input thread tell of it.
        const std::uint64_t handled = stand.device->handled();
        send(firmwareReport(0));
        while (stand.device->handled() == handled) std::this_thread::yield();
        stand.queue.drain();
    }
    send({kMarker});
    static_cast<void>(go.take());
    ::_exit(0);
}

/// Watches a thread of another process: the calls between one mark and the next, for each pair of
/// marks. Empty when that cannot be done here.
std::vector<Calls> watch(pid_t thread, const Pipe& go, std::size_t spans) {
    std::vector<Calls> calls;
    if (::ptrace(PTRACE_SEIZE, thread, nullptr, PTRACE_O_TRACESYSGOOD) != 0) return calls;
    int status = 0;
    ::ptrace(PTRACE_INTERRUPT, thread, nullptr, nullptr);
    ::waitpid(thread, &status, __WALL);
    go.give(1);
    bool marked = false;
    while (calls.size() < spans + 1) {
        ::ptrace(PTRACE_SYSCALL, thread, nullptr, nullptr);
        if (::waitpid(thread, &status, __WALL) != thread || !WIFSTOPPED(status)) return {};
        if (WSTOPSIG(status) != (SIGTRAP | 0x80)) continue;
        __ptrace_syscall_info info{};
        ::ptrace(PTRACE_GET_SYSCALL_INFO, thread, sizeof info, &info);
        if (info.op != PTRACE_SYSCALL_INFO_ENTRY) continue;
        if (info.entry.nr == kMark) {
            marked = true;
            calls.emplace_back();
        } else if (marked) {
            ++calls.back()[info.entry.nr];
        }
    }
    calls.pop_back();
    ::ptrace(PTRACE_DETACH, thread, nullptr, nullptr);
    return calls;
}

TEST(ServiceInputThreadTest, CallsAreOneWaitAndOneReadForEachReportAndAWakeForABatch) {
    const Pipe ready;
    const Pipe go;
    const pid_t child = ::fork();
    ASSERT_GE(child, 0);
    if (child == 0) beWatched(ready, go);

    const pid_t thread = ready.take();
    std::vector<Calls> calls = watch(thread, go, 2);
    const int refusal = errno;
    if (calls.empty()) ::kill(child, SIGKILL);
    go.give(1);
    int status = 0;
    ::waitpid(child, &status, __WALL);
    if (calls.empty()) GTEST_SKIP() << "not allowed to watch: " << std::strerror(refusal);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);

    ASSERT_EQ(calls.size(), 2U);
    for (Calls& span : calls) {
        // Once in a thousand reports or so the heap asks for more, where its pieces lie badly.
        int growths = 0;
        for (const std::uint64_t call :
             std::to_array<std::uint64_t>({SYS_mmap, SYS_munmap, SYS_mprotect, SYS_brk})) {
            const auto found = span.find(call);
            if (found == span.end()) continue;
            growths += found->second;
            span.erase(found);
        }
        if (!kSanitized) {
            EXPECT_LE(growths, kReports / 100);
            continue;
        }
        // It has memory and locks of its own.
        for (const std::uint64_t call :
             std::to_array<std::uint64_t>({SYS_madvise, SYS_sched_yield, SYS_futex})) {
            span.erase(call);
        }
    }
    const int reports = kReports + 1;  // the mark's own report too
#ifdef SYS_epoll_wait
    constexpr std::uint64_t kWait = SYS_epoll_wait;
#else
    constexpr std::uint64_t kWait = SYS_epoll_pwait;
#endif
    EXPECT_THAT(calls[0], UnorderedElementsAre(Pair(kWait, reports), Pair(SYS_read, reports)));
    // Each of these reports makes an event, whose way to the queue is one write.
    EXPECT_THAT(calls[1], UnorderedElementsAre(Pair(kWait, reports), Pair(SYS_read, reports),
                                               Pair(SYS_write, kReports)));
}

}  // namespace
}  // namespace VexaTouch::Testing
