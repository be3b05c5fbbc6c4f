#pragma once

#include "Host/SurfaceMatch.h"
#include "Tools/CommandTable.h"
#include "Tools/ObservedDevice.h"
#include "Tools/PlayedDevice.h"
#include "Tools/Streams.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// A device as it is named on the command line: "sim", "sim:SCRIPT", "recording:FILE",
/// "recording:FILE@2", "recording:FILE@max", "hidraw" or "hidraw:NODE". SCRIPT and FILE may be "-",
/// standard input.
///
/// What stands behind the last @ is a speed if it is "max" or reads as a number, otherwise it
/// belongs to the file's name: for a file named "a@2" write "a@2@1".
struct DeviceChoice {
    enum class Kind : std::uint8_t { Simulated, Recording, Hidraw };

    Kind kind = Kind::Simulated;
    /// Of the script, recording or node; empty: random gestures, or the first surface there is.
    std::string path;
    double speed = 1.0;  ///< of a recording; infinity for "max"

    /// Throws UsageError, which names `option`.
    static DeviceChoice parse(std::string_view text, std::string_view option = "--device");

    friend bool operator==(const DeviceChoice&, const DeviceChoice&) = default;
};

/// What a subcommand asks of the device beyond the choice.
struct DeviceWishes {
    /// Of the simulated surface, see SimulatedPlay.
    std::optional<std::uint64_t> seed = {};
    std::optional<double> rate = {};
    bool endless = false;
    /// Writes "simulated surface: random gestures, seed N" to the error stream, so that the session
    /// can be played again.
    bool announceSeed = true;
    /// Which devices are surfaces, for a hidraw device that is not named by its node.
    Host::SurfaceMatch match = {};
};

/// Whether the device plays something that comes to an end.
[[nodiscard]] bool comesToAnEnd(const DeviceChoice& choice, const DeviceWishes& wishes) noexcept;
/// How many events may wait for a slow reader. A device that comes to an end has so many and no
/// more, and none may be missing in the end; one that does not must not fill the memory.
[[nodiscard]] std::size_t eventRoom(const DeviceChoice& choice,
                                    const DeviceWishes& wishes) noexcept;

/// Help of the option --device for the command table.
inline constexpr std::string_view kDeviceHelp =
    "The device: sim plays random gestures, sim:SCRIPT those of a script, recording:FILE the "
    "reports of a recording at their recorded times; recording:FILE@2 plays twice as fast, "
    "recording:FILE@max as fast as the reports are taken; hidraw is the first surface that is "
    "plugged in, hidraw:NODE the device of a node such as /dev/hidraw0";

/// Options of subcommands that have a device.
inline constexpr OptionEntry kDeviceOption = {.name = "--device",
                                              .valueName = "DEVICE",
                                              .help = kDeviceHelp,
                                              .defaultValue = "sim",
                                              .kind = ValueKind::Choice,
                                              .choices = "sim sim: recording: hidraw hidraw:"};
/// The same for those that talk to the daemon unless they have a device of their own.
inline constexpr OptionEntry kOwnDeviceOption = {
    .name = "--device",
    .valueName = "DEVICE",
    .help =
        "Use a device of its own instead of the daemon's: sim plays random gestures, "
        "sim:SCRIPT those of a script, recording:FILE the reports of a recording at their "
        "recorded times; recording:FILE@2 plays twice as fast, recording:FILE@max as fast as "
        "the reports are taken; hidraw is the first surface that is plugged in, hidraw:NODE the "
        "device of that node",
    .kind = ValueKind::Choice,
    .choices = "sim sim: recording: hidraw hidraw:"};
inline constexpr OptionEntry kMatchOption = {
    .name = "--match",
    .valueName = "VENDOR:PRODUCT",
    .help =
        "Take devices with these ids (hexadecimal, as in 5658:5454) for surfaces as well, "
        "whatever their reports",
    .repeatable = true};
inline constexpr OptionEntry kSeedOption = {
    .name = "--seed", .valueName = "N", .help = "Seed of the simulated surface's random numbers"};

inline constexpr OptionEntry kRateOption = {
    .name = "--rate",
    .valueName = "HZ",
    .help = "Reports a second that the simulated surface sends"};
inline constexpr OptionEntry kEndlessOption = {.name = "--endless",
                                               .help = "Begin a script anew when it is over"};

/// The rule that --match and the descriptor's make. Throws UsageError.
Host::SurfaceMatch matchOption(const Arguments& arguments);
/// The same for a command that has a device; --match is only for a surface that is looked for.
/// Throws UsageError.
Host::SurfaceMatch matchOption(const Arguments& arguments, const DeviceChoice& choice);

/// The seed of the simulated surface, if one was given. Throws UsageError with any other device.
std::optional<std::uint64_t> seedOption(const Arguments& arguments, const DeviceChoice& choice);
/// What --seed, --rate, --endless and --match say; the command must have all four. Throws
/// UsageError, also when one is given for a device that has no use of it.
DeviceWishes deviceWishes(const Arguments& arguments, const DeviceChoice& choice);

/// For a command that talks to the daemon because it was given no device of its own: none of these
/// options may be given. Throws UsageError.
void refuseWithoutOwnDevice(const Arguments& arguments, std::span<const OptionEntry> options);

/// Makes the device; a played one waits by the streams' clock. Throws Failure when a file cannot be
/// read, or when there is no surface or it cannot be opened.
std::shared_ptr<ObservedDevice> makeDevice(const DeviceChoice& choice, const DeviceWishes& wishes,
                                           Streams& streams);

/// The frames of a played device alone: those of a script over and over (numbers and clocks go on),
/// those of a recording once. There must be a path. Throws Failure when it cannot be read.
PlayedDevice::FrameSource frameSource(const DeviceChoice& choice, Streams& streams);

}  // namespace VexaTouch::Tools
