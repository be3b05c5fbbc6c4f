#pragma once

#include <string>

namespace VexaTouch::Tools {

/// The text without anything that a terminal would act on: each control character (C0, DEL, and C1
/// in UTF-8) becomes a question mark. For text that comes out of a file.
std::string forTerminal(std::string text);

}  // namespace VexaTouch::Tools
