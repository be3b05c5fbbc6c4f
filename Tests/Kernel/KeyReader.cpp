// usage: KeyReader NAME
//
// Waits for the input device of that name, says "reading /dev/input/eventN" on standard error and
// prints a line for each of its key events, "KEY_VOLUMEUP press" (or "release", "repeat"), until
// the device is gone.

#include "Tools/FileDescriptor.h"

#include <fcntl.h>
#include <libevdev/libevdev.h>
#include <linux/input.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <string>
#include <thread>

namespace {

using VexaTouch::Tools::FileDescriptor;

std::string nodeNamed(const std::string& wanted) {
    std::error_code error;
    for (const auto& entry : std::filesystem::directory_iterator("/sys/class/input", error)) {
        std::string name;
        std::getline(std::ifstream(entry.path() / "device" / "name"), name);
        const std::string node = entry.path().filename().string();
        if (name == wanted && node.starts_with("event")) {
            return "/dev/input/" + node;
        }
    }
    return {};
}

FileDescriptor openWhenThere(const std::string& name) {
    constexpr auto kLimit = std::chrono::seconds(20);
    const auto end = std::chrono::steady_clock::now() + kLimit;
    while (std::chrono::steady_clock::now() < end) {
        const std::string node = nodeNamed(name);
        FileDescriptor device(node.empty() ? -1 : ::open(node.c_str(), O_RDONLY | O_CLOEXEC));
        if (device) {
            std::cerr << "reading " << node << std::endl;
            return device;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return {};
}

const char* actionOf(int value) {
    static constexpr std::array<const char*, 3> kActions = {"release", "press", "repeat"};
    return value >= 0 && value < 3 ? kActions[static_cast<std::size_t>(value)] : "?";
}

}  // namespace

int main(int count, char** arguments) {
    const std::string name = count == 2 ? arguments[1] : "";
    const FileDescriptor device = openWhenThere(name);
    if (!device) {
        std::cerr << "KeyReader: no input device \"" << name << "\"\n";
        return 1;
    }
    input_event event{};
    while (read(device.get(), &event, sizeof event) == static_cast<ssize_t>(sizeof event)) {
        if (event.type == EV_SYN && event.code == SYN_DROPPED) {
            std::cout << "DROPPED" << std::endl;
        } else if (event.type == EV_KEY) {
            const char* key = libevdev_event_code_get_name(event.type, event.code);
            std::cout << (key == nullptr ? "?" : key) << ' ' << actionOf(event.value) << std::endl;
        }
    }
    if (errno != ENODEV) {
        std::cerr << "KeyReader: " << std::strerror(errno) << '\n';
        return 1;
    }
    return 0;
}
