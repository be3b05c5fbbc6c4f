#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command replayCommand;

}  // namespace VexaTouch::Tools
