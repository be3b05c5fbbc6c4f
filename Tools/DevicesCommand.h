#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command devicesCommand;

}  // namespace VexaTouch::Tools
