#include "Tools/Daemon/DaemonCommand.h"

#include "Host/HostFailure.h"
#include "Host/KeyMap.h"
#include "Host/MediaKeys.h"
#include "Host/PluginLibrary.h"
#include "Host/SharedKeyboard.h"
#include "Host/SurfaceMatch.h"
#include "Host/VirtualKeyboard.h"
#include "Tools/Daemon/Bus.h"
#include "Tools/Daemon/Daemon.h"
#include "Tools/Daemon/EventLoop.h"
#include "Tools/Daemon/PlayedSource.h"
#include "Tools/Daemon/ServiceNotify.h"
#include "Tools/Daemon/WatchedSource.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/LogOptions.h"

#include <array>
#include <csignal>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<OptionEntry, 6> kOptions = {{
    kBusOption,
    {.name = "--match",
     .valueName = "VENDOR:PRODUCT",
     .help = "Take a device with these ids too, whatever its report descriptor says; hexadecimal",
     .repeatable = true},
    {.name = "--key",
     .valueName = "GESTURE:REGION=KEY",
     .help = "Send another key for a gesture: tap:1=KEY_NEXTSONG, or none for no key",
     .repeatable = true,
     .kind = ValueKind::Choice,
     .choices = "tap:1= tap:2= tap:3= hold:1= hold:2= hold:3="},
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
    "with the settings that were in force. Gestures become media keys of a virtual keyboard.\n"
    "\n"
    "On the bus it is org.vexatouch.Touch1: whoever sits at the machine may watch gestures, states "
    "and settings; to change settings and to see raw touches takes root or the group vexatouch. "
    "vexatouch monitor, get, set, record and stats talk to it.\n"
    "\n"
    "Under systemd it says when it is ready, what it serves, and answers the watchdog as long as "
    "the input thread of every surface answers; anywhere else it just runs.";

class KeyListener final : public Daemon::EventListener {
public:
    KeyListener(const Host::KeyMap& map, Host::SharedKeyboard& keyboard) noexcept
        : keys_(map, keyboard) {}

    void handle(const Vexa::HidEvent& event) noexcept override { keys_.handle(event); }
    void surfaceGone() noexcept override { keys_.releaseAll(); }

private:
    Host::MediaKeys keys_;
};

Host::KeyMap parseKeys(const Arguments& arguments) {
    if (arguments.given("--no-keys") && arguments.given("--key")) {
        throw UsageError("--no-keys and --key contradict each other");
    }
    Host::KeyMap map;
    for (const std::string& text : arguments.values("--key")) {
        try {
            map.assign(text);
        } catch (const std::invalid_argument& error) {
            throw UsageError("--key " + text + ": " + error.what());
        }
    }
    return map;
}

/// None, with the reason on the error stream, where there is no keyboard to be had.
std::unique_ptr<Host::SharedKeyboard> makeKeyboard(const Arguments& arguments,
                                                   const Host::KeyMap& map, Streams& streams) {
    const std::vector<Host::KeyCode> keys = map.keys();
    if (arguments.given("--no-keys") || keys.empty()) {
        return nullptr;
    }
    try {
        return std::make_unique<Host::SharedKeyboard>(
            std::make_unique<Host::VirtualKeyboard>(keys));
    } catch (const Host::HostFailure& error) {
        streams.error << "vexatouch daemon: going on without keys: " << error.what() << std::endl;
        return nullptr;
    }
}

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
    return std::to_string(surfaces) + (surfaces == 1 ? " surface, " : " surfaces, ") +
           std::to_string(daemon.reports()) + " frames";
}

int runDaemon(const Arguments& arguments, Streams& streams) {
    const Host::KeyMap map = parseKeys(arguments);
    const LogOptions logging(arguments.values(kLogOption.name));
    Daemon::EventLoop loop;
    Daemon::Daemon* running = nullptr;
    const auto end = [&] {
        Daemon::ServiceNotify::stopping();
        running->end([&loop] { loop.stop(); });
    };
    // Signals are blocked before there is any other thread.
    bool ending = false;
    const std::array signals = {SIGINT, SIGTERM, SIGHUP};
    const auto signalWatch = loop.watchSignals(signals, [&](int) {
        if (std::exchange(ending, true)) {
            throw Failure("ended by a second signal while surfaces were being taken down");
        }
        end();
    });
    const auto source = makeSource(arguments, streams);
    const auto keyboard = makeKeyboard(arguments, map, streams);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    Daemon::Bus bus(arguments.value(kBusOption.name));
    bool lost = false;
    bus.attach(loop, [&] {
        lost = true;
        if (!std::exchange(ending, true)) {
            end();
        }
    });
    Daemon::DaemonOptions options{.rights = Daemon::RightsPolicy::ofThisSystem()};
    if (keyboard) {
        options.listener = [&]() -> std::unique_ptr<Daemon::EventListener> {
            return std::make_unique<KeyListener>(map, *keyboard);
        };
    }
    Daemon::Daemon daemon(loop, bus, library, *source, std::move(options), streams.error);
    running = &daemon;
    const auto tellStatus = [&] {
        Daemon::ServiceNotify::status(statusText(daemon));
        if (const auto failure = keyboard ? keyboard->takeFailure() : std::nullopt) {
            streams.error << "vexatouch daemon: going on without keys: " << *failure << std::endl;
        }
    };
    daemon.onChange = tellStatus;
    Daemon::ServiceNotify::ready();
    tellStatus();
    Daemon::EventLoop::WatchHandle watchdog;
    bool asked = false;
    if (const auto interval = Daemon::ServiceNotify::watchdog()) {
        watchdog = loop.every(*interval / 2, [&] {
            // Whoever has not answered the last time is not asked again, and the manager not told.
            if (std::exchange(asked, true)) {
                return;
            }
            daemon.ping([&] {
                asked = false;
                Daemon::ServiceNotify::alive();
                tellStatus();
            });
        });
    }
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
