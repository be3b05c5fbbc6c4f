#pragma once

#include "Shared/InputReport.h"

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

/// Small shared operations: ticks, hexadecimal text, dotted keys, the picture of an image. Free
/// functions, reentrant, on any thread; the only state is the timebase, read once from the host.
namespace VexaTouch::Util {

/// Nanoseconds to host ticks: the product with the timebase's denominator wraps at 64 bits, then
/// is divided by the numerator, truncating. 0 if the numerator is 0.
std::uint64_t machTimeFromNanoseconds(std::uint64_t nanoseconds) noexcept;

/// Host ticks to nanoseconds: the product with the timebase's numerator wraps at 64 bits, then is
/// divided by the denominator, truncating. 0 if the denominator is 0.
std::uint64_t nanosecondsFromMachTime(std::uint64_t ticks) noexcept;

/// Two lowercase hexadecimal digits and one space a byte.
std::string hexStringFromBytes(const std::vector<std::uint8_t>& bytes);
/// The same, appended to `text`.
void appendHexString(std::string& text, std::span<const std::uint8_t> bytes);

/// The bytes of white-space separated hexadecimal numbers, each read as a formatted stream would
/// read a 16-bit unsigned value in base 16 (sign and 0x prefix included). What does not read, or
/// does not fit in 16 bits, quietly ends the list.
/// Throws std::invalid_argument "invalid hex string" for a value of 256 or more.
std::vector<std::uint8_t> bytesFromHexString(std::string_view text);
/// The same into `bytes`, whose content is replaced (and unspecified after a throw).
void readHexString(std::string_view text, std::vector<std::uint8_t>& bytes);

/// Reads bytes from the front of a text as long as they have the form that hexStringFromBytes
/// writes (digits of either case) and there is room; gives their number.
std::size_t readPlainHexBytes(std::string_view text, std::span<std::uint8_t> bytes) noexcept;

/// If `key` begins with `domain` and a dot (compared up to a zero byte), removes both and returns
/// true; otherwise leaves the key alone and returns false.
bool stripDomainFromKey(std::string& key, const std::string& domain);

/// A fixed-layout picture of an image: a header line, an empty line and thirteen rows of numbers,
/// each at its pixel's place, of the unsigned or the signed values.
std::string stringFromImage(const InputReport::Image& image, bool showUnsigned);

}  // namespace VexaTouch::Util
