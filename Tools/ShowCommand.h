#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command showCommand;

}  // namespace VexaTouch::Tools
