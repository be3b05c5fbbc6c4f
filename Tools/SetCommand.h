#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command setCommand;

}  // namespace VexaTouch::Tools
