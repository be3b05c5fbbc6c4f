#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command infoCommand;

}  // namespace VexaTouch::Tools
