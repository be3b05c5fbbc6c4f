#pragma once

#include <cstdint>
#include <span>
#include <string>

namespace Vexa::Library {

/// Appends the bytes as <hex>. May throw std::bad_alloc, as all of these.
void appendBytes(std::string& out, std::span<const std::uint8_t> bytes);
/// Appends two hexadecimal digits.
void appendHexadecimalByte(std::string& out, std::uint8_t byte);
/// Appends the number as vexa_number_text_of_float and _double write it.
void appendNumber(std::string& out, float value);
void appendNumber(std::string& out, double value);

}  // namespace Vexa::Library
