#include "Tools/Daemon/UdevMatchCommand.h"

#include "Host/SurfaceMatch.h"
#include "Platform/ReportDescriptor.h"
#include "Tools/Failure.h"

#include <array>
#include <cstddef>
#include <fstream>
#include <ios>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "SYSPATH", .help = "The folder of a hidraw device in /sys, as udev's $sys$devpath"},
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "the device is a surface, or it is none"},
    {kExitFailure, "its report descriptor cannot be read"},
    {kExitUsage, "the command line is wrong"},
}};

constexpr std::array<ExampleEntry, 1> kExamples = {{
    {"vexatouch udevmatch /sys/class/hidraw/hidraw0", "Prints ID_VEXATOUCH=1 for a surface"},
}};

constexpr std::string_view kDescription =
    "For udev's rules: prints ID_VEXATOUCH=1 when the report descriptor of the device is a "
    "surface's (vexatouch devices says which are), and nothing when it is not. The device is not "
    "opened.";

int runUdevMatch(const Arguments& arguments, Streams& streams) {
    const std::string path = arguments.value("SYSPATH") + "/device/report_descriptor";
    std::ifstream file(path, std::ios::binary);
    // One byte more than the kernel takes, so that a file that is none of the kernel's is told.
    std::string bytes(Vexa::kLongestReportDescriptor + 1, '\0');
    file.read(bytes.data(), static_cast<std::streamsize>(bytes.size()));
    bytes.resize(static_cast<std::size_t>(file.gcount()));
    if (bytes.empty()) {
        throw Failure(path + ": cannot be read");
    }
    Host::Surface surface;
    surface.reportDescriptor.assign(bytes.begin(), bytes.end());
    if (Host::SurfaceMatch().matches(surface)) {
        streams.out << "ID_VEXATOUCH=1\n";
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command udevMatchCommand = {
    .name = "udevmatch",
    .summary = "Tell udev whether a device is a touch surface",
    .description = kDescription,
    .positionals = kPositionals,
    .options = {},
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runUdevMatch,
};

}  // namespace VexaTouch::Tools
