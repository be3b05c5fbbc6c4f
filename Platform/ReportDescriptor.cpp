#include "Platform/ReportDescriptor.h"

#include "Platform/DescriptorItem.h"

#include <algorithm>
#include <utility>

namespace Vexa {
namespace {

/// What is wrong with the item being read.
struct Wrong {
    std::string_view reason;
};

struct GlobalState {
    std::uint16_t usagePage = 0;
    std::uint32_t reportSize = 0;   // bits of a field
    std::uint32_t reportCount = 0;  // fields
    std::uint8_t reportId = 0;
};

/// As it stands in a local item: one of two bytes gets its page only from the main item.
struct GivenUsage {
    std::uint32_t number = 0;
    bool hasPage = false;
};

struct GivenRange {
    GivenUsage first;
    GivenUsage last;
};

constexpr std::uint32_t kPageShift = 16;

/// Reads the items one after the other, as the state machine that the standard describes.
class DescriptorReader {
public:
    /// Throws Wrong.
    void take(const DescriptorItem& item) {
        switch (item.type) {
            case DescriptorItem::Type::Main:
                takeMain(item);
                break;
            case DescriptorItem::Type::Global:
                takeGlobal(item);
                break;
            case DescriptorItem::Type::Local:
                takeLocal(item);
                break;
            case DescriptorItem::Type::Reserved:
            case DescriptorItem::Type::Long:
                break;  // nobody has given these a meaning
        }
    }
    /// Throws Wrong.
    void end() const {
        if (depth_ > 0) throw Wrong{"a collection is not ended"};
        if (inDelimiter_) throw Wrong{"a delimiter is not closed"};
    }
    [[nodiscard]] ReportDescriptor result() && { return std::move(result_); }

private:
    void takeMain(const DescriptorItem& item) {
        if (item.is(DescriptorItem::Input)) {
            takeFields(ReportKind::Input, item);
        } else if (item.is(DescriptorItem::Output)) {
            takeFields(ReportKind::Output, item);
        } else if (item.is(DescriptorItem::Feature)) {
            takeFields(ReportKind::Feature, item);
        } else if (item.is(DescriptorItem::Collection)) {
            // Only the outermost one says what a report is about.
            if (depth_++ == 0) collection_ = usageOf(usages_.empty() ? GivenRange{} : usages_[0]);
        } else if (item.is(DescriptorItem::EndCollection)) {
            if (depth_ == 0) throw Wrong{"a collection is ended that was not begun"};
            --depth_;
        }
        if (inDelimiter_) throw Wrong{"a delimiter is not closed"};
        usages_.clear();
        minimum_.reset();
    }

    void takeFields(ReportKind kind, const DescriptorItem& item) {
        const std::uint64_t bits = std::uint64_t{global_.reportSize} * global_.reportCount;
        ReportDescriptor::Report& report = reportOf(kind);
        if (bits > kLongestHidReport * 8 - report.bits) throw Wrong{"the report is too long"};
        report.bits += static_cast<std::uint32_t>(bits);
        if (depth_ > 0 &&
            std::ranges::find(report.collections, collection_) == report.collections.end()) {
            report.collections.push_back(collection_);
        }
        constexpr std::uint32_t kConstant = 1;
        if (bits == 0 || (item.number() & kConstant) != 0) return;
        if (usages_.empty()) report.usages.push_back(usageOf({}));
        for (const GivenRange& given : usages_) report.usages.push_back(usageOf(given));
    }

    void takeGlobal(const DescriptorItem& item) {
        switch (item.tag) {
            case DescriptorItem::UsagePage:
                global_.usagePage = static_cast<std::uint16_t>(item.number());
                break;
            case DescriptorItem::ReportSize:
                global_.reportSize = item.number();
                break;
            case DescriptorItem::ReportCount:
                global_.reportCount = item.number();
                break;
            case DescriptorItem::ReportId:
                if (item.number() == 0) throw Wrong{"report id 0 is reserved"};
                if (item.number() > UINT8_MAX) throw Wrong{"a report id is above 255"};
                global_.reportId = static_cast<std::uint8_t>(item.number());
                break;
            case DescriptorItem::Push:
                stack_.push_back(global_);
                break;
            case DescriptorItem::Pop:
                if (stack_.empty()) throw Wrong{"a pop without a push"};
                global_ = stack_.back();
                stack_.pop_back();
                break;
            default:
                break;
        }
    }

