#pragma once

#include <stdexcept>

namespace VexaTouch::Host {

/// What a host could not do, in one line: the step, the plug-in, why.
class HostFailure : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

}  // namespace VexaTouch::Host
