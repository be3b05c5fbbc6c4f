#include "Tools/GetCommand.h"

#include "Platform/Json.h"
#include "Tools/Daemon/DaemonClient.h"
#include "Tools/Daemon/DaemonCommand.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/HostedDevice.h"
#include "Tools/MissingValue.h"
#include "Tools/OptionValues.h"
#include "Tools/SettingKeys.h"

#include <algorithm>
#include <array>
#include <functional>
#include <string>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kAllKey = "ServicePluginDebug";
constexpr std::string_view kRecordingKey = "Recording";

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "KEY",
     .help =
         "A property: the service's own (Version, Recording, DisjointImageCount, "
         "FirmwareVersion, FactoryResetHoldDuration, CriticalErrors, ServicePluginDebug), a "
         "setting or counter (Pipeline.Algs.EventStats, or EventStats alone) or one of the device "
         "(Product)",
     .required = false,
     .kind = ValueKind::Text,
     .repeatable = true},
}};

constexpr std::array<OptionEntry, 7> kOptions = {{
    {.name = "--all", .help = "All that the service tells for diagnosis"},
    {.name = "--json", .help = "Print one JSON object with a member for each key"},
    kBusOption,
    Daemon::kSurfaceOption,
    kOwnDeviceOption,
    kMatchOption,
    kSeedOption,
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "each key has a value"},
    {kExitFailure,
     "a key has no value, no daemon answers or it refuses, or the plug-in or the device cannot be "
     "used"},
    {kExitUsage, "the command line is wrong"},
}};

constexpr std::array<ExampleEntry, 4> kExamples = {{
    {"vexatouch get Pipeline.Algs.HoldTimeoutMilliseconds", "Prints one value"},
    {"vexatouch get --all --device sim", "Prints everything that a service of its own tells"},
    {"vexatouch get Pipeline.Algs.EventStats --device recording:session.json@max",
     "Counts the gestures of a recording"},
    {"vexatouch get Recording --device sim:Examples/taps.gesture > taps.json",
     "Keeps what the service recorded"},
}};

constexpr std::string_view kDescription =
    "Asks the daemon for properties of its surface. What carries raw touches (Recording, "
    "ServicePluginDebug, --all) takes root or the group vexatouch.\n"
    "\n"
    "With --device it needs no daemon: it starts the service on a device of its own, asks it and "
    "stops it again. With a script or a recording it asks when everything was played, otherwise at "
    "once.\n"
    "\n"
    "A single key's value stands alone, a string as it is: \"Recording\" comes out as the JSON "
    "document that it is. Of several keys each has a line, KEY: VALUE, the values as JSON.";

/// One key and its value, in the order to be printed.
using Properties = std::vector<std::pair<std::string, Vexa::PropertyValue>>;
/// Gives the value of a key, or throws Failure.
using Reader = std::function<Vexa::PropertyValue(const std::string& key)>;

Properties readAll(const Reader& read) {
    const Vexa::PropertyValue all = read(std::string(kAllKey));
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

Properties readKeys(const Reader& read, const std::vector<std::string>& keys, bool all) {
    if (all) {
        return readAll(read);
    }
    Properties properties;
    for (const std::string& key : keys) {
        properties.emplace_back(key, read(key));
    }
    return properties;
}

Properties readFromDaemon(const Arguments& arguments, const std::vector<std::string>& keys,
                          bool all) {
    refuseWithoutOwnDevice(arguments, std::array{kSeedOption, kMatchOption});
    Daemon::DaemonClient client(arguments.value(kBusOption.name));
    const std::string path = client.choose(arguments);
    const Reader read = [&](const std::string& key) {
        return key == kRecordingKey ? Vexa::PropertyValue(client.recording(path))
                                    : client.get(path, key);
    };
    return readKeys(read, keys, all);
}

Properties readFromOwnDevice(const Arguments& arguments, const std::vector<std::string>& keys,
                             bool all, Streams& streams) {
    const DeviceChoice choice = DeviceChoice::parse(arguments.value(kOwnDeviceOption.name));
    DeviceWishes wishes{.announceSeed = false};
    wishes.seed = seedOption(arguments, choice);
    wishes.match = matchOption(arguments, choice);
    HostedDevice hosted(
        makeDevice(choice, wishes, streams), [](const Vexa::HidEvent&) {}, streams.patience);
    hosted.begin();
    if (comesToAnEnd(choice, wishes)) {
        hosted.waitUntilPlayed();
    }
    const Reader read = [&](const std::string& key) {
        Vexa::PropertyValue value = hosted.session().property(key);
        if (!value) {
            throw Failure(missingValueText(key));
        }
        return value;
    };
    Properties properties = readKeys(read, keys, all);
    hosted.end();
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
    std::vector<std::string> keys;
    for (const std::string& given : arguments.values("KEY")) {
        const std::string key = hostKey(given);
        // One answer a key, or it would stand twice in a JSON object.
        if (std::ranges::find(keys, key) == keys.end()) {
            keys.push_back(key);
        }
    }
    if (all != keys.empty()) {
        throw UsageError("expected either a KEY or --all");
    }
    const Properties properties = arguments.given(kOwnDeviceOption.name)
                                      ? readFromOwnDevice(arguments, keys, all, streams)
                                      : readFromDaemon(arguments, keys, all);
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
