#include "Host/StatusText.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <string_view>

namespace VexaTouch::Host {
namespace {

struct StatusEntry {
    vexa_status status;
    std::string_view meaning;
};

constexpr std::array<StatusEntry, 9> kStatuses = {{
    {VEXA_STATUS_SUCCESS, "success"},
    {VEXA_STATUS_NO_RESOURCES, "no resources"},
    {VEXA_STATUS_UNSUPPORTED, "unsupported"},
    {VEXA_STATUS_NO_INTERFACE, "no such interface"},
    {VEXA_STATUS_NOT_OPEN, "not open"},
    {VEXA_STATUS_ALREADY_OPEN, "open already"},
    {VEXA_STATUS_GONE, "unplugged"},
    {VEXA_STATUS_IO_ERROR, "transfer failed"},
    {VEXA_STATUS_BAD_ARGUMENT, "bad argument"},
}};

}  // namespace

std::string statusText(vexa_status status) {
    std::array<char, 16> number{};
    std::snprintf(number.data(), number.size(), "0x%08X", status);
    std::string text = number.data();
    const auto found = std::ranges::find(kStatuses, status, &StatusEntry::status);
    if (found != kStatuses.end()) {
        text += " (";
        text += found->meaning;
        text += ')';
    }
    return text;
}

}  // namespace VexaTouch::Host
