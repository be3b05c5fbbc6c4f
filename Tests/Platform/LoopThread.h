#pragma once

#include "Platform/RunLoop.h"

#include <latch>
#include <thread>
#include <utility>

namespace Vexa {

/// A thread whose run loop runs in one mode until this goes.
class LoopThread {
public:
    static constexpr const char* kMode = "input";

    LoopThread()
        : thread_([this] {
              loop_ = RunLoop::current();
              started_.count_down();
              loop_.run(kMode);
          }) {
        started_.wait();
    }
    ~LoopThread() {
        loop_.submit(kMode, [loop = loop_] { loop.stop(); });
        thread_.join();
    }
    LoopThread(const LoopThread&) = delete;
    LoopThread(LoopThread&&) = delete;
    LoopThread& operator=(const LoopThread&) = delete;
    LoopThread& operator=(LoopThread&&) = delete;

    /// Calls it on the thread and waits for it.
    template <typename Body>
    void call(Body body) const {
        std::latch done(1);
        loop_.submit(kMode, [&] {
            body();
            done.count_down();
        });
        done.wait();
    }

    [[nodiscard]] const RunLoop& loop() const noexcept { return loop_; }

private:
    RunLoop loop_;
    std::latch started_{1};
    std::jthread thread_;
};

}  // namespace Vexa
