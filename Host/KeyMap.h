#pragma once

#include "Host/KeyName.h"

#include <linux/input-event-codes.h>
#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

namespace VexaTouch::Host {

/// What a finger does to mean a key.
enum class KeyGesture : std::uint8_t { Tap, Hold };

/// "tap", "hold".
std::string_view keyGestureName(KeyGesture gesture) noexcept;

/// A key and the gesture in a region that sends it.
struct DefaultKey {
    std::string_view trigger;  ///< as it is written on a command line
    KeyGesture gesture;
    std::uint32_t region;
    KeyCode key;
    std::string_view name;  ///< of the key
};

/// The keys that gestures send unless they are told otherwise; every gesture there is.
inline constexpr std::array<DefaultKey, 6> kDefaultKeys = {{
    {"tap:1", KeyGesture::Tap, 1, KEY_PLAYPAUSE, "KEY_PLAYPAUSE"},
    {"tap:2", KeyGesture::Tap, 2, KEY_VOLUMEDOWN, "KEY_VOLUMEDOWN"},
    {"tap:3", KeyGesture::Tap, 3, KEY_VOLUMEUP, "KEY_VOLUMEUP"},
    {"hold:1", KeyGesture::Hold, 1, KEY_ASSISTANT, "KEY_ASSISTANT"},
    {"hold:2", KeyGesture::Hold, 2, KEY_VOLUMEDOWN, "KEY_VOLUMEDOWN"},
    {"hold:3", KeyGesture::Hold, 3, KEY_VOLUMEUP, "KEY_VOLUMEUP"},
}};

/// Which key each gesture sends. A tap presses its key and releases it; a hold's key is down as
/// long as the hold.
class KeyMap {
public:
    struct Entry {
        std::string_view trigger;  ///< "tap:1"
        KeyGesture gesture;
        std::uint32_t region;
        std::optional<KeyCode> key;  ///< none: the gesture sends nothing

        friend bool operator==(const Entry&, const Entry&) = default;
    };

    /// The default keys.
    KeyMap() noexcept;

    /// Changes one gesture: "tap:1=KEY_NEXTSONG" or "hold:1=none". Throws std::invalid_argument,
    /// whose text says which part is wrong and what is expected; the map is then as it was.
    void assign(std::string_view text);

    /// What the gesture sends; none when there is no such region as well.
    [[nodiscard]] std::optional<KeyCode> key(KeyGesture gesture,
                                             std::uint32_t region) const noexcept;
    /// Every gesture, in the order of kDefaultKeys.
    [[nodiscard]] const std::array<Entry, kDefaultKeys.size()>& entries() const noexcept {
        return entries_;
    }
    /// All keys that it can send, each once, in ascending order. May throw std::bad_alloc.
    [[nodiscard]] std::vector<KeyCode> keys() const;

    friend bool operator==(const KeyMap&, const KeyMap&) = default;

private:
    std::array<Entry, kDefaultKeys.size()> entries_;
};

}  // namespace VexaTouch::Host
