#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command latencyCommand;

}  // namespace VexaTouch::Tools
