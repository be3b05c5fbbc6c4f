#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command monitorCommand;

}  // namespace VexaTouch::Tools
