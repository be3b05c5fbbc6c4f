#include "Tools/RunCommand.h"

#include "Host/PluginLibrary.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/KeyOptions.h"
#include "Tools/LiveRun.h"
#include "Tools/LogOptions.h"
#include "Tools/OptionValues.h"
#include "Tools/OutputFile.h"
#include "Tools/SettingKeys.h"
#include "Tools/SignalWatch.h"
#include "Tools/WakeUp.h"

#include <array>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<OptionEntry, 15> kOptions = {{
    kDeviceOption,
    kMatchOption,
    {.name = "--set",
     .valueName = "KEY=VALUE",
     .help = "Give the service a setting before it is scheduled; the value is JSON. Settings of a "
             "recording or script may change it later",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = kSettingChoices},
    {.name = "--keys",
     .help = "Send the keys of the gestures to the system, through a keyboard that uinput makes; "
             "--key alone does so too. Without either none are sent"},
    kKeyOption,
    {.name = "--json", .help = "Print each event as one JSON object on a line"},
    {.name = "--show",
     .help =
         "Draw the surface and the newest events in place, on a terminal; q ends. Elsewhere the "
         "events are printed as without it"},
    {.name = "--color",
     .valueName = "WHEN",
     .help = "Which colours --show uses: auto, never, 256 or truecolor",
     .defaultValue = "auto",
     .kind = ValueKind::Choice,
     .choices = "auto never 256 truecolor"},
    {.name = "--record",
     .valueName = "FILE",
     .help = "Write the service's recording to a file at the end, and whenever SIGUSR1 arrives",
     .kind = ValueKind::File},
    {.name = "--duration", .valueName = "TIME", .help = "End after a time: 10, 10s, 500ms, 2min"},
    {.name = "--count", .valueName = "N", .help = "End after so many events"},
    kSeedOption,
    kRateOption,
    kEndlessOption,
    kLogOption,
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess,
     "ended in order: everything was played, the time or number was reached, or a signal asked for "
     "it"},
    {kExitFailure,
     "the plug-in or the device cannot be used, the service takes no reports for five seconds, the "
     "device was unplugged, or results could not be written"},
    {kExitUsage, "the command line is wrong, an unknown setting included"},
}};

constexpr std::array<ExampleEntry, 7> kExamples = {{
    {"vexatouch run --show", "Plays random gestures and draws the surface until q or Ctrl-C"},
    {"vexatouch run --device sim:Examples/taps.gesture",
     "Plays a script of gestures in real time and prints what the service makes of it"},
    {"vexatouch run --device hidraw", "Runs the surface that is plugged in"},
    {"vexatouch run --device recording:session.json@max --json",
     "Sends a recording through the service as fast as it goes"},
    {"vexatouch run --set HoldTimeoutMilliseconds=300 --duration 10s --record try.json",
     "Tries a setting and keeps the session"},
    {"vexatouch run --keys --key tap:1=KEY_NEXTSONG --key hold:1=none",
     "Sends media keys, two of them changed"},
    {"vexatouch run --record session.json & sleep 5; kill -USR1 $!",
     "Looks into a run that goes on"},
}};

constexpr std::string_view kDescription =
    "Loads the service plug-in, gives it a device and takes it through its whole life as a host "
    "does: probe, start, schedule, open, events as they are delivered, and all of it back again. "
    "Each event comes with its host time since the start, its latency from the reading of the "
    "report that caused it to the host's callback, its kind and its region. A summary follows on "
    "standard error; frames that are missing, by their numbers, are told of at once as well.\n"
    "\n"
    "The run ends when the device has played everything, after --duration or --count, when nobody "
    "reads the events any more, and at SIGINT, SIGTERM or SIGHUP: in order, with the whole "
    "teardown. A second signal ends it at once.\n"
    "\n"
    "Keys are sent only when asked for. Which gesture sends which, vexatouch keys prints. When the "
    "keyboard cannot be made, the run says what to do and goes on without; it makes it through "
    "/dev/uinput unless the environment variable VEXATOUCH_UINPUT names another node. No key stays "
    "down when the run ends.\n"
    "\n"
    "The plug-in is looked for beside the program and in the library folder of its prefix; the "
    "environment variable VEXATOUCH_PLUGIN names another.";

/// Finds out now, and not after a long run, whether the recording can be written there.
void tryRecordFile(const std::string& path, Streams& streams) {
    std::error_code error;
    if (!std::filesystem::exists(path, error) || std::filesystem::is_regular_file(path, error) ||
        std::filesystem::is_directory(path, error)) {
        const OutputFile abandoned(path, streams);
    }
}

LiveRunOptions parseOptions(const Arguments& arguments, Streams& streams) {
    LiveRunOptions options;
    options.settings = parseSettings(arguments.values("--set"));
    options.json = arguments.given("--json");
    if (options.json && arguments.given("--show")) {
        throw UsageError("--json and --show both want standard output");
    }
    options.show = arguments.given("--show") && streams.outIsTerminal;
    options.depth = colorOption(arguments, "--color", streams);
    options.recordFile = arguments.value("--record");
    if (options.recordFile == "-") {
        throw UsageError("--record -: standard output is for the events");
    }
    if (arguments.given("--record") && options.recordFile.empty()) {
        throw UsageError("--record: names no file");
    }
    options.duration = durationOption(arguments, "--duration");
    options.count = numberOption(arguments, "--count", 1, UINT64_MAX);
    return options;
}

int runRun(const Arguments& arguments, Streams& streams) {
    LiveRunOptions options = parseOptions(arguments, streams);
    options.keyMap = parseKeyMap(arguments.values(kKeyOption.name));
    const DeviceChoice choice = DeviceChoice::parse(arguments.value("--device"));
    const DeviceWishes wishes = deviceWishes(arguments, choice);
    if (!options.recordFile.empty()) {
        tryRecordFile(options.recordFile, streams);
    }
    const LogOptions logging(arguments.values(kLogOption.name));
    // Signals are set up before there is any other thread, so that none is bothered by them.
    const WakeUp wake;
    SignalWatch signals(wake);
    const auto device = makeDevice(choice, wishes, streams);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    std::unique_ptr<Host::SharedKeyboard> keyboard;
    if (arguments.given("--keys") || arguments.given(kKeyOption.name)) {
        keyboard = makeKeyboard(options.keyMap, "run", streams);
        options.keyboard = keyboard.get();
    }
    options.eventRoom = eventRoom(choice, wishes);
    LiveRun(library, device, std::move(options), signals, wake, streams).run();
    return kExitSuccess;
}

}  // namespace

constinit const Command runCommand = {
    .name = "run",
    .summary = "Run the service on a device and print the gesture events as they are delivered",
    .description = kDescription,
    .positionals = {},
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runRun,
};

}  // namespace VexaTouch::Tools
