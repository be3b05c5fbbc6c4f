#pragma once

#include <chrono>
#include <cstdint>
#include <span>
#include <string>

namespace VexaTouch::Tools {

/// How a process ended and what it wrote.
struct ProcessEnd {
    enum class Kind : std::uint8_t { Exited, Signalled, TimedOut };

    Kind kind = Kind::Exited;
    int code = 0;       ///< exit code or number of the signal
    std::string out;    ///< the last part of standard output
    std::string error;  ///< the last part of standard error
    std::chrono::nanoseconds duration{0};
};

/// Runs this program anew with other arguments and waits for it, at most for that time; then it is
/// killed, with all that it started. Throws Failure when it cannot be started.
///
/// It is a fresh program and not only a fork of this one: no thread, lock, descriptor or count of
/// the caller is there to be taken for the plug-in's, sanitizers see a process like any other, and
/// the caller may have threads.
ProcessEnd runSelf(std::span<const std::string> arguments, std::chrono::nanoseconds limit);

}  // namespace VexaTouch::Tools
