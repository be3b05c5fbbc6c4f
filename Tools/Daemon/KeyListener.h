#pragma once

#include "Host/KeyMap.h"
#include "Host/MediaKeys.h"
#include "Host/SharedKeyboard.h"
#include "Platform/HidEvent.h"
#include "Tools/Daemon/Daemon.h"

#include <optional>
#include <string>

namespace VexaTouch::Tools::Daemon {

/// Turns one surface's gestures into keys of the keyboard that all surfaces share.
class KeyListener final : public EventListener {
public:
    /// The keyboard must have all keys of the map, and outlive this.
    KeyListener(const Host::KeyMap& map, Host::SharedKeyboard& keyboard) noexcept
        : keyboard_(keyboard), keys_(map, keyboard) {}

    void handle(const Vexa::HidEvent& event) noexcept override { keys_.handle(event); }
    // Gestures that were on their way press anew.
    void surfaceEnding() noexcept override { keys_.releaseAll(); }
    void surfaceGone() noexcept override { keys_.releaseAll(); }
    [[nodiscard]] std::optional<std::string> takeFailure() override {
        return keyboard_.takeFailure();
    }

private:
    Host::SharedKeyboard& keyboard_;
    Host::MediaKeys keys_;
};

}  // namespace VexaTouch::Tools::Daemon
