#pragma once

#include <optional>
#include <string>
#include <vector>

namespace VexaTouch::Tools {

/// The names of the functions and data that a shared object exports, but for those that linkers put
/// in by themselves; nothing when they cannot be read.
std::optional<std::vector<std::string>> exportedSymbols(const std::string& path);

}  // namespace VexaTouch::Tools
