#include "Tools/RecordCommand.h"

#include "Host/PluginLibrary.h"
#include "Tools/Daemon/DaemonClient.h"
#include "Tools/Daemon/DaemonCommand.h"
#include "Tools/Daemon/StreamedRecord.h"
#include "Tools/DeviceChoice.h"
#include "Tools/Failure.h"
#include "Tools/LogOptions.h"
#include "Tools/OptionValues.h"
#include "Tools/RecordRun.h"
#include "Tools/RecordingStream.h"
#include "Tools/SettingKeys.h"
#include "Tools/SignalWatch.h"
#include "Tools/WakeUp.h"

#include <array>
#include <csignal>
#include <cstdint>
#include <ctime>
#include <string>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<PositionalEntry, 1> kPositionals = {{
    {.name = "FILE", .help = "Where the recording goes; - writes to standard output"},
}};

constexpr OptionEntry kSetOption = {
    .name = "--set",
    .valueName = "KEY=VALUE",
    .help = "Give the service a setting before it is scheduled; the value is JSON",
    .repeatable = true,
    .kind = ValueKind::Choice,
    .choices = kSettingChoices};

constexpr std::array<OptionEntry, 13> kOptions = {{
    kBusOption,
    Daemon::kSurfaceOption,
    kOwnDeviceOption,
    kMatchOption,
    kSetOption,
    {.name = "--duration", .valueName = "TIME", .help = "End after a time: 10, 10s, 500ms, 2min"},
    {.name = "--count", .valueName = "N", .help = "End after so many input reports"},
    {.name = "--force", .help = "Replace FILE if it is there already and not empty"},
    {.name = "--sync",
     .valueName = "TIME",
     .help = "See to it so often that what was written survives the machine's end as well; without "
             "it the system does within half a minute, and at the end of the recording"},
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
     "the plug-in or the device cannot be used, the device was unplugged, the file could not be "
     "written on, or inputs were lost because it was not written quickly enough; what was written "
     "is kept and can be read if there is a report among it"},
    {kExitUsage, "the command line is wrong, an unknown setting included"},
}};

constexpr std::array<ExampleEntry, 4> kExamples = {{
    {"vexatouch record session.json", "Records the daemon's surface until Ctrl-C"},
    {"vexatouch record night.json --duration 8h --sync 1s",
     "Records for long, and loses at most a second when the power fails"},
    {"vexatouch record slow.json --device sim --set HoldTimeoutMilliseconds=900 --count 5000",
     "Records five thousand reports with a setting"},
    {"vexatouch record - --device sim:Examples/taps.gesture | vexatouch replay -",
     "Records a script and replays it"},
}};

constexpr std::string_view kDescription =
    "Writes every input that the daemon's surface takes into FILE while it goes on, which takes "
    "root "
    "or the group vexatouch; with --device it needs no daemon and runs the service on a device of "
    "its own. The file holds "
    "first a state frame for every setting in force, then the reports and changes of settings in "
    "the order in which the service took them, without a bound and in constant memory. Replaying "
    "the file gives the events that the service gave.\n"
    "\n"
    "The file is a whole recording after every frame: it can be copied, shown and replayed while "
    "it grows, and it is whole when the program is killed. When the disk is full it ends with the "
    "last frame that had room. Only where the machine stopped in the middle of a write, or FILE is "
    "a pipe, does convert --recover have to restore it.\n"
    "\n"
    "The service never waits for the disk. A real surface goes on too while a disk does not answer "
    "for long; what finds no room until then is lost, which a state frame Recording.LostReports "
    "with their number says at its place, and standard error and the exit status say at the end.\n"
    "\n"
    "The recording ends when the device has played everything, after --duration or --count, and at "
    "SIGINT, SIGTERM or SIGHUP: in order, with the whole teardown. A second signal ends it at "
    "once.";

RecordRunOptions parseOptions(const Arguments& arguments) {
    RecordRunOptions options;
    options.settings = parseSettings(arguments.values("--set"));
    options.duration = durationOption(arguments, "--duration");
    options.count = numberOption(arguments, "--count", 1, UINT64_MAX);
    return options;
}

std::string counted(std::uint64_t count, std::string_view what) {
    return std::to_string(count) + ' ' + std::string(what) + (count == 1 ? "" : "s");
}

