#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

namespace Vexa {

/// One item of a report descriptor for a person.
struct DescriptorLine {
    std::size_t offset = 0;                    ///< of the item
    std::span<const std::uint8_t> bytes = {};  ///< the item's
    std::string text = {};  ///< "Usage Page (0xFF60)", indented by two spaces for each collection
};

/// A line for each item, as far as the bytes go; bytes that break off within an item are a line of
/// their own. Only the first kLongestReportDescriptor bytes are looked at. The lines point into
/// `bytes`. Any thread.
std::vector<DescriptorLine> reportDescriptorLines(std::span<const std::uint8_t> bytes);

}  // namespace Vexa
