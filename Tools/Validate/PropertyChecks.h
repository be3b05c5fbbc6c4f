#pragma once

#include "Tools/Validate/CheckRun.h"

/// Whether properties reach the device and come back as they were.
namespace VexaTouch::Tools {

void checkPropertyValues(CheckRun& run);
void checkPropertyThreads(CheckRun& run);
void checkUnknownKeys(CheckRun& run);
void checkNullKeys(CheckRun& run);

}  // namespace VexaTouch::Tools
