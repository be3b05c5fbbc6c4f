#pragma once

#include "Tools/Validate/CheckRun.h"

/// Whether a service survives its life in any order, and leaves nothing behind.
namespace VexaTouch::Tools {

void checkBeforeStart(CheckRun& run);
void checkRepeatedCalls(CheckRun& run);
void checkSecondSchedule(CheckRun& run);
void checkDeviceFailures(CheckRun& run);
void checkUnplug(CheckRun& run);
void checkDestroy(CheckRun& run);
void checkDestroyScheduled(CheckRun& run);
void checkCycles(CheckRun& run);
void checkLeaks(CheckRun& run);
void checkMemory(CheckRun& run);
void checkUnload(CheckRun& run);

}  // namespace VexaTouch::Tools
