#include "Host/KeyName.h"

#include <libevdev/libevdev.h>

namespace VexaTouch::Host {

static_assert(kHighestKey + 1 == KEY_MAX);

std::optional<KeyCode> keyFromName(std::string_view name) noexcept {
    if (!name.starts_with("KEY_")) {
        return std::nullopt;
    }
    const int code = libevdev_event_code_from_name_n(EV_KEY, name.data(), name.size());
    if (code <= KEY_RESERVED || code > kHighestKey) {
        return std::nullopt;
    }
    return static_cast<KeyCode>(code);
}

std::string_view keyName(KeyCode key) noexcept {
    const char* name = libevdev_event_code_get_name(EV_KEY, key);
    return name == nullptr ? std::string_view() : name;
}

}  // namespace VexaTouch::Host
