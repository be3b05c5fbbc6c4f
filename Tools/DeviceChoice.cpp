#include "Tools/DeviceChoice.h"

#include "Host/HostFailure.h"
#include "Host/SurfaceWatch.h"
#include "Tools/EventInbox.h"
#include "Tools/Failure.h"
#include "Tools/HidrawSource.h"
#include "Tools/InputFile.h"
#include "Tools/OptionValues.h"
#include "Tools/RecordedDevice.h"
#include "Tools/RecordingFile.h"
#include "Tools/SimulatedSurface.h"

#include <charconv>
#include <cmath>
#include <limits>
#include <stdexcept>
#include <utility>
#include <vector>

namespace VexaTouch::Tools {
namespace {

constexpr std::string_view kSimulated = "sim";
constexpr std::string_view kRecording = "recording";
constexpr std::string_view kHidraw = "hidraw";
constexpr std::string_view kAsFastAsTaken = "max";

/// What was given and the option that it was given to.
struct Given {
    std::string_view option;
    std::string_view text;
};

[[noreturn]] void refuse(const Given& given, const std::string& reason) {
    throw UsageError(std::string(given.option) + ' ' + std::string(given.text) + ": " + reason);
}

/// The number that the whole text reads as.
std::optional<double> numberFromText(std::string_view text) {
    double value = 0.0;
    const char* end = text.data() + text.size();
    const auto [read, error] = std::from_chars(text.data(), end, value);
    return error == std::errc{} && read == end ? std::optional(value) : std::nullopt;
}

std::optional<double> speedFromText(const Given& given, std::string_view text) {
    if (text == kAsFastAsTaken) {
        return RecordedDevice::kAsFastAsTaken;
    }
    const std::optional<double> speed = numberFromText(text);
    if (speed && (!std::isfinite(*speed) || *speed <= 0.0)) {
        refuse(given, "the speed is a number above 0, or max (for a file of that name add @1)");
    }
    return speed;
}

DeviceChoice recordingChoice(const Given& given, std::string_view path) {
    DeviceChoice choice{.kind = DeviceChoice::Kind::Recording, .path = {}, .speed = 1.0};
    const std::size_t at = path.rfind('@');
    if (at != std::string_view::npos) {
        if (const auto speed = speedFromText(given, path.substr(at + 1))) {
            choice.speed = *speed;
            path = path.substr(0, at);
        }
    }
    if (path.empty()) {
        refuse(given, "the recording's file is missing");
    }
    choice.path = path;
    return choice;
}

GestureScript readScript(const std::string& path, Streams& streams) {
    InputFile file(path, streams);
    std::string text;
    // No more than one piece above the limit, which the parser then refuses.
    for (std::string_view piece = file.next(); !piece.empty() && text.size() <= kMaximumScriptBytes;
         piece = file.next()) {
        text += piece;
    }
    GestureScript script;
    try {
        script = GestureScript::parse(text);
    } catch (const GestureScriptError& error) {
        throw Failure(file.name() + ": " + error.what());
    }
    if (script.frames == 0) {
        throw Failure(file.name() + ": the script makes no frames (add a gesture, or idle 100ms)");
    }
    return script;
}

std::shared_ptr<PlayedDevice> makeSurface(const DeviceChoice& choice, const DeviceWishes& wishes,
                                          Streams& streams) {
    SimulatedPlay play{.seed = wishes.seed, .endless = wishes.endless, .rate = wishes.rate};
    const bool isRandom = choice.path.empty();
    if (!isRandom) {
        play.script = readScript(choice.path, streams);
    }
    auto surface =
        std::make_shared<SimulatedSurface>(std::move(play), SurfaceIdentity{}, streams.clock);
    if (isRandom && wishes.announceSeed) {
        streams.error << "simulated surface: random gestures, seed " << surface->seed() << '\n';
    }
    return surface;
}

std::shared_ptr<ObservedDevice> openSurface(const DeviceChoice& choice, const DeviceWishes& wishes,
                                            Streams& streams) {
    if (!choice.path.empty()) {
        return std::make_shared<HidrawSource>(choice.path);
    }
    const std::vector<Host::Surface> surfaces = Host::findSurfaces(wishes.match);
    if (surfaces.empty()) {
        throw Failure(
            "no touch surface is plugged in (vexatouch devices --verbose says of each device why "
            "it is none; --match VENDOR:PRODUCT names one)");
    }
    const Host::Surface& first = surfaces.front();
    if (surfaces.size() > 1) {
        streams.error << surfaces.size() << " surfaces; this is " << first.node
                      << " (--device hidraw:NODE for another)\n";
    }
    return std::make_shared<HidrawSource>(first.node, first.sysPath);
}

}  // namespace

DeviceChoice DeviceChoice::parse(std::string_view text, std::string_view option) {
    const Given given{.option = option, .text = text};
    const std::size_t colon = text.find(':');
    const std::string_view name = text.substr(0, colon);
    const bool hasPath = colon != std::string_view::npos;
    const std::string_view path = hasPath ? text.substr(colon + 1) : std::string_view();
    if (name == kSimulated) {
        if (hasPath && path.empty()) {
            refuse(given, "the script's file is missing (without the colon: random gestures)");
        }
        return {.kind = Kind::Simulated, .path = std::string(path), .speed = 1.0};
    }
    if (name == kRecording) {
        return recordingChoice(given, path);
    }
    if (name == kHidraw) {
        if (hasPath && path.empty()) {
            refuse(given, "the node is missing (without the colon: the first surface there is)");
        }
        return {.kind = Kind::Hidraw, .path = std::string(path), .speed = 1.0};
    }
    refuse(given,
           "expected sim, sim:SCRIPT, recording:FILE (with @2 or @max behind the file for a "
           "speed), hidraw or hidraw:NODE");
}

bool comesToAnEnd(const DeviceChoice& choice, const DeviceWishes& wishes) noexcept {
    return choice.kind != DeviceChoice::Kind::Hidraw && !choice.path.empty() && !wishes.endless;
}

std::size_t eventRoom(const DeviceChoice& choice, const DeviceWishes& wishes) noexcept {
    return comesToAnEnd(choice, wishes) ? std::numeric_limits<std::size_t>::max()
                                        : EventInbox::kUsualRoom;
}

Host::SurfaceMatch matchOption(const Arguments& arguments) {
    std::vector<Host::SurfaceMatch::Ids> named;
    for (const std::string& text : arguments.values(kMatchOption.name)) {
        try {
            named.push_back(Host::SurfaceMatch::Ids::fromText(text));
        } catch (const std::invalid_argument& error) {
            throw UsageError(std::string(kMatchOption.name) + ": " + error.what());
        }
    }
    return Host::SurfaceMatch(std::move(named));
}

Host::SurfaceMatch matchOption(const Arguments& arguments, const DeviceChoice& choice) {
    if (arguments.given(kMatchOption.name) &&
        (choice.kind != DeviceChoice::Kind::Hidraw || !choice.path.empty())) {
        throw UsageError(std::string(kMatchOption.name) + " goes with --device hidraw");
    }
    return matchOption(arguments);
}

std::optional<std::uint64_t> seedOption(const Arguments& arguments, const DeviceChoice& choice) {
    if (choice.kind != DeviceChoice::Kind::Simulated && arguments.given(kSeedOption.name)) {
        throw UsageError(std::string(kSeedOption.name) + " is for a simulated surface");
    }
    return numberOption(arguments, kSeedOption.name, 0, UINT64_MAX);
}

DeviceWishes deviceWishes(const Arguments& arguments, const DeviceChoice& choice) {
    DeviceWishes wishes;
    if (choice.kind != DeviceChoice::Kind::Simulated) {
        for (const OptionEntry& option : {kRateOption, kEndlessOption}) {
            if (arguments.given(option.name)) {
                throw UsageError(std::string(option.name) + " is for a simulated surface");
            }
        }
    }
    constexpr double kHighestRate = 1e6;
    wishes.seed = seedOption(arguments, choice);
    wishes.rate = rateOption(arguments, kRateOption.name, kHighestRate);
    wishes.endless = arguments.given(kEndlessOption.name);
    wishes.match = matchOption(arguments, choice);
    return wishes;
}

void refuseWithoutOwnDevice(const Arguments& arguments, std::span<const OptionEntry> options) {
    for (const OptionEntry& option : options) {
        if (arguments.given(option.name)) {
            throw UsageError(std::string(option.name) +
                             " is for a device of its own; name one with --device");
        }
    }
}

std::shared_ptr<ObservedDevice> makeDevice(const DeviceChoice& choice, const DeviceWishes& wishes,
                                           Streams& streams) {
    if (choice.kind == DeviceChoice::Kind::Simulated) {
        return makeSurface(choice, wishes, streams);
    }
    if (choice.kind == DeviceChoice::Kind::Hidraw) {
        return openSurface(choice, wishes, streams);
    }
    return std::make_shared<RecordedDevice>(readRecording(choice.path, streams).frames,
                                            choice.speed, SurfaceIdentity{}, streams.clock);
}

PlayedDevice::FrameSource frameSource(const DeviceChoice& choice, Streams& streams) {
    if (choice.kind == DeviceChoice::Kind::Simulated) {
        return gestureSource(readScript(choice.path, streams), {}, true);
    }
    return recordingSource(readRecording(choice.path, streams).frames);
}

}  // namespace VexaTouch::Tools
