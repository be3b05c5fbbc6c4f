#pragma once

#include <stdexcept>

namespace VexaTouch::Tools {

/// What went wrong, in one line for the person who meets it: with what, and why. Thrown by a
/// subcommand, it is printed on the error stream and ends the program with exit code 1.
class Failure : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

/// The command line itself is wrong: exit code 2.
class UsageError : public Failure {
public:
    using Failure::Failure;
};

}  // namespace VexaTouch::Tools
