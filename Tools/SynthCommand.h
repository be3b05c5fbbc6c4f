#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command synthCommand;

}  // namespace VexaTouch::Tools
