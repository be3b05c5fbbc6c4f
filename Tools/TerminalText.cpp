#include "Tools/TerminalText.h"

#include <cstddef>

namespace VexaTouch::Tools {

std::string forTerminal(std::string text) {
    for (std::size_t i = 0; i < text.size(); ++i) {
        const auto c = static_cast<unsigned char>(text[i]);
        const auto next = static_cast<unsigned char>(i + 1 < text.size() ? text[i + 1] : '\0');
        if (c < 0x20 || c == 0x7F) {
            text[i] = '?';
        } else if (c == 0xC2 && next >= 0x80 && next < 0xA0) {
            text.replace(i, 2, "?");
        }
    }
    return text;
}

}  // namespace VexaTouch::Tools
