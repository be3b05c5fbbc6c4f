#pragma once

#include "Tools/CommandTable.h"
#include "Tools/PlayedDevice.h"
#include "Tools/Streams.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace VexaTouch::Tools {

/// A device as it is named on the command line: "sim", "sim:SCRIPT", "recording:FILE",
/// "recording:FILE@2" or "recording:FILE@max". SCRIPT and FILE may be "-", standard input.
///
/// What stands behind the last @ is a speed if it is "max" or reads as a number, otherwise it
/// belongs to the file's name: for a file named "a@2" write "a@2@1".
struct DeviceChoice {
    enum class Kind : std::uint8_t { Simulated, Recording };

    Kind kind = Kind::Simulated;
    std::string path;    ///< of the script or recording; empty: random gestures
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
};

/// Help of the option --device for the command table.
inline constexpr std::string_view kDeviceHelp =
    "The device: sim plays random gestures, sim:SCRIPT those of a script, recording:FILE the "
    "reports of a recording at their recorded times; recording:FILE@2 plays twice as fast, "
    "recording:FILE@max as fast as the reports are taken";

/// Options of subcommands that have a device.
inline constexpr OptionEntry kDeviceOption = {.name = "--device",
                                              .valueName = "DEVICE",
                                              .help = kDeviceHelp,
                                              .defaultValue = "sim",
                                              .kind = ValueKind::Choice,
                                              .choices = "sim sim: recording:"};
inline constexpr OptionEntry kSeedOption = {
    .name = "--seed", .valueName = "N", .help = "Seed of the simulated surface's random numbers"};

inline constexpr OptionEntry kRateOption = {
    .name = "--rate",
    .valueName = "HZ",
    .help = "Reports a second that the simulated surface sends"};
inline constexpr OptionEntry kEndlessOption = {.name = "--endless",
                                               .help = "Begin a script anew when it is over"};

/// What --seed, --rate and --endless say; the command must have all three. Throws UsageError,
/// also when one is given for a device that has no use of it.
DeviceWishes deviceWishes(const Arguments& arguments, const DeviceChoice& choice);

/// Makes the device; its waiting is by the streams' clock. Throws Failure when a file cannot be
/// read.
std::shared_ptr<PlayedDevice> makeDevice(const DeviceChoice& choice, const DeviceWishes& wishes,
                                         Streams& streams);

/// The frames alone: those of a script over and over (numbers and clocks go on), those of a
/// recording once. There must be a path. Throws Failure when it cannot be read.
PlayedDevice::FrameSource frameSource(const DeviceChoice& choice, Streams& streams);

}  // namespace VexaTouch::Tools
