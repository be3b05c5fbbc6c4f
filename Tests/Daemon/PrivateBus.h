#pragma once

#include "Tests/Tools/CommandRun.h"

#include <fcntl.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstddef>
#include <filesystem>
#include <stdexcept>
#include <string>

namespace VexaTouch::Testing {

/// A message bus of the test's own, gone with it.
class PrivateBus {
public:
    static constexpr const char* kProgram = "/usr/bin/dbus-daemon";

    static bool isThere() { return std::filesystem::exists(kProgram); }

    /// `policy` stands in the bus's configuration; without it everybody may do everything.
    explicit PrivateBus(const std::string& policy = kNoPolicy) {
        namespace fs = std::filesystem;
        // Another user shall reach the socket.
        fs::permissions(folder_.path(""), fs::perms(0755));
        const std::string config = folder_.file(
            "bus.conf", "<busconfig><type>custom</type><listen>unix:path=" +
                            folder_.path("socket") + "</listen><auth>EXTERNAL</auth>" + policy +
                            "<limit name=\"max_replies_per_connection\">50000</limit>"
                            "</busconfig>");
        int ends[2];
        if (pipe(ends) != 0) {
            throw std::runtime_error("no pipe");
        }
        process_ = fork();
        if (process_ == 0) {
            ::close(ends[0]);
            // It complains of limits that it may not raise.
            const int nothing = ::open("/dev/null", O_WRONLY | O_CLOEXEC);
            dup2(nothing, STDERR_FILENO);
            const std::string print = "--print-address=" + std::to_string(ends[1]);
            const std::string file = "--config-file=" + config;
            execl(kProgram, kProgram, "--nofork", "--nopidfile", "--nosyslog", file.c_str(),
                  print.c_str(), nullptr);
            _exit(127);
        }
        ::close(ends[1]);
        char text[512];
        const ssize_t got = ::read(ends[0], text, sizeof text);
        ::close(ends[0]);
        if (got <= 0) {
            throw std::runtime_error("the bus does not start");
        }
        address_ = "unix:path=" + folder_.path("socket");
    }
    ~PrivateBus() { stop(); }
    PrivateBus(const PrivateBus&) = delete;
    PrivateBus& operator=(const PrivateBus&) = delete;

    void stop() {
        if (process_ > 0) {
            kill(process_, SIGTERM);
            waitpid(process_, nullptr, 0);
            process_ = -1;
        }
    }

    [[nodiscard]] const std::string& address() const { return address_; }

    static constexpr const char* kNoPolicy =
        "<policy context=\"default\"><allow user=\"*\"/><allow own=\"*\"/>"
        "<allow send_destination=\"*\" eavesdrop=\"true\"/><allow eavesdrop=\"true\"/></policy>";

private:
    TemporaryFolder folder_;
    pid_t process_ = -1;
    std::string address_;
};

}  // namespace VexaTouch::Testing
