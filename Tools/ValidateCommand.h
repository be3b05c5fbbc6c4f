#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command validateCommand;

}  // namespace VexaTouch::Tools
