#include "Tools/Validate/ChildProcess.h"

#include "Tools/Failure.h"
#include "Tools/FileDescriptor.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstddef>
#include <cstring>
#include <vector>

namespace VexaTouch::Tools {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::size_t kTextKept = 262'144;

Failure systemFailure(const std::string& what, int error) {
    return Failure(what + ": " + std::strerror(error));
}

struct Pipe {
    FileDescriptor read;
    FileDescriptor write;
};

Pipe makePipe() {
    std::array<int, 2> ends{};
    if (pipe2(ends.data(), O_CLOEXEC) != 0) {
        throw systemFailure("cannot make a pipe", errno);
    }
    return {FileDescriptor(ends[0]), FileDescriptor(ends[1])};
}

std::string ownProgram() {
    std::array<char, PATH_MAX> path{};
    const ssize_t length = readlink("/proc/self/exe", path.data(), path.size());
    if (length <= 0) {
        throw systemFailure("cannot find the program's own file", errno);
    }
    return {path.data(), static_cast<std::size_t>(length)};
}

/// Starts the program in a process group of its own, so that all of it can be killed at once.
pid_t start(std::span<const std::string> arguments, int out, int error) {
    const std::string program = ownProgram();
    std::vector<std::string> words = {program};
    words.insert(words.end(), arguments.begin(), arguments.end());
    std::vector<char*> pointers;
    pointers.reserve(words.size() + 1);
    for (std::string& word : words) {
        pointers.push_back(word.data());
    }
    pointers.push_back(nullptr);

    posix_spawn_file_actions_t actions{};
    posix_spawnattr_t attributes{};
    posix_spawn_file_actions_init(&actions);
    posix_spawnattr_init(&attributes);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_adddup2(&actions, out, STDOUT_FILENO);
    posix_spawn_file_actions_adddup2(&actions, error, STDERR_FILENO);
    posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETPGROUP);
    posix_spawnattr_setpgroup(&attributes, 0);
    pid_t child = -1;
    const int failed =
        posix_spawn(&child, program.c_str(), &actions, &attributes, pointers.data(), environ);
    posix_spawnattr_destroy(&attributes);
    posix_spawn_file_actions_destroy(&actions);
    if (failed != 0) {
        throw systemFailure(program + ": cannot be started", failed);
    }
    return child;
}

/// Takes what is there; false at the end.
bool takeFrom(int descriptor, std::string& text) {
    std::array<char, 16'384> piece{};
    const ssize_t count = read(descriptor, piece.data(), piece.size());
    if (count < 0) {
        return errno == EINTR || errno == EAGAIN;
    }
    text.append(piece.data(), static_cast<std::size_t>(count));
    if (text.size() > 2 * kTextKept) {
        text.erase(0, text.size() - kTextKept);
    }
    return count > 0;
}

int millisecondsUntil(Clock::time_point end) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now()).count();
    return static_cast<int>(std::clamp<std::int64_t>(left, 0, INT_MAX));
}

}  // namespace

ProcessEnd runSelf(std::span<const std::string> arguments, std::chrono::nanoseconds limit) {
    const Clock::time_point begin = Clock::now();
    Pipe out = makePipe();
    Pipe error = makePipe();
    const pid_t child = start(arguments, out.write.get(), error.write.get());
    out.write = {};
    error.write = {};
    // Called by its number: not every C library that runs here has a usable header for it.
    const FileDescriptor process(static_cast<int>(syscall(SYS_pidfd_open, child, 0)));
    if (!process) {
        const int failed = errno;
        kill(-child, SIGKILL);
        throw systemFailure("cannot watch a process", failed);
    }

    ProcessEnd end;
    std::array<pollfd, 3> watched = {{
        {.fd = out.read.get(), .events = POLLIN, .revents = 0},
        {.fd = error.read.get(), .events = POLLIN, .revents = 0},
        {.fd = process.get(), .events = POLLIN, .revents = 0},
    }};
    bool ended = false;
    while (!ended) {
        const int ready = poll(watched.data(), watched.size(), millisecondsUntil(begin + limit));
        if (ready == 0) {
            end.kind = ProcessEnd::Kind::TimedOut;
            break;
        }
        if (watched[0].revents != 0 && !takeFrom(watched[0].fd, end.out)) {
            watched[0].fd = -1;
        }
        if (watched[1].revents != 0 && !takeFrom(watched[1].fd, end.error)) {
            watched[1].fd = -1;
        }
        // What it wrote last is read before its end counts.
        ended = watched[2].revents != 0 && watched[0].revents == 0 && watched[1].revents == 0;
    }
    if (end.kind == ProcessEnd::Kind::TimedOut) {
        kill(-child, SIGKILL);
    }
    siginfo_t status{};
    while (waitid(P_PID, static_cast<id_t>(child), &status, WEXITED | WNOWAIT) != 0 &&
           errno == EINTR) {
    }
    // What it started and left behind goes with it. Only then is its number free for others.
    kill(-child, SIGKILL);
    waitpid(child, nullptr, 0);
    end.duration = Clock::now() - begin;
    if (end.kind == ProcessEnd::Kind::TimedOut) {
        return end;
    }
    end.kind =
        status.si_code == CLD_EXITED ? ProcessEnd::Kind::Exited : ProcessEnd::Kind::Signalled;
    end.code = status.si_status;
    return end;
}

}  // namespace VexaTouch::Tools
