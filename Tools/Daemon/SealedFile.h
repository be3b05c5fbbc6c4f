#pragma once

#include "Tools/FileDescriptor.h"

#include <string_view>

namespace VexaTouch::Tools::Daemon {

/// A file in memory with this content that nobody can change any more, open for reading at its
/// beginning. Throws Failure.
FileDescriptor sealedFile(std::string_view content);

}  // namespace VexaTouch::Tools::Daemon
