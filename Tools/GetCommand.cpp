#include "Tools/GetCommand.h"

#include "Platform/Json.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/HostedDevice.h"
#include "Tools/OptionValues.h"

#include <array>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kAllKey = "ServicePluginDebug";

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "KEY",
     .help = "A property: the service's own (Version, Recording, DisjointImageCount, "
             "FirmwareVersion, FactoryResetHoldDuration, CriticalErrors, ServicePluginDebug), a "
             "setting or counter (Pipeline.Algs.EventStats) or one of the device (Product)",
     .required = false,
     .kind = ValueKind::Text,
     .repeatable = true},
}};

constexpr std::array<OptionEntry, 5> kOptions = {{
    {.name = "--all", .help = "All that the service tells for diagnosis"},
    {.name = "--json", .help = "Print one JSON object with a member for each key"},
    kDeviceOption,
    kMatchOption,
    kSeedOption,
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "each key has a value"},
    {kExitFailure, "a key has no value, or the plug-in or the device cannot be used"},
    {kExitUsage, "the command line is wrong"},
}};

constexpr std::array<ExampleEntry, 4> kExamples = {{
    {"vexatouch get Pipeline.Algs.HoldTimeoutMilliseconds", "Prints one value"},
    {"vexatouch get --all", "Prints everything that the service tells"},
    {"vexatouch get Pipeline.Algs.EventStats --device recording:session.json@max",
     "Counts the gestures of a recording"},
    {"vexatouch get Recording --device sim:Examples/taps.gesture > taps.json",
     "Keeps what the service recorded"},
}};

constexpr std::string_view kDescription =
    "Starts the service on a device, asks it for properties and stops it again. With a script or a "
    "recording it asks when everything was played, otherwise at once.\n"
    "\n"
    "A single key's value stands alone, a string as it is: \"Recording\" comes out as the JSON "
    "document that it is. Of several keys each has a line, KEY: VALUE, the values as JSON.";

/// One key and its value, in the order to be printed.
using Properties = std::vector<std::pair<std::string, Vexa::PropertyValue>>;

Vexa::PropertyValue propertyOf(const Host::HostSession& session, const std::string& key) {
    Vexa::PropertyValue value = session.property(key);
    if (!value) {
        throw Failure(key + ": there is no such property, or it has no value");
    }
    return value;
}

Properties readAll(const Host::HostSession& session) {
    const Vexa::PropertyValue all = propertyOf(session, std::string(kAllKey));
    const auto members = all.asDictionary();
    if (!members) {
        throw Failure(std::string(kAllKey) + ": the service answers with no dictionary");
    }
    Properties properties;
    for (const auto& [key, value] : *members) {
        properties.emplace_back(key, value);
    }
    return properties;
}

Properties readKeys(const Host::HostSession& session, const std::vector<std::string>& keys) {
    Properties properties;
    for (const std::string& key : keys) {
        properties.emplace_back(key, propertyOf(session, key));
    }
    return properties;
}

void printJson(const Properties& properties, Streams& streams) {
    std::string text;
    Vexa::JsonWriter writer(text);
    writer.beginObject();
    for (const auto& [key, value] : properties) {
        writer.key(key);
        writer.value(value);
    }
    writer.endObject();
    streams.out << text << '\n';
}

void printAlone(const Vexa::PropertyValue& value, Streams& streams) {
    if (const auto text = value.asString()) {
        streams.out << *text << (text->ends_with('\n') ? "" : "\n");
    } else {
        streams.out << Vexa::writeJson(value, Vexa::JsonWriter::Style::Compact) << '\n';
    }
}

void printLines(const Properties& properties, Streams& streams) {
    for (const auto& [key, value] : properties) {
        streams.out << key << ": " << Vexa::writeJson(value, Vexa::JsonWriter::Style::Compact)
                    << '\n';
    }
}

int runGet(const Arguments& arguments, Streams& streams) {
    const bool all = arguments.given("--all");
    const std::vector<std::string>& keys = arguments.values("KEY");
    if (all != keys.empty()) {
        throw UsageError("get: expected either a KEY or --all");
    }
    const DeviceChoice choice = DeviceChoice::parse(arguments.value("--device"));
    DeviceWishes wishes{.announceSeed = false};
    wishes.seed = numberOption(arguments, "--seed", 0, UINT64_MAX);
    wishes.match = matchOption(arguments, choice);
    HostedDevice hosted(makeDevice(choice, wishes, streams), [](const Vexa::HidEvent&) {});
    hosted.begin();
    if (choice.ends()) {
        hosted.waitUntilPlayed();
    }
    const Properties properties =
        all ? readAll(hosted.session()) : readKeys(hosted.session(), keys);
    hosted.end();
    if (arguments.given("--json")) {
        printJson(properties, streams);
    } else if (!all && properties.size() == 1) {
        printAlone(properties.front().second, streams);
    } else {
        printLines(properties, streams);
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command getCommand = {
    .name = "get",
    .summary = "Read properties of the service",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runGet,
};

}  // namespace VexaTouch::Tools
