#pragma once

#include "Platform/PropertyValue.h"

#include <ostream>

namespace Vexa {

/// What a failed test shows of a value.
inline void PrintTo(const PropertyValue& value, std::ostream* out) {
    *out << value.description();
}

}  // namespace Vexa
