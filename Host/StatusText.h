#pragma once

#include <vexa/status.h>
#include <string>

namespace VexaTouch::Host {

/// A status for a message: "0xE00002BE (no resources)"; the number alone when it has no name.
std::string statusText(vexa_status status);

}  // namespace VexaTouch::Host
