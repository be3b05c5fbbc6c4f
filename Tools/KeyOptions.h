#pragma once

#include "Host/KeyMap.h"
#include "Host/SharedKeyboard.h"
#include "Tools/CommandTable.h"
#include "Tools/Streams.h"

#include <array>
#include <cstddef>
#include <memory>
#include <span>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// Text for a command's table that is made when it is compiled, from the table of default keys.
class KeyText {
public:
    /// "tap:1=" and so on, with spaces between.
    static consteval KeyText triggers() {
        KeyText text;
        for (const Host::DefaultKey& each : Host::kDefaultKeys) {
            text.append(text.size_ == 0 ? "" : " ");
            text.append(each.trigger);
            text.append("=");
        }
        return text;
    }
    /// `before` and then "tap:1=KEY_PLAYPAUSE" and so on, with commas between.
    static consteval KeyText defaults(std::string_view before) {
        KeyText text;
        text.append(before);
        for (const Host::DefaultKey& each : Host::kDefaultKeys) {
            text.append(&each == Host::kDefaultKeys.data() ? "" : ", ");
            text.append(each.trigger);
            text.append("=");
            text.append(each.name);
        }
        return text;
    }

    [[nodiscard]] constexpr std::string_view view() const { return {characters_.data(), size_}; }

private:
    consteval void append(std::string_view text) {
        for (const char c : text) {
            characters_.at(size_++) = c;
        }
    }

    std::array<char, 512> characters_ = {};
    std::size_t size_ = 0;
};

inline constexpr KeyText kKeyHelp = KeyText::defaults(
    "Let a gesture (tap or hold, and the region) send another key, by the kernel's name, or none: "
    "tap:1=KEY_NEXTSONG, hold:1=none. Unless changed: ");
inline constexpr KeyText kKeyTriggers = KeyText::triggers();

/// Option of subcommands that send keys.
inline constexpr OptionEntry kKeyOption = {.name = "--key",
                                           .valueName = "GESTURE=KEY",
                                           .help = kKeyHelp.view(),
                                           .repeatable = true,
                                           .kind = ValueKind::Choice,
                                           .choices = kKeyTriggers.view()};

/// The default keys with what was given to --key, later ones over earlier ones. Throws UsageError.
Host::KeyMap parseKeyMap(std::span<const std::string> texts);

/// The kernel's keyboard with the keys of the map, made through the node that the environment
/// variable VEXATOUCH_UINPUT names, else /dev/uinput. Says on the error stream, after "vexatouch
/// COMMAND: ", where the keys can be read, or why there are none and what to do; then it gives
/// null.
std::unique_ptr<Host::SharedKeyboard> makeKeyboard(const Host::KeyMap& map,
                                                   std::string_view command, Streams& streams);

}  // namespace VexaTouch::Tools
