#pragma once

#include "Host/KeyName.h"

#include <system_error>

namespace VexaTouch::Host {

/// Keys that can be pressed. Each operation gives no error when it was done. One thread at a time;
/// none of them may block.
class Keyboard {
public:
    Keyboard() = default;
    virtual ~Keyboard() = default;
    Keyboard(const Keyboard&) = delete;
    Keyboard(Keyboard&&) = delete;
    Keyboard& operator=(const Keyboard&) = delete;
    Keyboard& operator=(Keyboard&&) = delete;

    /// The key must be one that the keyboard was made with.
    [[nodiscard]] virtual std::error_code press(KeyCode key) noexcept = 0;
    [[nodiscard]] virtual std::error_code release(KeyCode key) noexcept = 0;
    /// Those who read the keyboard see what happened since the last time, as one.
    [[nodiscard]] virtual std::error_code synchronise() noexcept = 0;
};

}  // namespace VexaTouch::Host
