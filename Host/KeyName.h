#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace VexaTouch::Host {

/// The number of a key as the kernel knows it, 1 to kHighestKey.
using KeyCode = std::uint16_t;

inline constexpr KeyCode kHighestKey = 0x2FE;

/// The key of that name, "KEY_PLAYPAUSE" and the like; none for any other text, for the names of
/// bounds (KEY_RESERVED, KEY_MAX) and for buttons (BTN_LEFT): a keyboard with buttons would be
/// taken for a mouse. Any thread.
[[nodiscard]] std::optional<KeyCode> keyFromName(std::string_view name) noexcept;

/// The kernel's name of the key; empty when it has none. Any thread.
[[nodiscard]] std::string_view keyName(KeyCode key) noexcept;

}  // namespace VexaTouch::Host
