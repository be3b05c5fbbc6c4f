#pragma once

#include <atomic>

namespace VexaTouch::Tools {

/// Whether one thread is to go on with its work, as others say. Once finished it stays so.
class ReadingSwitch {
public:
    /// Any thread; without effect once it is finished.
    void turn(bool on) noexcept { tell(on ? State::On : State::Off); }
    /// Any thread.
    void finish() noexcept { tell(State::Finished); }

    /// Returns when it is on (true) or finished (false).
    [[nodiscard]] bool waitUntilOn() const noexcept {
        state_.wait(State::Off);
        return state_.load() != State::Finished;
    }

private:
    enum class State : int { Off, On, Finished };

    void tell(State state) noexcept {
        State before = state_.load();
        while (before != State::Finished && !state_.compare_exchange_weak(before, state)) {
        }
        state_.notify_all();
    }

    std::atomic<State> state_ = State::Off;
};

}  // namespace VexaTouch::Tools
