#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command runCommand;

}  // namespace VexaTouch::Tools
