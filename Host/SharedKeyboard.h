#pragma once

#include "Host/Keyboard.h"
#include "Platform/Mutex.h"
#include "Platform/ThreadAnnotations.h"

#include <array>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <system_error>

namespace VexaTouch::Host {

/// One keyboard that several surfaces type on: a key is down while anybody holds it. What somebody
/// taps or holds while another one holds it as well is down already, so nothing happens.
///
/// When the keyboard fails (uinput was taken away), it is never written to again. Any thread.
class SharedKeyboard {
public:
    explicit SharedKeyboard(std::unique_ptr<Keyboard> keyboard) noexcept;

    /// Presses and releases, seen by readers one after the other.
    void tap(KeyCode key) noexcept;
    /// Releases `from`, which the caller holds, and presses `to`, which it holds from then on, seen
    /// by readers as one. Either may be none; the same key twice stays down.
    void exchange(std::optional<KeyCode> from, std::optional<KeyCode> to) noexcept;

    /// What the keyboard failed with, in one line, once.
    [[nodiscard]] std::optional<std::string> takeFailure();

private:
    void press(KeyCode key) noexcept REQUIRES(lock_);
    void release(KeyCode key) noexcept REQUIRES(lock_);
    void synchronise() noexcept REQUIRES(lock_);
    void keep(std::error_code error) noexcept REQUIRES(lock_);

    Vexa::Mutex lock_;
    std::unique_ptr<Keyboard> keyboard_ PT_GUARDED_BY(lock_);
    /// By key: how many hold it.
    std::array<std::uint16_t, kHighestKey + 1> holders_ GUARDED_BY(lock_) = {};
    bool unseen_ GUARDED_BY(lock_) = false;  // something was written since the last synchronise()
    std::error_code failure_ GUARDED_BY(lock_);
    bool failureTaken_ GUARDED_BY(lock_) = false;
};

}  // namespace VexaTouch::Host
