#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command keysCommand;

}  // namespace VexaTouch::Tools
