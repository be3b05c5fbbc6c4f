#pragma once

#include "Tools/CommandTable.h"
#include "Tools/Streams.h"

#include <span>
#include <string>

namespace VexaTouch::Tools {

/// The program from its arguments to its exit code.
class CommandLine {
public:
    /// Parses the arguments (the program's name left out), runs the subcommand and reports what it
    /// throws. Returns the exit code; lets no exception escape but std::bad_alloc.
    static int run(std::span<const std::string> arguments, Streams& streams);
};

}  // namespace VexaTouch::Tools
