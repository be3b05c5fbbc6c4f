#pragma once

#include "Tools/Streams.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace VexaTouch::Tools {

/// A block of lines on a terminal that is drawn over and over in place, without scrolling. While it
/// lives the cursor is hidden, keys are read as they are pressed, and SIGINT, SIGTERM and SIGHUP
/// only end the waiting; afterwards the terminal is as it was, with the cursor below the block.
/// One at a time in a process.
class LiveScreen {
public:
    explicit LiveScreen(Streams& streams);
    ~LiveScreen();
    LiveScreen(const LiveScreen&) = delete;
    LiveScreen& operator=(const LiveScreen&) = delete;

    /// Draws the lines over those drawn before. No line may be wider than the terminal.
    void draw(const std::vector<std::string>& lines);

    /// Waits until that time on the streams' clock, until a signal has arrived or a key was
    /// pressed; gives the key, or 0. A key that is already there is given without waiting.
    char wait(std::uint64_t untilNs);
    /// The time on the streams' clock.
    [[nodiscard]] std::uint64_t nowNs() const;

    /// Makes the terminal as it was, when the process ends without destroying the screen. Any
    /// thread. Waits for nobody: where the terminal takes nothing more, the cursor stays hidden.
    static void abandon() noexcept;

    /// The signal that arrived and asks for an end, or 0.
    [[nodiscard]] static int interrupted() noexcept;

private:
    struct Saved;

    char pressedKey();

    Streams& streams_;
    std::size_t drawnLines_ = 0;
    std::unique_ptr<Saved> saved_;
};

}  // namespace VexaTouch::Tools
