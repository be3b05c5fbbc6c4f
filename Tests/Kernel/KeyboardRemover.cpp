// usage: KeyboardRemover PID
//
// Takes the virtual keyboard away from a process that has made one: the process keeps its
// descriptor of /dev/uinput, and finds nothing behind it.

#include "Tools/FileDescriptor.h"

#include <linux/uinput.h>
#include <sys/ioctl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <exception>
#include <filesystem>
#include <iostream>
#include <stdexcept>
#include <string>
#include <system_error>

namespace {

using VexaTouch::Tools::FileDescriptor;

int uinputOf(const std::string& process) {
    for (const auto& entry : std::filesystem::directory_iterator("/proc/" + process + "/fd")) {
        if (std::filesystem::read_symlink(entry) == "/dev/uinput") {
            return std::stoi(entry.path().filename());
        }
    }
    throw std::runtime_error("process " + process + " has no keyboard");
}

// The C library's declarations of these are for C alone.
FileDescriptor descriptorOf(long result, const char* what) {
    if (result < 0) throw std::system_error(errno, std::generic_category(), what);
    return FileDescriptor(static_cast<int>(result));
}

}  // namespace

int main(int count, char** arguments) {
    try {
        const std::string process = count == 2 ? arguments[1] : "";
        const FileDescriptor holder =
            descriptorOf(syscall(SYS_pidfd_open, std::stoi(process), 0), "the process");
        const FileDescriptor keyboard = descriptorOf(
            syscall(SYS_pidfd_getfd, holder.get(), uinputOf(process), 0), "its descriptor");
        if (ioctl(keyboard.get(), UI_DEV_DESTROY) != 0) {
            throw std::system_error(errno, std::generic_category(), "taking the keyboard away");
        }
        return 0;
    } catch (const std::exception& fault) {
        std::cerr << "KeyboardRemover: " << fault.what() << '\n';
        return 1;
    }
}
