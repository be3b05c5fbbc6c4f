#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command getCommand;

}  // namespace VexaTouch::Tools
