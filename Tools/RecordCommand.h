#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command recordCommand;

}  // namespace VexaTouch::Tools
