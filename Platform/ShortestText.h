#pragma once

#include <string>

namespace Vexa {

/// Appends the shortest text that reads back to the same float (or double): always with a point or
/// an exponent; inf, -inf and nan by these names. For texts other than JSON. Any thread; may throw
/// std::bad_alloc.
void appendShortest(std::string& out, float value);
void appendShortest(std::string& out, double value);

}  // namespace Vexa
