#pragma once

#include "Tools/FileDescriptor.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <array>
#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>

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
        reader_ = std::thread([this] { read(); });
    }
    ~ServiceManager() {
        over_ = true;
        ::shutdown(socket_.get(), SHUT_RDWR);
        reader_.join();
        unsetenv("NOTIFY_SOCKET");
        unsetenv("WATCHDOG_USEC");
    }
    ServiceManager(const ServiceManager&) = delete;
    ServiceManager& operator=(const ServiceManager&) = delete;

    /// Waits until it is told this; gives all that it was told up to then.
    std::string heardUntil(const std::string& wanted) {
        std::unique_lock guard(lock_);
        more_.wait(guard, [&] { return text_.find(wanted) != std::string::npos; });
        return std::exchange(text_, {});
    }
    /// All that it was told and nobody has asked for yet.
    std::string heard() {
        const std::lock_guard guard(lock_);
        take();
        return std::exchange(text_, {});
    }

private:
    // A socket that is not read holds up who writes after a few lines.
    void read() {
        pollfd waiting{.fd = socket_.get(), .events = POLLIN, .revents = 0};
        while (!over_ && ::poll(&waiting, 1, -1) >= 0) {
            const std::lock_guard guard(lock_);
            take();
            more_.notify_all();
        }
    }
    void take() {
        std::array<char, 512> text{};
        for (ssize_t got = 0;
             (got = ::recv(socket_.get(), text.data(), text.size(), MSG_DONTWAIT)) > 0;) {
            text_.append(text.data(), static_cast<std::size_t>(got)).append("\n");
        }
    }

    Tools::FileDescriptor socket_;
    std::mutex lock_;
    std::condition_variable more_;
    std::string text_;
    std::atomic<bool> over_ = false;
    std::thread reader_;
};

}  // namespace VexaTouch::Testing