    void takeLocal(const DescriptorItem& item) {
        const GivenUsage given{.number = item.number(), .hasPage = item.data.size() == 4};
        switch (item.tag) {
            case DescriptorItem::Usage:
                usages_.push_back({given, given});
                break;
            case DescriptorItem::UsageMinimum:
                minimum_ = given;
                break;
            case DescriptorItem::UsageMaximum:
                takeRange(given);
                break;
            case DescriptorItem::Delimiter: {
                // The alternatives within are usages like others.
                const bool opens = item.number() != 0;
                if (opens == inDelimiter_) {
                    throw Wrong{opens ? "a delimiter within another"
                                      : "a delimiter is closed that was not opened"};
                }
                inDelimiter_ = opens;
                break;
            }
            default:
                break;
        }
    }

    /// A range that runs backwards or from one page to another holds no usage.
    void takeRange(const GivenUsage& last) {
        if (!minimum_) return;
        const GivenRange range{*minimum_, last};
        minimum_.reset();
        const bool samePage = range.first.hasPage == range.last.hasPage &&
                              (!range.first.hasPage ||
                               range.first.number >> kPageShift == range.last.number >> kPageShift);
        if (samePage && range.first.number <= range.last.number) usages_.push_back(range);
    }

    [[nodiscard]] UsageRange usageOf(const GivenRange& given) const noexcept {
        return {.page = given.first.hasPage
                            ? static_cast<std::uint16_t>(given.first.number >> kPageShift)
                            : global_.usagePage,
                .first = static_cast<std::uint16_t>(given.first.number),
                .last = static_cast<std::uint16_t>(given.last.number)};
    }

    ReportDescriptor::Report& reportOf(ReportKind kind) {
        const auto found = std::ranges::find_if(result_.reports, [&](const auto& report) {
            return report.kind == kind && report.id == global_.reportId;
        });
        if (found != result_.reports.end()) return *found;
        return result_.reports.emplace_back(
            ReportDescriptor::Report{.kind = kind, .id = global_.reportId});
    }

    ReportDescriptor result_;
    GlobalState global_;
    std::vector<GlobalState> stack_;
    std::size_t depth_ = 0;
    UsageRange collection_;  // the outermost, while in one
    std::vector<GivenRange> usages_;
    std::optional<GivenUsage> minimum_;
    bool inDelimiter_ = false;
};

}  // namespace

bool ReportDescriptor::Report::isVendors() const noexcept {
    return std::ranges::any_of(collections, &UsageRange::isVendors) ||
           std::ranges::any_of(usages, &UsageRange::isVendors);
}

const ReportDescriptor::Report* ReportDescriptor::find(ReportKind kind,
                                                       std::uint8_t id) const noexcept {
    const auto found = std::ranges::find_if(
        reports, [&](const Report& report) { return report.kind == kind && report.id == id; });
    return found == reports.end() ? nullptr : &*found;
}

std::size_t ReportDescriptor::longest(ReportKind kind) const noexcept {
    std::size_t longest = 0;
    for (const Report& report : reports) {
        if (report.kind != kind) continue;
        longest = std::max(longest, report.bytes() + (report.id != 0 ? 1U : 0U));
    }
    return longest;
}

std::optional<ReportDescriptor> parseReportDescriptor(std::span<const std::uint8_t> bytes,
                                                      ReportDescriptorError* error) {
    std::size_t offset = 0;
    try {
        if (bytes.size() > kLongestReportDescriptor) {
            offset = kLongestReportDescriptor;
            throw Wrong{"longer than 4096 bytes"};
        }
        DescriptorReader reader;
        while (offset < bytes.size()) {
            const auto item = DescriptorItem::first(bytes.subspan(offset));
            if (!item) throw Wrong{"the bytes break off within an item"};
            reader.take(*item);
            offset += item->length;
        }
        reader.end();
        return std::move(reader).result();
    } catch (const Wrong& wrong) {
        if (error) *error = {.offset = offset, .reason = wrong.reason};
        return std::nullopt;
    }
}

}  // namespace Vexa
