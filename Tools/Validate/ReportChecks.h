#pragma once

#include "Tools/Validate/CheckRun.h"

/// Whether reports of any kind are taken, and events delivered as promised.
namespace VexaTouch::Tools {

void checkReportLengths(CheckRun& run);
void checkRandomReports(CheckRun& run);
void checkEvents(CheckRun& run);
void checkLateCallback(CheckRun& run);
void checkUnschedule(CheckRun& run);

}  // namespace VexaTouch::Tools
