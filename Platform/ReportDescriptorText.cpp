#include "Platform/ReportDescriptorText.h"

#include "Platform/DescriptorItem.h"
#include "Platform/ReportDescriptor.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <string_view>

namespace Vexa {
namespace {

/// What stands in the parentheses behind an item's name.
enum class Shown : std::uint8_t { Nothing, Number, Signed, Hexadecimal, Fields, Collection };

struct Name {
    DescriptorItem::Type type;
    std::uint8_t tag;
    std::string_view text;
    Shown shown;
};

constexpr auto kMain = DescriptorItem::Type::Main;
constexpr auto kGlobal = DescriptorItem::Type::Global;
constexpr auto kLocal = DescriptorItem::Type::Local;

constexpr std::array<Name, 27> kNames = {{
    {kMain, DescriptorItem::Input, "Input", Shown::Fields},
    {kMain, DescriptorItem::Output, "Output", Shown::Fields},
    {kMain, DescriptorItem::Feature, "Feature", Shown::Fields},
    {kMain, DescriptorItem::Collection, "Collection", Shown::Collection},
    {kMain, DescriptorItem::EndCollection, "End Collection", Shown::Nothing},
    {kGlobal, DescriptorItem::UsagePage, "Usage Page", Shown::Hexadecimal},
    {kGlobal, DescriptorItem::LogicalMinimum, "Logical Minimum", Shown::Signed},
    {kGlobal, DescriptorItem::LogicalMaximum, "Logical Maximum", Shown::Signed},
    {kGlobal, DescriptorItem::PhysicalMinimum, "Physical Minimum", Shown::Signed},
    {kGlobal, DescriptorItem::PhysicalMaximum, "Physical Maximum", Shown::Signed},
    {kGlobal, DescriptorItem::UnitExponent, "Unit Exponent", Shown::Signed},
    {kGlobal, DescriptorItem::Unit, "Unit", Shown::Hexadecimal},
    {kGlobal, DescriptorItem::ReportSize, "Report Size", Shown::Number},
    {kGlobal, DescriptorItem::ReportId, "Report ID", Shown::Number},
    {kGlobal, DescriptorItem::ReportCount, "Report Count", Shown::Number},
    {kGlobal, DescriptorItem::Push, "Push", Shown::Nothing},
    {kGlobal, DescriptorItem::Pop, "Pop", Shown::Nothing},
    {kLocal, DescriptorItem::Usage, "Usage", Shown::Hexadecimal},
    {kLocal, DescriptorItem::UsageMinimum, "Usage Minimum", Shown::Hexadecimal},
    {kLocal, DescriptorItem::UsageMaximum, "Usage Maximum", Shown::Hexadecimal},
    {kLocal, DescriptorItem::DesignatorIndex, "Designator Index", Shown::Number},
    {kLocal, DescriptorItem::DesignatorMinimum, "Designator Minimum", Shown::Number},
    {kLocal, DescriptorItem::DesignatorMaximum, "Designator Maximum", Shown::Number},
    {kLocal, DescriptorItem::StringIndex, "String Index", Shown::Number},
    {kLocal, DescriptorItem::StringMinimum, "String Minimum", Shown::Number},
    {kLocal, DescriptorItem::StringMaximum, "String Maximum", Shown::Number},
    {kLocal, DescriptorItem::Delimiter, "Delimiter", Shown::Number},
}};

constexpr std::array<std::string_view, 7> kCollections = {
    "Physical",    "Application",  "Logical",       "Report",
    "Named Array", "Usage Switch", "Usage Modifier"};

std::string hexadecimal(std::uint32_t number, int digits) {
    std::array<char, 16> text{};
    std::snprintf(text.data(), text.size(), "0x%0*X", digits, number);
    return text.data();
}

std::string fieldsText(std::uint32_t flags) {
    constexpr std::uint32_t kConstant = 1U << 0U;
    constexpr std::uint32_t kVariable = 1U << 1U;
    constexpr std::uint32_t kRelative = 1U << 2U;
    std::string text = (flags & kConstant) != 0 ? "Constant" : "Data";
    text += (flags & kVariable) != 0 ? ", Variable" : ", Array";
    if ((flags & kRelative) != 0) text += ", Relative";
    return text;
}

std::string shownText(const DescriptorItem& item, Shown shown) {
    switch (shown) {
        case Shown::Number:
            return std::to_string(item.number());
        case Shown::Signed:
            return std::to_string(item.signedNumber());
        case Shown::Hexadecimal:
            return hexadecimal(item.number(), static_cast<int>(2 * item.data.size()));
        case Shown::Fields:
            return fieldsText(item.number());
        case Shown::Collection:
            return item.number() < kCollections.size() ? std::string(kCollections[item.number()])
                                                       : hexadecimal(item.number(), 2);
        case Shown::Nothing:
            break;
    }
    return {};
}

std::string textOf(const DescriptorItem& item) {
    const auto name = std::ranges::find_if(kNames, [&](const Name& entry) {
        return entry.type == item.type && entry.tag == item.tag;
    });
    if (name == kNames.end()) {
        const bool isLong = item.type == DescriptorItem::Type::Long;
        return std::string(isLong ? "Long item" : "Unknown item") + " (" +
               std::to_string(item.data.size()) + (item.data.size() == 1 ? " byte)" : " bytes)");
    }
    std::string text(name->text);
    if (name->shown != Shown::Nothing) text += " (" + shownText(item, name->shown) + ')';
    return text;
}

}  // namespace

std::vector<DescriptorLine> reportDescriptorLines(std::span<const std::uint8_t> bytes) {
    constexpr std::size_t kDeepest = 16;  // that is indented
    std::vector<DescriptorLine> lines;
    bytes = bytes.first(std::min(bytes.size(), kLongestReportDescriptor));
    std::size_t depth = 0;
    for (std::size_t offset = 0; offset < bytes.size();) {
        const auto item = DescriptorItem::first(bytes.subspan(offset));
        if (!item) {
            lines.push_back({offset, bytes.subspan(offset), "breaks off here"});
            break;
        }
        if (item->is(DescriptorItem::EndCollection) && depth > 0) --depth;
        lines.push_back({offset, bytes.subspan(offset, item->length),
                         std::string(2 * std::min(depth, kDeepest), ' ') + textOf(*item)});
        if (item->is(DescriptorItem::Collection)) ++depth;
        offset += item->length;
    }
    return lines;
}

}  // namespace Vexa
