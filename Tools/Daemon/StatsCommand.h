#pragma once

#include "Tools/CommandTable.h"

namespace VexaTouch::Tools {

extern const Command statsCommand;

}  // namespace VexaTouch::Tools
