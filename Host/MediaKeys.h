#pragma once

#include "Host/KeyMap.h"
#include "Host/SharedKeyboard.h"
#include "Platform/HidEvent.h"
#include "Platform/Mutex.h"
#include "Platform/ThreadAnnotations.h"

#include <optional>

namespace VexaTouch::Host {

/// The keys that one surface's gestures press:
///
///     tap                    presses its key and releases it
///     hold start, change     releases the key that is held, if it is another, and presses its own
///     anything else          releases the key that is held: hold end, cancel, a firmware reset,
///     and
///                            the begin of another touch, before which a hold has ended
///
/// A gesture without a key presses none. At most one key is held at any time.
class MediaKeys {
public:
    /// The keyboard must have all keys of the map, and outlive this.
    MediaKeys(const KeyMap& map, SharedKeyboard& keyboard) noexcept;
    /// Releases all.
    ~MediaKeys();
    MediaKeys(const MediaKeys&) = delete;
    MediaKeys(MediaKeys&&) = delete;
    MediaKeys& operator=(const MediaKeys&) = delete;
    MediaKeys& operator=(MediaKeys&&) = delete;

    /// The thread that delivers the surface's events, with each of them in its order. Does not wait
    /// but for another surface's key that is just being written.
    void handle(const Vexa::HidEvent& event) noexcept;

    /// Leaves no key of this surface down. Any thread; what is handled afterwards presses anew, so
    /// when the device is gone, first halt its session.
    void releaseAll() noexcept;

private:
    void hold(std::optional<KeyCode> key) noexcept REQUIRES(lock_);

    const KeyMap map_;
    SharedKeyboard& keyboard_;
    Vexa::Mutex lock_;
    std::optional<KeyCode> held_ GUARDED_BY(lock_);
};

}  // namespace VexaTouch::Host
