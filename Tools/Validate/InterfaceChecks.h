#pragma once

#include "Tools/Validate/CheckRun.h"

/// Whether a plug-in is found, and whether its tables are what a host expects.
namespace VexaTouch::Tools {

void checkLoad(CheckRun& run);
void checkFactory(CheckRun& run);
void checkQueryInterface(CheckRun& run);
void checkSlots(CheckRun& run);
void checkReferenceCounts(CheckRun& run);
void checkReferenceThreads(CheckRun& run);
void checkArgumentOrder(CheckRun& run);
void checkUnknownService(CheckRun& run);
void checkEventQueries(CheckRun& run);

}  // namespace VexaTouch::Tools
