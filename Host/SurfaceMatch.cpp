#include "Host/SurfaceMatch.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cstdio>
#include <optional>
#include <stdexcept>

namespace VexaTouch::Host {
namespace {

std::optional<std::uint16_t> idFromText(std::string_view text) {
    constexpr std::size_t kMostDigits = 4;
    constexpr int kHexadecimal = 16;
    std::uint16_t value = 0;
    const char* const end = text.data() + text.size();
    const auto [read, error] = std::from_chars(text.data(), end, value, kHexadecimal);
    if (text.size() > kMostDigits || error != std::errc{} || read != end) return std::nullopt;
    return value;
}

std::string idsText(std::uint16_t vendor, std::uint16_t product) {
    std::array<char, 16> text{};
    std::snprintf(text.data(), text.size(), "%04x:%04x", vendor, product);
    return text.data();
}

std::string counted(std::size_t count, std::string_view what) {
    return std::to_string(count) + ' ' + std::string(what) + (count == 1 ? "" : "s");
}

/// What a surface's report lacks in a device; empty when nothing.
std::string lackOf(const SurfaceMatch::Report& wanted, const Vexa::ReportDescriptor& descriptor) {
    const std::string name =
        (wanted.kind == Vexa::ReportKind::Input ? "input report " : "feature report ") +
        std::to_string(wanted.id);
    const Vexa::ReportDescriptor::Report* const report = descriptor.find(wanted.kind, wanted.id);
    if (!report) return "no " + name;
    if (report->bytes() < wanted.bytes) {
        return name + " has " + counted(report->bytes(), "byte") + " after its id, not " +
               std::to_string(wanted.bytes);
    }
    return report->isVendors() ? std::string() : name + " is on no vendor's usage page";
}

/// All that keeps a device from being a surface by its descriptor; empty when nothing does.
std::string lacksOf(const Surface& surface) {
    if (surface.reportDescriptor.empty()) return "its report descriptor cannot be read";
    Vexa::ReportDescriptorError error;
    const auto descriptor = Vexa::parseReportDescriptor(surface.reportDescriptor, &error);
    if (!descriptor) {
        return "its report descriptor is wrong at byte " + std::to_string(error.offset) + ": " +
               std::string(error.reason);
    }
    std::string lacks;
    for (const SurfaceMatch::Report& wanted : SurfaceMatch::kReports) {
        const std::string lack = lackOf(wanted, *descriptor);
        if (!lack.empty()) lacks += (lacks.empty() ? "" : "; ") + lack;
    }
    return lacks;
}

}  // namespace

SurfaceMatch::Ids SurfaceMatch::Ids::fromText(std::string_view text) {
    const std::size_t colon = text.find(':');
    if (colon != std::string_view::npos) {
        const auto vendor = idFromText(text.substr(0, colon));
        const auto product = idFromText(text.substr(colon + 1));
        if (vendor && product) return {.vendor = *vendor, .product = *product};
    }
    throw std::invalid_argument(
        "expected a vendor and a product id, VENDOR:PRODUCT in hexadecimal such as 5658:5454, "
        "found \"" +
        std::string(text) + '"');
}

SurfaceMatch SurfaceMatch::everything() {
    SurfaceMatch match;
    match.everything_ = true;
    return match;
}

bool SurfaceMatch::isNamed(const Surface& surface) const {
    return std::ranges::find(named_, Ids{surface.vendor, surface.product}) != named_.end();
}

bool SurfaceMatch::matches(const Surface& surface) const {
    return everything_ || isNamed(surface) || lacksOf(surface).empty();
}

std::string SurfaceMatch::reason(const Surface& surface) const {
    if (isNamed(surface)) return "named " + idsText(surface.vendor, surface.product);
    const std::string lacks = lacksOf(surface);
    if (lacks.empty()) return "its reports are a surface's";
    return everything_ ? "every device is wanted" : lacks;
}

}  // namespace VexaTouch::Host
