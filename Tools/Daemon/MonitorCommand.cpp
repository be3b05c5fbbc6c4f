#include "Tools/Daemon/MonitorCommand.h"

#include "Host/PluginLibrary.h"
#include "Platform/HostClock.h"
#include "Shared/Util.h"
#include "Tools/Daemon/BusNames.h"
#include "Tools/Daemon/DaemonClient.h"
#include "Tools/Daemon/DaemonCommand.h"
#include "Tools/Daemon/EventLoop.h"
#include "Tools/DeliveredEvent.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/LiveRun.h"
#include "Tools/OptionValues.h"
#include "Tools/SignalWatch.h"
#include "Tools/WakeUp.h"

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<OptionEntry, 8> kOptions = {{
    kBusOption,
    Daemon::kSurfaceOption,
    {.name = "--json", .help = "Print each event as one JSON object on a line"},
    {.name = "--duration", .valueName = "TIME", .help = "End after a time: 10, 10s, 500ms, 2min"},
    {.name = "--count", .valueName = "N", .help = "End after so many events"},
    kOwnDeviceOption,
    kMatchOption,
    kSeedOption,
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "ended by a signal, after the time or the number of events"},
    {kExitFailure, "no daemon answers, it does not let the caller watch, or it has ended"},
    {kExitUsage, "the command line is wrong"},
}};

constexpr std::array<ExampleEntry, 2> kExamples = {{
    {"vexatouch monitor", "Prints gestures of every surface as they come"},
    {"vexatouch monitor --json --count 1", "Waits for one gesture"},
}};

constexpr std::string_view kDescription =
    "Prints the gestures of the daemon's surfaces until SIGINT, SIGTERM or SIGHUP, as run does: "
    "the "
    "host time since the start, the latency from the taking up of the report to the host (with "
    "--device from its reading on, as run has it), the kind and the region. When signals were lost "
    "because the bus did not take them, standard error says "
    "how many.\n"
    "\n"
    "With --device it has a service and a device of its own instead and needs no daemon.";

int runOwn(const Arguments& arguments, Streams& streams) {
    LiveRunOptions options;
    options.json = arguments.given("--json");
    options.duration = durationOption(arguments, "--duration");
    options.count = numberOption(arguments, "--count", 1, UINT64_MAX);
    const DeviceChoice choice = DeviceChoice::parse(arguments.value(kOwnDeviceOption.name));
    DeviceWishes wishes;
    wishes.seed = seedOption(arguments, choice);
    wishes.match = matchOption(arguments, choice);
    options.eventRoom = eventRoom(choice, wishes);
    const WakeUp wake;
    SignalWatch signals(wake);
    const auto device = makeDevice(choice, wishes, streams);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    LiveRun(library, device, std::move(options), signals, wake, streams).run();
    return kExitSuccess;
}

/// An event as the daemon's signal tells it. Throws Daemon::BusError for one that is none.
DeliveredEvent eventOf(Daemon::BusMessage& signal) {
    DeliveredEvent event;
    const auto kind = eventKindFromName(signal.readString());
    if (!kind) {
        throw Daemon::BusError(Daemon::ErrorName::kInvalidValue, "a gesture of another kind");
    }
    event.record.kind = *kind;
    event.record.region = signal.readNumber32();
    event.record.phase = signal.readNumber32();
    event.record.mask = signal.readNumber32();
    event.record.frame = signal.readNumber32();
    event.record.timeNs = signal.readNumber64();
    const std::uint64_t host = signal.readNumber64();
    event.latencyNs = host > event.record.timeNs ? host - event.record.timeNs : 0;
    return event;
}

int runMonitor(const Arguments& arguments, Streams& streams) {
    if (arguments.given(kOwnDeviceOption.name)) {
        return runOwn(arguments, streams);
    }
    refuseWithoutOwnDevice(arguments, std::array{kSeedOption, kMatchOption});
    const bool json = arguments.given("--json");
    const auto count = numberOption(arguments, "--count", 1, UINT64_MAX);
    const auto duration = durationOption(arguments, "--duration");
    const std::uint64_t startNs = Util::nanosecondsFromMachTime(Vexa::HostClock::system().now());
    Daemon::EventLoop loop;
    Daemon::DaemonClient client(arguments.value(kBusOption.name));
    std::string rule = std::string("type='signal',sender='") + client.owner() + "',interface='" +
                       Daemon::BusNames::kDevice + '\'';
    const bool isOne = arguments.given(Daemon::kSurfaceOption.name);
    if (isOne) {
        rule += ",path='" + client.choose(arguments) + '\'';
    }
    std::uint64_t events = 0;
    const auto gestures = client.bus().match(rule, [&](Daemon::BusMessage message) {
        if (message.member() == "GesturesLost") {
            streams.error << "vexatouch monitor: " << message.readNumber64()
                          << " event(s) were lost" << std::endl;
        }
        if (message.member() != "Gesture" || (count && events >= *count)) {
            return;
        }
        const DeliveredEvent event = eventOf(message);
        streams.out << (json ? deliveredEventJson(event) + '\n'
                             : deliveredEventLine(event, startNs))
                    << std::flush;
        ++events;
        if ((count && events >= *count) || !streams.out.good()) {
            loop.stop();
        }
    });
    bool lost = false;
    const auto end = [&] {
        lost = true;
        loop.stop();
    };
    const auto owner = client.bus().match(
        std::string("type='signal',sender='org.freedesktop.DBus',interface='org.freedesktop.DBus',"
                    "member='NameOwnerChanged',arg0='") +
            Daemon::BusNames::kService + '\'',
        [&](const Daemon::BusMessage&) { end(); });
    client.bus().attach(loop, end);
    // Tells whether there is a daemon that lets us watch; what it sends is caught already.
    const std::size_t there = client.devices().size();
    const std::size_t surfaces = isOne ? 1 : there;
    // Not before: a bus that does not answer can be left.
    const WakeUp wake;
    SignalWatch signals(wake);
    const auto signalWatch = loop.watch(wake, [&] {
        if (signals.endWanted()) {
            loop.stop();
        }
    });
    streams.error << "watching " << surfaces << (surfaces == 1 ? " surface" : " surfaces")
                  << std::endl;
    if (!json) {
        streams.out << deliveredEventHeading() << std::flush;
    }
    const auto deadline = duration ? loop.after(*duration, [&] { loop.stop(); }) : nullptr;
    loop.run();
    if (lost) {
        throw Failure("the daemon has ended");
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command monitorCommand = {
    .name = "monitor",
    .summary = "Print the gestures of the daemon's surfaces as they come",
    .description = kDescription,
    .positionals = {},
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runMonitor,
};

}  // namespace VexaTouch::Tools
