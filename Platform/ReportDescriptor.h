#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

namespace Vexa {

enum class ReportKind : std::uint8_t { Input, Output, Feature };

/// Usages `first` to `last`, both included, of a usage page. Usage 0 stands for "none given".
struct UsageRange {
    std::uint16_t page = 0;
    std::uint16_t first = 0;
    std::uint16_t last = 0;

    /// On one of the pages 0xFF00 to 0xFFFF, which belong to vendors.
    [[nodiscard]] bool isVendors() const noexcept { return page >= 0xFF00; }

    friend bool operator==(const UsageRange&, const UsageRange&) = default;
};

/// What a HID device says of its reports: their sizes and what they are about.
struct ReportDescriptor {
    struct Report {
        ReportKind kind = ReportKind::Input;
        std::uint8_t id = 0;     ///< 0: the reports of the device have no id
        std::uint32_t bits = 0;  ///< after the id, padding included
        /// The top-level collections that the report has parts in.
        std::vector<UsageRange> collections = {};
        /// Those of its items, in order, padding left out.
        std::vector<UsageRange> usages = {};

        /// After the id.
        [[nodiscard]] std::size_t bytes() const noexcept { return (bits + 7U) / 8U; }
        /// Whether a collection or an item of it is on a vendor's page.
        [[nodiscard]] bool isVendors() const noexcept;

        friend bool operator==(const Report&, const Report&) = default;
    };

    std::vector<Report> reports = {};  ///< in the order of their first items

    /// The report of that kind and id, or null.
    [[nodiscard]] const Report* find(ReportKind kind, std::uint8_t id) const noexcept;
    /// Bytes of the longest report of that kind, its id included if it has one; 0: there is none.
    [[nodiscard]] std::size_t longest(ReportKind kind) const noexcept;

    friend bool operator==(const ReportDescriptor&, const ReportDescriptor&) = default;
};

/// Why bytes are no report descriptor.
struct ReportDescriptorError {
    std::size_t offset = 0;        ///< of the item that is wrong, in bytes
    std::string_view reason = {};  ///< for a person, without a full stop
};

/// The kernel takes no longer descriptor and no longer report, nor do we; in bytes.
inline constexpr std::size_t kLongestReportDescriptor = 4096;
inline constexpr std::size_t kLongestHidReport = 16'384;

/// Reads a report descriptor: short items and long ones (passed over), global state with push and
/// pop, usages of two and of four bytes. What means nothing for the layout of reports is not
/// checked. Nothing, and why in `error`, when the bytes break off within an item, when collections
/// or delimiters do not pair up, when a pop has no push before it, when an id is 0 or above 255 and
/// when a report is too long. Time is at most quadratic and memory linear in the length, whatever
/// the bytes. Any thread; throws std::bad_alloc.
std::optional<ReportDescriptor> parseReportDescriptor(std::span<const std::uint8_t> bytes,
                                                      ReportDescriptorError* error = nullptr);

}  // namespace Vexa
