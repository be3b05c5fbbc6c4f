#include "Tests/Kernel/KeyDevice.h"

#include <fcntl.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <system_error>
#include <thread>

namespace VexaTouch::Testing {
namespace {

std::string nodeNamed(const std::string& wanted) {
    std::error_code error;
    for (const auto& entry : std::filesystem::directory_iterator("/sys/class/input", error)) {
        std::ifstream file(entry.path() / "device" / "name");
        std::string name;
        std::getline(file, name);
        const std::string node = entry.path().filename().string();
        if (name == wanted && node.starts_with("event")) {
            return "/dev/input/" + node;
        }
    }
    return {};
}

}  // namespace

KeyDevice::KeyDevice(const std::string& name, std::chrono::milliseconds limit) {
    const auto end = std::chrono::steady_clock::now() + limit;
    while (!descriptor_) {
        node_ = nodeNamed(name);
        if (!node_.empty()) {
            descriptor_ = Tools::FileDescriptor(::open(node_.c_str(), O_RDONLY | O_CLOEXEC));
        }
        if (!descriptor_ && std::chrono::steady_clock::now() >= end) {
            throw std::runtime_error("no input device \"" + name + "\" came");
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    int clock = CLOCK_MONOTONIC;
    if (ioctl(descriptor_.get(), EVIOCSCLOCKID, &clock) != 0) {
        throw std::system_error(errno, std::generic_category(), node_);
    }
}

bool KeyDevice::read(input_event& event) const {
    const ssize_t count = ::read(descriptor_.get(), &event, sizeof event);
    if (count == static_cast<ssize_t>(sizeof event)) {
        return true;
    }
    if (count < 0 && errno == ENODEV) {
        return false;
    }
    throw std::system_error(errno, std::generic_category(), node_);
}

}  // namespace VexaTouch::Testing
