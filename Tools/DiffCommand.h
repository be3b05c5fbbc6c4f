#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command diffCommand;

}  // namespace VexaTouch::Tools
