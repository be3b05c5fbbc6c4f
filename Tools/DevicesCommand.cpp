#include "Tools/DevicesCommand.h"

#include "Host/HostFailure.h"
#include "Host/SurfaceMatch.h"
#include "Host/SurfaceWatch.h"
#include "Platform/JsonWriter.h"
#include "Platform/PropertyValue.h"
#include "Platform/ReportDescriptor.h"
#include "Platform/ReportDescriptorText.h"
#include "Shared/Util.h"
#include "Tools/Daemon/DaemonClient.h"
#include "Tools/Daemon/DaemonCommand.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/TerminalText.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr OptionEntry kWhereOption = {
    .name = "--device",
    .valueName = "DEVICE",
    .help =
        "Look at this machine's devices and ask no daemon: hidraw for all of them, hidraw:NODE "
        "for the device of a node such as /dev/hidraw0",
    .kind = ValueKind::Choice,
    .choices = "hidraw hidraw:"};
constexpr OptionEntry kOwnMatchOption = {
    .name = kMatchOption.name,
    .valueName = kMatchOption.valueName,
    .help =
        "Take devices with these ids (hexadecimal, as in 5658:5454) for surfaces as well, "
        "whatever their reports; asks no daemon, which has ids of its own",
    .repeatable = true};

constexpr std::array<OptionEntry, 5> kOptions = {{
    {.name = "--verbose",
     .help = "All HID devices: their reports, whether and why each is a surface, and the report "
             "descriptor item by item"},
    {.name = "--json", .help = "Print one JSON array with an object for each device"},
    kBusOption,
    kWhereOption,
    kOwnMatchOption,
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "the devices were listed, and be it none"},
    {kExitFailure,
     "the devices cannot be listed, NODE is no HID device, or on the bus that --bus names there is "
     "no daemon or it refuses"},
    {kExitUsage, "the command line is wrong"},
}};

constexpr std::array<ExampleEntry, 4> kExamples = {{
    {"vexatouch devices", "Lists the surfaces that are plugged in"},
    {"vexatouch devices --verbose", "Shows why a device is none, and its report descriptor"},
    {"vexatouch devices --json | jq -r '.[].node'", "Gives the nodes to a script"},
    {"vexatouch devices --device hidraw", "The same without asking the daemon"},
}};

constexpr std::string_view kDescription =
    "Lists the touch surfaces that are plugged in. When a daemon is on the bus and lets the caller "
    "watch they are those that it serves, each with its number and state; otherwise, or with "
    "--device hidraw or --match, they are looked up without being opened. With --verbose the "
    "devices that are no surface, or that "
    "the daemon does not serve, follow.\n"
    "\n"
    "A device is a surface if its report descriptor declares, on a vendor's usage page, input "
    "reports 1 (at least 72 bytes after the id) and 2 (at least 9) and feature reports 4 (2), 31 "
    "(4) and 63 (4), or if --match names it.";

/// What the daemon says of a surface.
struct Served {
    unsigned number = 0;
    std::string state = {};
    std::string reason = {};  ///< of the state
};

