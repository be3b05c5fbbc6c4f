#include "Tools/Daemon/StatsCommand.h"

#include "Host/PluginLibrary.h"
#include "Platform/Json.h"
#include "Tools/Daemon/DaemonClient.h"
#include "Tools/Daemon/DaemonCommand.h"
#include "Tools/Daemon/OwnStatistics.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/OptionValues.h"
#include "Tools/SignalWatch.h"
#include "Tools/TerminalText.h"
#include "Tools/WakeUp.h"

#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr OptionEntry kDurationOption = {
    .name = "--duration",
    .valueName = "TIME",
    .help =
        "How long to run a device of its own: 10, 10s, 500ms, 2min; without it until "
        "everything was played, or until a signal"};

constexpr std::array<OptionEntry, 7> kOptions = {{
    kBusOption,
    Daemon::kSurfaceOption,
    {.name = "--json", .help = "Print one JSON array with an object for each surface"},
    kOwnDeviceOption,
    kDurationOption,
    kMatchOption,
    kSeedOption,
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "the statistics were printed, or there is no surface"},
    {kExitFailure,
     "no daemon answers or it refuses, it has no surface of the number, or the plug-in or the "
     "device cannot be used"},
    {kExitUsage, "the command line is wrong"},
}};

constexpr std::array<ExampleEntry, 3> kExamples = {{
    {"vexatouch stats", "Shows every surface of the daemon and what it has counted"},
    {"vexatouch stats --json", "The same for a program"},
    {"vexatouch stats --device hidraw --duration 10s",
     "Counts for ten seconds what the surface that is plugged in sends, without a daemon"},
}};

constexpr std::string_view kDescription =
    "Shows the daemon's surfaces: number, node, name and state, and what each has counted since it "
    "was plugged in: reports, images and what of them was invalid, places at which frames are "
    "missing and how many, gestures, and the algorithm's own counters.\n"
    "\n"
    "With --device it needs no daemon: it runs the service on a device of its own until everything "
    "was played, for --duration, or until SIGINT, SIGTERM or SIGHUP, and then shows what that has "
    "counted, as surface 1.";

void printLines(const Daemon::DaemonClient::Device& device, const Vexa::PropertyValue& statistics,
                Streams& streams) {
    const auto text = [&](std::string_view key) {
        const auto value = device.properties.member(key).asString();
        return value ? std::string(*value) : std::string();
    };
    streams.out << "surface " << device.number;
    for (const std::string_view key : {"Node", "Name", "State", "Reason"}) {
        const std::string value = text(key);
        streams.out << (value.empty() ? "" : ", ") << forTerminal(value);
    }
    streams.out << '\n';
    if (const auto members = statistics.asDictionary()) {
        for (const auto& [key, value] : *members) {
            const std::string json = Vexa::writeJson(value, Vexa::JsonWriter::Style::Compact);
            streams.out << "  " << forTerminal(std::string(key) + ": " + json) << '\n';
        }
    }
}

Vexa::PropertyValue jsonEntry(const Daemon::DaemonClient::Device& device,
                              const Vexa::PropertyValue& statistics) {
    Vexa::PropertyValue::Dictionary entry = {{"Surface", std::uint64_t{device.number}},
                                             {"Statistics", statistics}};
    if (const auto members = device.properties.asDictionary()) {
        for (const auto& [key, value] : *members) {
            entry.emplace(key, value);
        }
    }
    return entry;
}

int runOwn(const Arguments& arguments, Streams& streams) {
    const std::string text = arguments.value(kOwnDeviceOption.name);
    const DeviceChoice choice = DeviceChoice::parse(text);
    DeviceWishes wishes;
    wishes.seed = seedOption(arguments, choice);
    wishes.match = matchOption(arguments, choice);
    const auto duration = durationOption(arguments, kDurationOption.name);
    // Signals are set up before there is any other thread, so that none is bothered by them.
    const WakeUp wake;
    const SignalWatch signals(wake);
    const auto device = makeDevice(choice, wishes, streams);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    const Daemon::OwnStatistics own =
        Daemon::gatherStatistics(library, text, device, duration, signals, wake, streams.patience);
    const Daemon::DaemonClient::Device shown{.number = 1, .path = {}, .properties = own.properties};
    if (arguments.given("--json")) {
        const Vexa::PropertyValue::Array all = {jsonEntry(shown, own.statistics)};
        streams.out << Vexa::writeJson(all) << '\n';
    } else {
        printLines(shown, own.statistics, streams);
    }
    return kExitSuccess;
}

int runStats(const Arguments& arguments, Streams& streams) {
    if (arguments.given(kOwnDeviceOption.name)) {
        return runOwn(arguments, streams);
    }
    refuseWithoutOwnDevice(arguments, std::array{kDurationOption, kSeedOption, kMatchOption});
    const auto wanted = numberOption(arguments, Daemon::kSurfaceOption.name, 1, UINT32_MAX);
    Daemon::DaemonClient client(arguments.value(kBusOption.name));
    Vexa::PropertyValue::Array all;
    bool any = false;
    for (const Daemon::DaemonClient::Device& device : client.devices()) {
        if (wanted && *wanted != device.number) {
            continue;
        }
        any = true;
        const Vexa::PropertyValue statistics = client.statistics(device.path);
        if (arguments.given("--json")) {
            all.push_back(jsonEntry(device, statistics));
        } else {
            printLines(device, statistics, streams);
        }
    }
    if (wanted && !any) {
        throw Failure("there is no surface " + std::to_string(*wanted));
    }
    if (arguments.given("--json")) {
        streams.out << Vexa::writeJson(Vexa::PropertyValue(std::move(all))) << '\n';
    }
    if (!any) {
        streams.error << "no surface is plugged in\n";
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command statsCommand = {
    .name = "stats",
    .summary = "Show the daemon's surfaces and what they have counted",
    .description = kDescription,
    .positionals = {},
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runStats,
};

}  // namespace VexaTouch::Tools
