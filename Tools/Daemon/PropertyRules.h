#pragma once

#include "Platform/PropertyValue.h"
#include "Tools/Daemon/CallerRights.h"

#include <cstddef>
#include <string_view>

/// Which properties are given and taken over the bus. Stricter than the service, which takes any
/// key of the pipeline and records what it takes.
namespace VexaTouch::Tools::Daemon::PropertyRules {

inline constexpr std::size_t kLongestKey = 128;

/// Control for what carries raw touches, Watch for all else.
Right rightToRead(std::string_view key);

/// Whether the device is asked for it, which may take as long as the kernel waits for an answer.
bool asksDevice(std::string_view key);

/// Throws BusError (UnknownKey) for a key that is too long, or in the domain "Pipeline" and not to
/// be read there: an index is a plain number below the count.
void checkRead(std::string_view key);

/// Throws BusError for a key that is too long or not to be written, and for a value that is not of
/// the key's kind: settings are booleans and finite numbers. Of other domains than "Pipeline" it
/// knows only the service's own keys, which are read-only; whether the device has a key it must be
/// asked.
void checkWrite(std::string_view key, const Vexa::PropertyValue& value);

}  // namespace VexaTouch::Tools::Daemon::PropertyRules
