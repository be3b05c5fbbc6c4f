#include "Tools/Daemon/StatsCommand.h"

#include "Platform/Json.h"
#include "Tools/Daemon/DaemonClient.h"
#include "Tools/Daemon/DaemonCommand.h"
#include "Tools/Failure.h"
#include "Tools/OptionValues.h"

#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<OptionEntry, 3> kOptions = {{
    kBusOption,
    Daemon::kSurfaceOption,
    {.name = "--json", .help = "Print one JSON array with an object for each surface"},
}};

constexpr std::array<ExampleEntry, 2> kExamples = {{
    {"vexatouch stats", "Shows every surface of the daemon and what it has counted"},
    {"vexatouch stats --json", "The same for a program"},
}};

constexpr std::string_view kDescription =
    "Shows the daemon's surfaces: number, node, name and state, and what each has counted since it "
    "was plugged in: reports, images and what of them was invalid, places at which frames are "
    "missing and how many, gestures, and the algorithm's own counters.";

void printLines(const Daemon::DaemonClient::Device& device, const Vexa::PropertyValue& statistics,
                Streams& streams) {
    const auto text = [&](std::string_view key) {
        const auto value = device.properties.member(key).asString();
        return value ? std::string(*value) : std::string();
    };
    streams.out << "surface " << device.number;
    for (const std::string_view key : {"Node", "Name", "State", "Reason"}) {
        const std::string value = text(key);
        streams.out << (value.empty() ? "" : ", ") << value;
    }
    streams.out << '\n';
    if (const auto members = statistics.asDictionary()) {
        for (const auto& [key, value] : *members) {
            streams.out << "  " << key << ": "
                        << Vexa::writeJson(value, Vexa::JsonWriter::Style::Compact) << '\n';
        }
    }
}

int runStats(const Arguments& arguments, Streams& streams) {
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
        if (!arguments.given("--json")) {
            printLines(device, statistics, streams);
            continue;
        }
        Vexa::PropertyValue::Dictionary entry = {{"Surface", std::uint64_t{device.number}},
                                                 {"Statistics", statistics}};
        if (const auto members = device.properties.asDictionary()) {
            for (const auto& [key, value] : *members) {
                entry.emplace(key, value);
            }
        }
        all.emplace_back(entry);
    }
    if (arguments.given("--json")) {
        streams.out << Vexa::writeJson(Vexa::PropertyValue(std::move(all))) << '\n';
    }
    if (wanted && !any) {
        throw Failure("there is no surface " + std::to_string(*wanted));
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
    .exitCodes = usualExitCodes,
    .examples = kExamples,
    .run = runStats,
};

}  // namespace VexaTouch::Tools
