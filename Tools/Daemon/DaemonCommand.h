#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command daemonCommand;

/// Options of the daemon and of those who talk to it.
inline constexpr OptionEntry kBusOption = {
    .name = "--bus",
    .valueName = "BUS",
    .help = "The message bus: system, session, or an address such as unix:path=/run/bus",
    .defaultValue = "system",
    .kind = ValueKind::Choice,
    .choices = "system session unix:path="};

}  // namespace VexaTouch::Tools
