#pragma once

#include <chrono>
#include <cstddef>
#include <filesystem>
#include <iterator>
#include <thread>

namespace VexaTouch::Testing {

/// How many threads this process has.
inline std::size_t threadCount() {
    const std::filesystem::directory_iterator tasks("/proc/self/task");
    return static_cast<std::size_t>(std::distance(begin(tasks), end(tasks)));
}

/// Waits until no more than so many are left: a thread that has done its work takes a moment to be
/// gone, and nobody can join a detached one. False after a minute.
[[nodiscard]] inline bool waitForThreads(std::size_t count) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::minutes(1);
    while (threadCount() > count) {
        if (std::chrono::steady_clock::now() > deadline) return false;
        std::this_thread::yield();
    }
    return true;
}

}  // namespace VexaTouch::Testing