/// The exit status. What a file holds that could not be written on, its failure says.
int printSummary(const RecordingStream& stream, const RecordSummary& summary, Streams& streams) {
    if (stream.isFinished()) {
        streams.error << stream.name() << ": " << counted(summary.reports, "report") << " and "
                      << counted(summary.settings, "setting") << ", " << stream.bytes()
                      << " bytes\n";
    }
    const FrameGap& lost = summary.lost;
    if (lost == FrameGap{}) {
        return kExitSuccess;
    }
    streams.error << "vexatouch record: " << stream.name() << ": "
                  << counted(lost.reports, "report") << " and " << counted(lost.settings, "setting")
                  << " were lost, because the file was not written quickly enough"
                  << (stream.isKept()
                          ? "; the rest is kept, and Recording.LostReports stands in it where "
                            "they are missing\n"
                          : "\n");
    return kExitFailure;
}

/// Keeps SIGUSR1 until there is somebody to answer it. One thread.
class UserSignalKept {
public:
    UserSignalKept() noexcept {
        sigemptyset(&set_);
        sigaddset(&set_, SIGUSR1);
        pthread_sigmask(SIG_BLOCK, &set_, &previous_);
    }
    ~UserSignalKept() {
        // Nobody is going to.
        constexpr timespec kAtOnce{};
        while (sigtimedwait(&set_, nullptr, &kAtOnce) > 0) {
        }
        pthread_sigmask(SIG_SETMASK, &previous_, nullptr);
    }
    UserSignalKept(const UserSignalKept&) = delete;
    UserSignalKept(UserSignalKept&&) = delete;
    UserSignalKept& operator=(const UserSignalKept&) = delete;
    UserSignalKept& operator=(UserSignalKept&&) = delete;

private:
    sigset_t set_{};
    sigset_t previous_{};
};

int recordFromDaemon(const Arguments& arguments, Streams& streams) {
    refuseWithoutOwnDevice(
        arguments, std::array{kSetOption, kSeedOption, kRateOption, kEndlessOption, kMatchOption});
    const Daemon::StreamedRecordOptions options{
        .duration = durationOption(arguments, "--duration"),
        .count = numberOption(arguments, "--count", 1, UINT64_MAX)};
    const auto syncEvery = durationOption(arguments, "--sync");
    const std::string file = arguments.value("FILE");
    const UserSignalKept userSignal;
    Daemon::DaemonClient client(arguments.value(kBusOption.name));
    const FileDescriptor frames = client.recordStream(client.choose(arguments));
    // Not before: a bus that does not answer can be left. But before there is a file.
    const WakeUp wake;
    SignalWatch signals(wake);
    RecordingStream stream(openAppendTarget(file, arguments.given("--force"), streams),
                           file == "-" ? "standard output" : file, syncEvery);
    RecordSummary summary;
    try {
        Daemon::recordStreamed(frames, options, stream, summary, signals, wake, streams);
    } catch (...) {
        printSummary(stream, summary, streams);
        throw;
    }
    return printSummary(stream, summary, streams);
}

int runRecord(const Arguments& arguments, Streams& streams) {
    if (!arguments.given(kOwnDeviceOption.name)) {
        return recordFromDaemon(arguments, streams);
    }
    RecordRunOptions options = parseOptions(arguments);
    const auto syncEvery = durationOption(arguments, "--sync");
    const std::string file = arguments.value("FILE");
    const DeviceChoice choice = DeviceChoice::parse(arguments.value(kOwnDeviceOption.name));
    const DeviceWishes wishes = deviceWishes(arguments, choice);
    options.holdBack = choice.kind != DeviceChoice::Kind::Hidraw;
    const LogOptions logging(arguments.values(kLogOption.name));
    // Signals are set up before there is any other thread, so that none is bothered by them.
    const WakeUp wake;
    SignalWatch signals(wake);
    const auto device = makeDevice(choice, wishes, streams);
    const Host::PluginLibrary library = Host::PluginLibrary::loadDefault();
    RecordRun run(
        library, device, std::move(options), [](const Vexa::HidEvent&) {}, signals, wake, streams);
    // Last, so that nothing that fails before leaves a file or replaces one.
    RecordingStream stream(openAppendTarget(file, arguments.given("--force"), streams),
                           file == "-" ? "standard output" : file, syncEvery);
    try {
        run.run(stream);
    } catch (...) {
        printSummary(stream, run.summary(), streams);
        throw;
    }
    return printSummary(stream, run.summary(), streams);
}

}  // namespace

constinit const Command recordCommand = {
    .name = "record",
    .summary = "Record every input of a device into a file, without a bound",
    .description = kDescription,
    .positionals = kPositionals,
    .options = kOptions,
    .exitCodes = kExitCodes,
    .examples = kExamples,
    .run = runRecord,
};

}  // namespace VexaTouch::Tools
