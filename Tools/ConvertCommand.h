#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command convertCommand;

}  // namespace VexaTouch::Tools
