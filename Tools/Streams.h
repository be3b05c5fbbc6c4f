#pragma once

#include "Platform/HostClock.h"

#include <chrono>
#include <istream>
#include <ostream>

namespace VexaTouch::Tools {

/// Where a subcommand reads and writes: results go to `out`, status and faults to `error`.
struct Streams {
    std::istream& in;
    std::ostream& out;
    std::ostream& error;
    bool outIsTerminal = false;
    bool errorIsTerminal = false;
    unsigned columns = 80;                               ///< width of the terminal
    unsigned rows = 24;                                  ///< height of the terminal
    Vexa::HostClock& clock = Vexa::HostClock::system();  ///< what playing in real time waits by
    /// How long a service may leave the reports of its device alone.
    std::chrono::nanoseconds patience = std::chrono::seconds(5);
};

}  // namespace VexaTouch::Tools
