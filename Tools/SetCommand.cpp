#include "Tools/SetCommand.h"

#include "Platform/Json.h"
#include "Tools/Daemon/DaemonClient.h"
#include "Tools/Daemon/DaemonCommand.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/HostedDevice.h"
#include "Tools/OptionValues.h"
#include "Tools/SettingKeys.h"

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 2> kPositionals = {{
    {.name = "KEY",
     .help = "A setting (Pipeline.Algs.HoldTimeoutMilliseconds, or HoldTimeoutMilliseconds alone) "
             "or a property of the device",
     .kind = ValueKind::Text},
    {.name = "VALUE",
     .help = "The value as JSON: 300, true, [1, 2]; a string with its quotes, '\"grey\"'",
     .kind = ValueKind::Text},
}};

constexpr std::array<OptionEntry, 6> kOptions = {{
    {.name = "--json", .help = "Print a JSON object with the key and its value"},
    kBusOption,
    Daemon::kSurfaceOption,
    kOwnDeviceOption,
    kMatchOption,
    kSeedOption,
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "the value was taken"},
    {kExitFailure,
     "nothing knows the key, the value was not taken, no daemon answers or it refuses, or the "
     "plug-in or the device cannot be used"},
    {kExitUsage, "the command line is wrong, or the value is no JSON"},
}};

constexpr std::array<ExampleEntry, 2> kExamples = {{
    {"vexatouch set Pipeline.Algs.HoldTimeoutMilliseconds 300", "Tries a setting"},
    {"vexatouch set Product '\"My surface\"' --device sim", "Writes a property of the device"},
}};

constexpr std::string_view kDescription =
    "Writes a property of the daemon's surface and prints what the property is then. It takes root "
    "or the group vexatouch. A setting stays until the daemon ends, also when the surface is "
    "unplugged and comes back.\n"
    "\n"
    "With --device it needs no daemon: it starts the service on a device of its own, writes the "
    "property and stops the service again; the value is gone with it. The device then takes any "
    "key, while the daemon takes only keys that exist.\n"
    "\n"
    "What is not in the domain \"Pipeline\" goes to the device, the service's own keys included: "
    "writing them changes nothing in the service. A property that can be written but not read, "
    "such "
    "as Pipeline.Algs.ResetEventStats, prints nothing.";

/// The service takes whatever is written in the pipeline's domain and ignores what it does not
/// know.
void checkKey(const std::string& key, const std::string& value) {
    constexpr std::string_view kPipeline = "Pipeline.";
    constexpr std::string_view kAlgorithm = "Pipeline.Algs.";
    if (!key.starts_with(kPipeline)) {
        return;
    }
    if (!key.starts_with(kAlgorithm)) {
        throw Failure(key + ": nothing knows the key; settings begin with " +
                      std::string(kAlgorithm));
    }
    try {
        parseSetting(key + '=' + value, "set");
    } catch (const UsageError& error) {
        throw Failure(error.what());
    }
}

Vexa::PropertyValue setAtDaemon(const Arguments& arguments, const std::string& key,
                                const Vexa::PropertyValue& value) {
    refuseWithoutOwnDevice(arguments, std::array{kSeedOption, kMatchOption});
    Daemon::DaemonClient client(arguments.value(kBusOption.name));
    return client.set(client.choose(arguments), key, value);
}

Vexa::PropertyValue setAtOwnDevice(const Arguments& arguments, const std::string& key,
                                   const Vexa::PropertyValue& value, Streams& streams) {
    const DeviceChoice choice = DeviceChoice::parse(arguments.value(kOwnDeviceOption.name));
    DeviceWishes wishes{.announceSeed = false};
    wishes.seed = seedOption(arguments, choice);
    wishes.match = matchOption(arguments, choice);
    HostedDevice hosted(
        makeDevice(choice, wishes, streams), [](const Vexa::HidEvent&) {}, streams.patience);
    hosted.begin();
    const bool isNew = !hosted.session().property(key);
    if (!hosted.session().setProperty(key, value)) {
        throw Failure(key + ": the device did not take the value");
    }
    Vexa::PropertyValue now = hosted.session().property(key);
    hosted.end();
    if (isNew && now) {
        streams.error
            << "vexatouch set: " << key
            << " is no setting and was no property: the device keeps it, as it does any\n";
    }
    return now;
}

int runSet(const Arguments& arguments, Streams& streams) {
    const std::string key = hostKey(arguments.value("KEY"));
    const std::string text = arguments.value("VALUE");
    const Vexa::PropertyValue value = Vexa::readJson(text);
    if (!value) {
        throw UsageError(key + ": the value is no JSON: " + text +
                         " (a string needs its quotes: '\"" + text + "\"')");
    }
    checkKey(key, text);
    const Vexa::PropertyValue now = arguments.given(kOwnDeviceOption.name)
                                        ? setAtOwnDevice(arguments, key, value, streams)
                                        : setAtDaemon(arguments, key, value);
    if (arguments.given("--json")) {
        streams.out << Vexa::writeJson(Vexa::PropertyValue::Dictionary{{key, now}}) << '\n';
    } else if (now) {
        streams.out << key << ": " << Vexa::writeJson(now, Vexa::JsonWriter::Style::Compact)
                    << '\n';
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command setCommand = {
    .name = "set",
    .summary = "Write a property of the service and show what it is then",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runSet,
};

}  // namespace VexaTouch::Tools
