// usage: UhidSurface <COMMANDS
//
// A surface that is plugged in and out as it is told, line by line:
//
//   plug [SERIAL]         makes it and waits for its node, "node /dev/hidrawN"
//   unplug                pulls the plug
//   features HOW          normal, refused, short or never: what becomes of feature requests
//   open, closed          waits until somebody has it open, or nobody
//   asked N               waits until so many feature requests have come
//   play FILE [HZ]        the reports of a recording (.json) or script (.gesture), at their
//   recorded
//                         pace or so many a second, "played N"
//   wait MS
//
// Every line is answered on standard output when it is done, so that a script can wait for it.

#include "Shared/Util.h"
#include "Tests/Kernel/UhidDevice.h"
#include "Tools/Failure.h"
#include "Tools/GestureScript.h"
#include "Tools/InputFile.h"
#include "Tools/RecordingFile.h"
#include "Tools/Streams.h"
#include "Tools/SurfaceSynthesizer.h"

#include <sys/prctl.h>

#include <chrono>
#include <iostream>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <thread>

namespace {

using namespace std::chrono_literals;
using VexaTouch::Testing::UhidDevice;
using VexaTouch::Tools::Failure;
using Clock = std::chrono::steady_clock;

constexpr auto kLimit = 20s;

class Commands {
public:
    void run(const std::string& line);

private:
    UhidDevice& device();
    void plug(std::istringstream& words);
    void play(std::istringstream& words);

    std::unique_ptr<UhidDevice> device_;
    UhidDevice::Features features_ = UhidDevice::Features::Normal;
};

UhidDevice& Commands::device() {
    if (!device_) {
        throw Failure("nothing is plugged in");
    }
    return *device_;
}

void Commands::plug(std::istringstream& words) {
    UhidDevice::Identity identity;
    words >> identity.serial;
    device_.reset();
    device_ = std::make_unique<UhidDevice>(identity, features_);
    const std::string node = device_->waitForNode(kLimit);
    if (node.empty()) {
        throw Failure("no hidraw node came");
    }
    std::cout << "node " << node << std::endl;
}

VexaTouch::FrameList framesOf(const std::string& path) {
    VexaTouch::Tools::Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    if (!path.ends_with(".gesture")) {
        return VexaTouch::Tools::readRecording(path, streams).frames;
    }
    VexaTouch::Tools::InputFile file(path, streams);
    return VexaTouch::Tools::synthesize(VexaTouch::Tools::GestureScript::parse(file.rest()));
}

void Commands::play(std::istringstream& words) {
    std::string path;
    double rate = 0;
    words >> path;
    const bool hasRate = static_cast<bool>(words >> rate);
    std::uint64_t sent = 0;
    std::optional<std::uint64_t> first;
    const Clock::time_point start = Clock::now();
    for (const auto& frame : framesOf(path)) {
        if (frame.type != VexaTouch::PipelineRecording::Frame::Type::InputReport) {
            continue;
        }
        first = first.value_or(frame.timestamp);
        const std::chrono::nanoseconds due(
            hasRate ? static_cast<std::uint64_t>(static_cast<double>(sent) * 1e9 / rate)
                    : frame.timestamp - std::min(frame.timestamp, *first));
        std::this_thread::sleep_until(start + due);
        device().send(frame.report);
        ++sent;
    }
    std::cout << "played " << sent << std::endl;
}

void Commands::run(const std::string& line) {
    std::istringstream words(line);
    std::string command;
    words >> command;
    if (command == "plug") {
        plug(words);
    } else if (command == "unplug") {
        device_.reset();
        std::cout << "unplugged" << std::endl;
    } else if (command == "features") {
        std::string how;
        words >> how;
        features_ = how == "refused" ? UhidDevice::Features::Refused
                    : how == "short" ? UhidDevice::Features::Short
                    : how == "never" ? UhidDevice::Features::Never
                                     : UhidDevice::Features::Normal;
        if (device_) {
            device_->setFeatures(features_);
        }
        std::cout << "features " << how << std::endl;
    } else if (command == "open" || command == "closed") {
        if (!device().waitUntilOpen(command == "open", kLimit)) {
            throw Failure("still not " + command);
        }
        std::cout << command << std::endl;
    } else if (command == "asked") {
        std::uint64_t requests = 0;
        words >> requests;
        if (!device().waitUntilAsked(requests, kLimit)) {
            throw Failure("not asked for that many feature reports");
        }
        std::cout << "asked " << requests << std::endl;
    } else if (command == "play") {
        play(words);
    } else if (command == "wait") {
        std::uint64_t ms = 0;
        words >> ms;
        std::this_thread::sleep_for(std::chrono::milliseconds(ms));
        std::cout << "waited " << ms << std::endl;
    } else if (!command.empty()) {
        throw Failure("unknown command " + command);
    }
}

}  // namespace

int main() {
    prctl(PR_SET_TIMERSLACK, 1UL, 0UL, 0UL, 0UL);
    Commands commands;
    try {
        for (std::string line; std::getline(std::cin, line);) {
            commands.run(line);
        }
        return 0;
    } catch (const std::exception& fault) {
        std::cerr << "UhidSurface: " << fault.what() << '\n';
        return 1;
    }
}
