#pragma once

#include "Tools/CommandTable.h"
#include "Tools/Replay.h"
#include "Tools/Streams.h"

#include <string_view>

/// What the subcommands that replay with other settings have in common.
namespace VexaTouch::Tools {

inline constexpr OptionEntry kPinOption = {
    .name = "--pin",
    .help =
        "Settings given here hold to the end: what the recording itself sets of them does not "
        "count"};

/// Says on standard error when a setting that `option` gave did not hold to the end.
void warnOfLostSetting(const Replay& replay, std::string_view command, std::string_view option,
                       Streams& streams);

}  // namespace VexaTouch::Tools
