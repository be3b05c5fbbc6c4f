#pragma once

#include <string>

namespace VexaTouch::Tools {

/// Each returns when what it names would survive the machine's end, with the number of the system's
/// error, 0 for none. Where there is nothing that could be done (a pipe, a device, a file system
/// that knows no such thing) that is none. May take as long as the disk does. Any thread.

/// What was written to an open file.
int syncFile(int descriptor) noexcept;
/// The names in a folder.
int syncFolder(const std::string& folder) noexcept;

}  // namespace VexaTouch::Tools
