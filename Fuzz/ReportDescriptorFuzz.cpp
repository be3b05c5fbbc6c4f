// Any bytes are a report descriptor or are not, within bounds, and what is read agrees with itself.

#include "Fuzz/FuzzInput.h"
#include "Host/SurfaceMatch.h"
#include "Platform/ReportDescriptor.h"
#include "Platform/ReportDescriptorText.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <set>
#include <span>
#include <utility>

namespace {

using namespace VexaTouch;
using Fuzz::require;

void checkReports(const Vexa::ReportDescriptor& descriptor, std::size_t size) {
    std::set<std::pair<Vexa::ReportKind, std::uint8_t>> seen;
    std::size_t ranges = 0;
    for (const auto& report : descriptor.reports) {
        require(seen.emplace(report.kind, report.id).second, "a report stands there once");
        require(descriptor.find(report.kind, report.id) == &report, "a report is found");
        require(report.bytes() <= Vexa::kLongestHidReport, "no report is too long");
        require(report.bytes() <= descriptor.longest(report.kind),
                "none is longer than the longest");
        ranges += report.usages.size() + report.collections.size();
        for (const auto& usage : report.usages) require(usage.first <= usage.last, "a range");
    }
    require(ranges <= 2 * size, "what is kept is no more than what was given");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::span bytes(data, size);
    Vexa::ReportDescriptorError error;
    const auto descriptor = Vexa::parseReportDescriptor(bytes, &error);
    if (descriptor) {
        checkReports(*descriptor, size);
    } else {
        require(!error.reason.empty() && error.offset <= size, "why and where");
    }
    std::size_t end = 0;
    for (const auto& line : Vexa::reportDescriptorLines(bytes)) {
        require(line.offset == end && !line.bytes.empty(), "a line for each item");
        end += line.bytes.size();
    }
    require(end == std::min(size, Vexa::kLongestReportDescriptor), "all bytes are shown");

    Host::Surface surface;
    surface.reportDescriptor.assign(bytes.begin(), bytes.end());
    const Host::SurfaceMatch match;
    require(!match.reason(surface).empty(), "a reason for every device");
    require(!match.matches(surface) || descriptor, "a surface has a descriptor");
    return 0;
}
