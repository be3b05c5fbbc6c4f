#include "Host/SharedKeyboard.h"

#include <utility>

namespace VexaTouch::Host {

SharedKeyboard::SharedKeyboard(std::unique_ptr<Keyboard> keyboard) noexcept
    : keyboard_(std::move(keyboard)) {}

void SharedKeyboard::tap(KeyCode key) noexcept {
    const Vexa::MutexLock guard(lock_);
    press(key);
    // A press and a release that are seen as one may be taken for nothing.
    synchronise();
    release(key);
    synchronise();
}

void SharedKeyboard::exchange(std::optional<KeyCode> from, std::optional<KeyCode> to) noexcept {
    if (from == to) {
        return;
    }
    const Vexa::MutexLock guard(lock_);
    // The release first: it ends the kernel's repetition, whichever key is repeated.
    if (from) {
        release(*from);
    }
    if (to) {
        press(*to);
    }
    synchronise();
}

std::optional<std::string> SharedKeyboard::takeFailure() {
    const Vexa::MutexLock guard(lock_);
    if (!failure_ || std::exchange(failureTaken_, true)) {
        return std::nullopt;
    }
    return "the keyboard is gone, no more keys are sent: " + failure_.message();
}

void SharedKeyboard::press(KeyCode key) noexcept {
    if (holders_[key]++ == 0 && keyboard_) {
        unseen_ = true;
        keep(keyboard_->press(key));
    }
}

void SharedKeyboard::release(KeyCode key) noexcept {
    if (--holders_[key] == 0 && keyboard_) {
        unseen_ = true;
        keep(keyboard_->release(key));
    }
}

void SharedKeyboard::synchronise() noexcept {
    if (std::exchange(unseen_, false) && keyboard_) {
        keep(keyboard_->synchronise());
    }
}

void SharedKeyboard::keep(std::error_code error) noexcept {
    if (error) {
        failure_ = error;
        // Without its owner the kernel takes it away with all its keys up, should it still be
        // there.
        keyboard_.reset();
    }
}

}  // namespace VexaTouch::Host
