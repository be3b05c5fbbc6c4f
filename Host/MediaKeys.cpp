#include "Host/MediaKeys.h"

#include "Host/GestureEvent.h"

#include <utility>

namespace VexaTouch::Host {

MediaKeys::MediaKeys(const KeyMap& map, SharedKeyboard& keyboard) noexcept
    : map_(map), keyboard_(keyboard) {}

MediaKeys::~MediaKeys() {
    releaseAll();
}

void MediaKeys::handle(const Vexa::HidEvent& event) noexcept {
    const GestureEvent gesture = GestureEvent::of(event);
    const Vexa::MutexLock guard(lock_);
    switch (gesture.kind) {
        case EventKind::HoldStart:
        case EventKind::HoldChange:
            hold(map_.key(KeyGesture::Hold, gesture.region));
            break;
        case EventKind::Tap:
            hold(std::nullopt);
            if (const auto key = map_.key(KeyGesture::Tap, gesture.region)) {
                keyboard_.tap(*key);
            }
            break;
        case EventKind::MayBegin:
        case EventKind::HoldEnd:
        case EventKind::Cancel:
        case EventKind::FirmwareReset:
            hold(std::nullopt);
            break;
    }
}

void MediaKeys::releaseAll() noexcept {
    const Vexa::MutexLock guard(lock_);
    hold(std::nullopt);
}

void MediaKeys::hold(std::optional<KeyCode> key) noexcept {
    keyboard_.exchange(std::exchange(held_, key), key);
}

}  // namespace VexaTouch::Host
