#pragma once

#include "Platform/PropertyValue.h"

#include <cstddef>
#include <cstdint>
#include <string_view>

struct sd_bus_message;

/// Property values on the bus. Each kind has a type of its own, so that what is read is what was
/// written, to the bit:
///
///     null                   g, the empty signature     single-precision number  (d)
///     boolean                b                          double                   d
///     signed integer         x                          string                   s
///     unsigned integer       t                          bytes                    ay
///     array                  av                         dictionary               a{sv}
///     no value (in an array or dictionary)     (g), the empty signature
///     string that is no UTF-8 or holds zero    (ay)
///     dictionary with such a key               a(ayv)
///
/// What others find easier to write is taken as well: y, q and u as an unsigned integer, n and i as
/// a signed one, o as a string, an array of any type and a dictionary with string keys of any type.
namespace VexaTouch::Tools::Daemon::BusValue {

/// Of what strangers send: bytes of texts, keys and bytes together, and eight for every value.
inline constexpr std::size_t kMostBytes = 16'384;
inline constexpr std::size_t kNoLimit = SIZE_MAX;
/// Arrays and dictionaries in each other. The bus ends the connection of who sends more than 64
/// containers in each other, and a dictionary counts as three.
inline constexpr int kMostLevels = 20;

/// Whether the bus takes the text as a string: UTF-8 without zero bytes.
bool isText(std::string_view text);

/// Appends the value as a variant. Throws BusError for one that is nested too deep.
void append(sd_bus_message* message, const Vexa::PropertyValue& value);
/// Reads a variant, or what else comes next. Throws BusError for a type without a meaning here, and
/// for one that is too large.
Vexa::PropertyValue read(sd_bus_message* message, std::size_t mostBytes = kMostBytes);

}  // namespace VexaTouch::Tools::Daemon::BusValue