struct Listed {
    Host::Surface device;
    bool isSurface = false;
    std::string reason = {};
    std::optional<Served> served = {};
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

void printLine(const Listed& listed, Streams& streams) {
    const Host::Surface& device = listed.device;
    constexpr std::size_t kNodeWidth = 14;
    streams.out << padded(device.node, kNodeWidth) << idsText(device) << "  "
                << forTerminal(device.name);
    if (!device.serial.empty()) {
        streams.out << "  serial " << forTerminal(device.serial);
    }
    if (!device.physicalPath.empty()) {
        streams.out << "  at " << forTerminal(device.physicalPath);
    }
    if (listed.served) {
        streams.out << "  surface " << listed.served->number << ", " << listed.served->state
                    << (listed.served->reason.empty() ? "" : ": ")
                    << forTerminal(listed.served->reason);
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
    printLine(listed, streams);
    streams.out << "  " << (listed.isSurface ? "a surface: " : "no surface: ") << listed.reason
                << '\n';
    if (!listed.device.sysPath.empty()) {
        streams.out << "  " << listed.device.sysPath << '\n';
    }
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
    if (listed.served) {
        writeNumber(writer, "number", listed.served->number);
        writeText(writer, "state", listed.served->state);
        writeText(writer, "state_reason", listed.served->reason);
    }
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
        devices.push_back(
            {.device = std::move(device), .isSurface = isSurface, .reason = std::move(reason)});
    }
    return devices;
}

/// What stands in /sys is read there, all else the daemon tells.
Listed servedDevice(Daemon::DaemonClient& client, const Daemon::DaemonClient::Device& told,
                    std::vector<Listed>& here) {
    const auto text = [&told](std::string_view key) {
        const Vexa::PropertyValue value = told.properties.member(key);
        return std::string(value.asString().value_or(""));
    };
    const auto ids = [&told](std::string_view key) {
        return static_cast<std::uint16_t>(told.properties.member(key).toUnsigned64());
    };
    Listed listed;
    const auto same = std::ranges::find_if(here, [&](const Listed& each) {
        return each.device.node == text("Node") && each.device.vendor == ids("Vendor") &&
               each.device.product == ids("Product");
    });
    if (same != here.end()) {
        listed = std::move(*same);
        here.erase(same);
    } else {
        Host::Surface& device = listed.device;
        device.vendor = ids("Vendor");
        device.product = ids("Product");
        device.bus = static_cast<std::uint32_t>(client.find(told.path, "Bus").toUnsigned64());
        const Vexa::PropertyValue descriptor = client.find(told.path, "ReportDescriptor");
        if (const auto bytes = descriptor.asBytes()) {
            device.reportDescriptor.assign(bytes->begin(), bytes->end());
        }
        listed.isSurface = Host::SurfaceMatch().matches(device);
        listed.reason = Host::SurfaceMatch().reason(device);
    }
    listed.device.node = text("Node");
    listed.device.name = text("Name");
    listed.device.serial = text("Serial");
    listed.device.physicalPath = text("PhysicalPath");
    if (!listed.isSurface) {
        listed.isSurface = true;
        listed.reason = "the daemon serves it";
    }
    listed.served = Served{.number = told.number, .state = text("State"), .reason = text("Reason")};
    return listed;
}

/// Those that the daemon serves, and then all others of this machine.
std::vector<Listed> listWithDaemon(Daemon::DaemonClient& client) {
    std::vector<Listed> here;
    try {
        here = listDevices({});
    } catch (const Host::HostFailure&) {
        // What the daemon tells is worth something without it.
    }
    std::vector<Listed> all;
    for (const auto& told : client.devices()) {
        all.push_back(servedDevice(client, told, here));
    }
    for (Listed& other : here) {
        all.push_back(std::move(other));
    }
    return all;
}

/// The same when the daemon lets the caller watch; else it is done with, which is said, unless the
/// command line asks for it by its bus.
std::vector<Listed> listWithDaemon(std::unique_ptr<Daemon::DaemonClient>& client,
                                   const Arguments& arguments, Streams& streams) {
    try {
        return listWithDaemon(*client);
    } catch (const Daemon::AccessDenied&) {
        if (arguments.given(kBusOption.name)) {
            throw;
        }
        client.reset();
        streams.error << "the daemon lets only users on a seat, root and the group vexatouch "
                         "watch; shown is what is plugged in, without what it serves\n";
        return listDevices({});
    }
}

/// The node that --device names; empty for all.
std::string nodeOption(const Arguments& arguments) {
    if (!arguments.given(kWhereOption.name)) {
        return {};
    }
    const std::string text = arguments.value(kWhereOption.name);
    const DeviceChoice choice = DeviceChoice::parse(text);
    if (choice.kind != DeviceChoice::Kind::Hidraw) {
        throw UsageError("--device " + text +
                         ": what is listed is plugged in; expected hidraw or hidraw:NODE");
    }
    return choice.path;
}

/// Null when there is none to be asked.
std::unique_ptr<Daemon::DaemonClient> findDaemon(const Arguments& arguments) {
    const bool looksItself =
        arguments.given(kWhereOption.name) || arguments.given(kOwnMatchOption.name);
    const std::string bus = arguments.value(kBusOption.name);
    if (arguments.given(kBusOption.name)) {
        if (looksItself) {
            throw UsageError(
                "--bus is for the daemon, which is not asked with --device or --match");
        }
        return std::make_unique<Daemon::DaemonClient>(
            bus, "look at this machine's devices with --device hidraw");
    }
    return looksItself ? nullptr : Daemon::DaemonClient::whereThereIsOne(bus);
}

void sayThatThereIsNone(bool served, std::size_t others, Streams& streams) {
    streams.error << (served ? "the daemon serves no touch surface"
                             : "no touch surface is plugged in")
                  << "; of HID devices there " << (others == 1 ? "is " : "are ") << others
                  << (others > 0 ? " (--verbose shows them)\n" : "\n");
}

int runDevices(const Arguments& arguments, Streams& streams) {
    const bool verbose = arguments.given("--verbose");
    const bool json = arguments.given("--json");
    const std::string node = nodeOption(arguments);
    const Host::SurfaceMatch match = matchOption(arguments);
    auto client = findDaemon(arguments);
    std::vector<Listed> devices =
        client ? listWithDaemon(client, arguments, streams) : listDevices(match);
    if (!node.empty()) {
        std::erase_if(devices, [&](const Listed& listed) { return listed.device.node != node; });
        if (devices.empty()) {
            throw Failure(node + " is no HID device that is plugged in");
        }
    }
    const std::size_t all = devices.size();
    if (!verbose && node.empty()) {
        std::erase_if(devices, [&](const Listed& listed) {
            return client ? !listed.served : !listed.isSurface;
        });
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
            printLine(listed, streams);
        }
    }
    writer.endArray();
    if (json) {
        streams.out << text << '\n';
    } else if (devices.empty()) {
        sayThatThereIsNone(client != nullptr, all, streams);
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
