#include "Tools/DevicesCommand.h"

#include "Host/SurfaceMatch.h"
#include "Host/SurfaceWatch.h"
#include "Platform/JsonWriter.h"
#include "Platform/ReportDescriptor.h"
#include "Platform/ReportDescriptorText.h"
#include "Shared/Util.h"
#include "Tools/DeviceChoice.h"
#include "Tools/TerminalText.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<OptionEntry, 3> kOptions = {{
    {.name = "--verbose",
     .help = "All HID devices: their reports, whether and why each is a surface, and the report "
             "descriptor item by item"},
    kMatchOption,
    {.name = "--json", .help = "Print one JSON array with an object for each device"},
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "the devices were listed, and be it none"},
    {kExitFailure, "the devices cannot be listed"},
    {kExitUsage, "the command line is wrong"},
}};

constexpr std::array<ExampleEntry, 3> kExamples = {{
    {"vexatouch devices", "Lists the surfaces that are plugged in"},
    {"vexatouch devices --verbose", "Shows why a device is none, and its report descriptor"},
    {"vexatouch devices --json | jq -r '.[].node'", "Gives the nodes to a script"},
}};

constexpr std::string_view kDescription =
    "Lists the touch surfaces that are plugged in, without opening them. A device is one if its "
    "report descriptor declares, on a vendor's usage page, input reports 1 (at least 72 bytes "
    "after "
    "the id) and 2 (at least 9) and feature reports 4 (2), 31 (4) and 63 (4), or if --match names "
    "it.";

struct Listed {
    Host::Surface device;
    bool isSurface = false;
    std::string reason = {};
};

std::string formatted(const char* format, unsigned first, unsigned second = 0) {
    std::array<char, 64> text{};
    std::snprintf(text.data(), text.size(), format, first, second);
    return text.data();
}

std::string_view kindText(Vexa::ReportKind kind) {
    switch (kind) {
        case Vexa::ReportKind::Input:
            return "input";
        case Vexa::ReportKind::Output:
            return "output";
        case Vexa::ReportKind::Feature:
            break;
    }
    return "feature";
}

std::string usageText(const Vexa::UsageRange& usage) {
    std::string text = formatted("%04X:%02X", usage.page, usage.first);
    if (usage.first != usage.last) {
        text += formatted("-%02X", usage.last);
    }
    return text;
}

std::string usagesText(const std::vector<Vexa::UsageRange>& usages) {
    constexpr std::size_t kMost = 8;
    std::string text;
    for (std::size_t i = 0; i < usages.size() && i < kMost; ++i) {
        text += (i == 0 ? "" : " ") + usageText(usages[i]);
    }
    return usages.size() > kMost ? text + " ..." : text;
}

std::string padded(std::string text, std::size_t width) {
    text.resize(std::max(width, text.size()), ' ');
    return text;
}

/// "5658:5454".
std::string idsText(const Host::Surface& device) {
    return formatted("%04x:%04x", device.vendor, device.product);
}

void printLine(const Host::Surface& device, Streams& streams) {
    constexpr std::size_t kNodeWidth = 14;
    streams.out << padded(device.node, kNodeWidth) << idsText(device) << "  "
                << forTerminal(device.name);
    if (!device.serial.empty()) {
        streams.out << "  serial " << forTerminal(device.serial);
    }
    if (!device.physicalPath.empty()) {
        streams.out << "  at " << forTerminal(device.physicalPath);
    }
    streams.out << '\n';
}

void printReports(const Vexa::ReportDescriptor& descriptor, Streams& streams) {
    for (const Vexa::ReportDescriptor::Report& report : descriptor.reports) {
        constexpr std::size_t kKindWidth = 8;
        streams.out << "  " << padded(std::string(kindText(report.kind)), kKindWidth)
                    << formatted("%3u %5u bytes  ", report.id,
                                 static_cast<unsigned>(report.bytes()))
                    << usagesText(report.usages.empty() ? report.collections : report.usages)
                    << '\n';
    }
}

