#pragma once

#include "Tools/CommandTable.h"
#include "Tools/Streams.h"
#include "Tools/TerminalColor.h"

#include <chrono>
#include <cstdint>
#include <optional>
#include <string_view>

/// Values of options that several subcommands read alike. Each throws UsageError, which names the
/// option, the value and what was expected.
namespace VexaTouch::Tools {

/// A whole number within bounds; none when the option was not given and has no default.
std::optional<std::uint64_t> numberOption(const Arguments& arguments, std::string_view name,
                                          std::uint64_t lowest, std::uint64_t highest);
/// A number above 0, not above `highest`.
std::optional<double> rateOption(const Arguments& arguments, std::string_view name, double highest);
/// "10", "10s" (both seconds), "500ms", "2min", "1h".
std::optional<std::chrono::nanoseconds> durationOption(const Arguments& arguments,
                                                       std::string_view name);
/// auto (what the result stream can show), never, 256 or truecolor.
ColorDepth colorOption(const Arguments& arguments, std::string_view name, const Streams& streams);

}  // namespace VexaTouch::Tools
