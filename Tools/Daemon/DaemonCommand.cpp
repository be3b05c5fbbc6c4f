#include "Tools/Daemon/DaemonCommand.h"

#include "Host/KeyMap.h"
#include "Host/PluginLibrary.h"
#include "Host/SurfaceMatch.h"
#include "Tools/Daemon/Bus.h"
#include "Tools/Daemon/Daemon.h"
#include "Tools/Daemon/EventLoop.h"
#include "Tools/Daemon/KeyListener.h"
#include "Tools/Daemon/LogLines.h"
#include "Tools/Daemon/PlayedSource.h"
#include "Tools/Daemon/ServiceNotify.h"
#include "Tools/Daemon/Watchdog.h"
#include "Tools/Daemon/WatchedSource.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/KeyOptions.h"
#include "Tools/LogOptions.h"
#include "Tools/SignalWatch.h"
#include "Tools/WakeUp.h"

#include <malloc.h>

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <ostream>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<OptionEntry, 6> kOptions = {{
    kBusOption,
    kMatchOption,
    kKeyOption,
    {.name = "--no-keys", .help = "Send no keys at all"},
    {.name = "--device",
     .valueName = "DEVICE",
     .help = "Serve a made-up surface instead of those that are plugged in: sim, sim:SCRIPT or "
             "recording:FILE, as other commands take it",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = "sim sim: recording:"},
    kLogOption,
}};

constexpr std::array<ExitCodeEntry, 3> kExitCodes = {{
    {kExitSuccess, "a signal asked for the end, and everything was taken down in order"},
    {kExitFailure, "the bus, the plug-in or a device list cannot be used, or the bus has gone"},
    {kExitUsage, "the command line is wrong"},
}};

constexpr std::array<ExampleEntry, 3> kExamples = {{
    {"vexatouch daemon", "Serves every surface that is plugged in on the system bus"},
    {"vexatouch daemon --bus session --device sim --no-keys",
     "Tries it out without a surface and without any right"},
    {"vexatouch daemon --match 5658:5454 --key tap:1=KEY_NEXTSONG",
     "Takes one more device, and another key"},
}};

constexpr std::string_view kDescription =
    "Serves touch surfaces until SIGINT, SIGTERM or SIGHUP. Each surface that is plugged in, now "
    "or "
    "later, gets an instance of the service plug-in of its own and an object on the message bus; "
    "when it is unplugged both are taken down, and when it comes back a new instance takes over "
    "with the settings that were in force. Gestures become media keys of a virtual keyboard, made "
    "through /dev/uinput unless the environment variable VEXATOUCH_UINPUT names another node; "
    "where there is none the daemon says what to do and goes on without.\n"
    "\n"
    "On the bus it is org.vexatouch.Touch1: whoever sits at the machine may watch gestures, states "
    "and settings; to change settings and to see raw touches takes root or the group vexatouch. "
    "vexatouch monitor, get, set, record, stats and devices talk to it.\n"
    "\n"
    "Under systemd it says when it is ready, what it serves, and answers the watchdog as long as "
    "the input thread of every surface answers; anywhere else it just runs. A second signal while "
    "surfaces are being taken down ends it at once, by that signal.";

std::unique_ptr<Daemon::DeviceSource> makeSource(const Arguments& arguments, Streams& streams) {
    const std::vector<std::string>& devices = arguments.values("--device");
    if (devices.empty()) {
        return std::make_unique<Daemon::WatchedSource>(matchOption(arguments));
    }
    if (arguments.given("--match")) {
        throw UsageError("--match is for surfaces that are plugged in, --device for made-up ones");
    }
    auto source = std::make_unique<Daemon::PlayedSource>();
    for (const std::string& text : devices) {
        const DeviceChoice choice = DeviceChoice::parse(text);
        if (choice.kind == DeviceChoice::Kind::Hidraw) {
            throw UsageError("--device " + text +
                             ": surfaces that are plugged in are found without --device");
        }
        source->add(text, makeDevice(choice, {}, streams));
    }
    return source;
}

