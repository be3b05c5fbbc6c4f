#pragma once

#include <vexa/plugin.h>
#include <vexa/status.h>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

/// How reasons and steps write what they speak of.
namespace VexaTouch::Tools {

/// "0xE00002BE (no resources)"
std::string statusText(vexa_status status);
/// "0dc705b2-6c28-4e2f-971a-307afa691f3d"
std::string identifierText(const vexa_identifier& identifier);
/// "1 value", "3 values"
std::string countText(std::int64_t count, std::string_view what);

}  // namespace VexaTouch::Tools
