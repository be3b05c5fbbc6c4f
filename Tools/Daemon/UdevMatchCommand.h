#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command udevMatchCommand;

}  // namespace VexaTouch::Tools