void printItems(std::span<const std::uint8_t> bytes, Streams& streams) {
    constexpr std::size_t kBytesWidth = 18;
    constexpr std::size_t kMostBytes = 6;
    for (const Vexa::DescriptorLine& line : Vexa::reportDescriptorLines(bytes)) {
        std::string hex;
        Util::appendHexString(hex, line.bytes.first(std::min(line.bytes.size(), kMostBytes)));
        streams.out << formatted("  %5u  ", static_cast<unsigned>(line.offset))
                    << padded(std::move(hex), kBytesWidth) << line.text << '\n';
    }
}

void printVerbose(const Listed& listed, Streams& streams) {
    printLine(listed.device, streams);
    streams.out << "  " << (listed.isSurface ? "a surface: " : "no surface: ") << listed.reason
                << "\n  " << listed.device.sysPath << '\n';
    if (const auto descriptor = Vexa::parseReportDescriptor(listed.device.reportDescriptor)) {
        printReports(*descriptor, streams);
    }
    printItems(listed.device.reportDescriptor, streams);
}

void writeText(Vexa::JsonWriter& writer, std::string_view key, std::string_view text) {
    writer.key(key);
    writer.string(text);
}

void writeNumber(Vexa::JsonWriter& writer, std::string_view key, std::uint64_t number) {
    writer.key(key);
    writer.number(number);
}

void writeReports(Vexa::JsonWriter& writer, std::span<const std::uint8_t> bytes) {
    writer.key("reports");
    writer.beginArray();
    if (const auto descriptor = Vexa::parseReportDescriptor(bytes)) {
        for (const Vexa::ReportDescriptor::Report& report : descriptor->reports) {
            writer.beginObject();
            writeText(writer, "kind", kindText(report.kind));
            writeNumber(writer, "id", report.id);
            writeNumber(writer, "bits", report.bits);
            writer.key("vendor");
            writer.boolean(report.isVendors());
            writer.endObject();
        }
    }
    writer.endArray();
}

void writeDevice(Vexa::JsonWriter& writer, const Listed& listed, bool verbose) {
    const Host::Surface& device = listed.device;
    writer.beginObject();
    writeText(writer, "node", device.node);
    writeText(writer, "sys_path", device.sysPath);
    writeNumber(writer, "bus", device.bus);
    writeNumber(writer, "vendor_id", device.vendor);
    writeNumber(writer, "product_id", device.product);
    writeText(writer, "name", device.name);
    writeText(writer, "physical_path", device.physicalPath);
    writeText(writer, "serial_number", device.serial);
    writer.key("surface");
    writer.boolean(listed.isSurface);
    writeText(writer, "reason", listed.reason);
    if (verbose) {
        writeReports(writer, device.reportDescriptor);
        std::string hex;
        Util::appendHexString(hex, device.reportDescriptor);
        writeText(writer, "report_descriptor", hex);
    }
    writer.endObject();
}

std::vector<Listed> listDevices(const Host::SurfaceMatch& match) {
    std::vector<Listed> devices;
    for (Host::Surface& device : Host::findSurfaces(Host::SurfaceMatch::everything())) {
        const bool isSurface = match.matches(device);
        std::string reason = match.reason(device);
        devices.push_back({std::move(device), isSurface, std::move(reason)});
    }
    return devices;
}

int runDevices(const Arguments& arguments, Streams& streams) {
    const bool verbose = arguments.given("--verbose");
    const bool json = arguments.given("--json");
    std::vector<Listed> devices = listDevices(matchOption(arguments));
    const std::size_t all = devices.size();
    if (!verbose) {
        std::erase_if(devices, [](const Listed& listed) { return !listed.isSurface; });
    }
    std::string text;
    Vexa::JsonWriter writer(text);
    writer.beginArray();
    for (const Listed& listed : devices) {
        if (json) {
            writeDevice(writer, listed, verbose);
        } else if (verbose) {
            printVerbose(listed, streams);
        } else {
            printLine(listed.device, streams);
        }
    }
    writer.endArray();
    if (json) {
        streams.out << text << '\n';
    } else if (devices.empty()) {
        streams.error << "no touch surface is plugged in; of HID devices there "
                      << (all == 1 ? "is " : "are ") << all
                      << (all > 0 ? " (--verbose shows them)\n" : "\n");
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command devicesCommand = {
    .name = "devices",
    .summary = "List the touch surfaces that are plugged in",
    .description = kDescription,
    .positionals = {},
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runDevices,
};

}  // namespace VexaTouch::Tools