std::string statusText(const Daemon::Daemon& daemon) {
    const std::size_t surfaces = daemon.surfaces();
    const std::uint64_t framesLost = daemon.framesLost();
    const std::string lost = framesLost > 0 ? ", " + std::to_string(framesLost) +
                                                  (framesLost == 1 ? " frame lost" : " frames lost")
                                            : "";
    return std::to_string(surfaces) + (surfaces == 1 ? " surface, " : " surfaces, ") +
           std::to_string(daemon.reports()) + (daemon.reports() == 1 ? " report" : " reports") +
           lost;
}

/// What a large message took goes back to the system at once. Left alone, the C library keeps more
/// the larger the blocks are that were freed, up to 64 MiB.
void keepNoFreedMemory() {
    constexpr int kBytes = 128 * 1024;
    mallopt(M_MMAP_THRESHOLD, kBytes);
    mallopt(M_TRIM_THRESHOLD, kBytes);
}

int runDaemon(const Arguments& arguments, Streams& streams) {
    keepNoFreedMemory();
    if (arguments.given("--no-keys") && arguments.given(kKeyOption.name)) {
        throw UsageError("--no-keys and --key contradict each other");
    }
    const Host::KeyMap map = parseKeyMap(arguments.values(kKeyOption.name));
    const LogOptions logging(arguments.values(kLogOption.name));
    // Signals are set up before there is any other thread, so that none is bothered by them.
    const WakeUp wake;
    SignalWatch signals(wake);
    // A journal or terminal that is not read holds up neither bus nor plugs nor keys.
    Daemon::LogLines lines(streams.error);
    std::ostream log(&lines);
    Daemon::EventLoop loop;
    const auto source = makeSource(arguments, streams);
    const bool wantsKeys = !arguments.given("--no-keys") && !map.keys().empty();
    const auto keyboard = wantsKeys ? makeKeyboard(map, "daemon", streams) : nullptr;
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    Daemon::Bus bus(arguments.value(kBusOption.name));
    Daemon::DaemonOptions options{.rights = Daemon::RightsPolicy::ofThisSystem(),
                                  .times = {.patience = streams.patience}};
    if (keyboard) {
        options.listener = [&]() -> std::unique_ptr<Daemon::EventListener> {
            return std::make_unique<Daemon::KeyListener>(map, *keyboard);
        };
    }
    Daemon::Daemon daemon(loop, bus, library, *source, std::move(options), log);
    bool ending = false;
    const auto end = [&] {
        if (!std::exchange(ending, true)) {
            Daemon::ServiceNotify::stopping();
            daemon.end([&loop] { loop.stop(); });
        }
    };
    bool lost = false;
    bus.attach(loop, [&] {
        lost = true;
        end();
    });
    const auto signalWatch = loop.watch(wake, [&] {
        if (signals.endWanted()) {
            end();
        }
    });
    const auto tellStatus = [&] { Daemon::ServiceNotify::status(statusText(daemon)); };
    daemon.onChange = tellStatus;
    // Gestures come up to a hundred times a second, and each status goes to everybody on the bus.
    daemon.onGestures = [&, next = std::chrono::steady_clock::time_point()]() mutable {
        if (const auto now = std::chrono::steady_clock::now(); now >= next) {
            next = now + std::chrono::seconds(1);
            tellStatus();
        }
    };
    Daemon::ServiceNotify::ready();
    tellStatus();
    const Daemon::Watchdog watchdog(loop, daemon, tellStatus);
    loop.run();
    if (lost) {
        throw Failure("the connection to the bus was lost");
    }
    return kExitSuccess;
}

}  // namespace

constinit const Command daemonCommand = {
    .name = "daemon",
    .summary = "Serve every surface that is plugged in, on the message bus and as media keys",
    .description = kDescription,
    .positionals = {},
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runDaemon,
};

}  // namespace VexaTouch::Tools
