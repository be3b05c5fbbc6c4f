#include "Tools/Validate/CheckTexts.h"

#include <array>
#include <cstdio>

namespace VexaTouch::Tools {

std::string statusText(vexa_status status) {
    struct Name {
        vexa_status status;
        const char* name;
    };
    static constexpr std::array<Name, 9> kNames = {{
        {VEXA_STATUS_SUCCESS, "success"},
        {VEXA_STATUS_NO_RESOURCES, "no resources"},
        {VEXA_STATUS_UNSUPPORTED, "unsupported"},
        {VEXA_STATUS_NO_INTERFACE, "no such interface"},
        {VEXA_STATUS_NOT_OPEN, "not open"},
        {VEXA_STATUS_ALREADY_OPEN, "already open"},
        {VEXA_STATUS_GONE, "gone"},
        {VEXA_STATUS_IO_ERROR, "I/O error"},
        {VEXA_STATUS_BAD_ARGUMENT, "bad argument"},
    }};
    std::array<char, 16> digits{};
    static_cast<void>(std::snprintf(digits.data(), digits.size(), "0x%08X", status));
    std::string text = digits.data();
    for (const Name& entry : kNames) {
        if (entry.status == status) {
            text += std::string(" (") + entry.name + ")";
        }
    }
    return text;
}

std::string identifierText(const vexa_identifier& identifier) {
    std::string text;
    for (std::size_t index = 0; index < sizeof identifier.bytes; ++index) {
        if (index == 4 || index == 6 || index == 8 || index == 10) {
            text += '-';
        }
        std::array<char, 4> digits{};
        static_cast<void>(
            std::snprintf(digits.data(), digits.size(), "%02x", identifier.bytes[index]));
        text += digits.data();
    }
    return text;
}

std::string countText(std::int64_t count, std::string_view what) {
    return std::to_string(count) + ' ' + std::string(what) + (count == 1 ? "" : "s");
}

}  // namespace VexaTouch::Tools
