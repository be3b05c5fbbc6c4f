#pragma once

#include "Tools/FileDescriptor.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <array>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <stdexcept>
#include <string>

namespace VexaTouch::Testing {

/// The end of a service manager: what a daemon tells arrives at its socket. While it lives the
/// environment names it, with a watchdog if that is wanted.
class ServiceManager {
public:
    explicit ServiceManager(const std::string& path, const char* watchdogMicroseconds = nullptr)
        : socket_(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
        if (::bind(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) !=
            0) {
            throw std::runtime_error("no socket");
        }
        setenv("NOTIFY_SOCKET", path.c_str(), 1);
        if (watchdogMicroseconds != nullptr) {
            setenv("WATCHDOG_USEC", watchdogMicroseconds, 1);
        }
    }
    ~ServiceManager() {
        unsetenv("NOTIFY_SOCKET");
        unsetenv("WATCHDOG_USEC");
    }
    ServiceManager(const ServiceManager&) = delete;
    ServiceManager& operator=(const ServiceManager&) = delete;

    /// Reads what it is told until it is told this.
    std::string heardUntil(const std::string& wanted) const {
        std::string all;
        while (all.find(wanted) == std::string::npos) {
            all += next(0) + '\n';
        }
        return all;
    }
    /// What it was told and has not read yet.
    std::string heard() const {
        std::string all;
        for (std::string text; !(text = next(MSG_DONTWAIT)).empty();) {
            all += text + '\n';
        }
        return all;
    }

private:
    std::string next(int flags) const {
        std::array<char, 512> text{};
        const ssize_t got = ::recv(socket_.get(), text.data(), text.size(), flags);
        return {text.data(), got > 0 ? static_cast<std::size_t>(got) : 0};
    }

    Tools::FileDescriptor socket_;
};

}  // namespace VexaTouch::Testing
