#pragma once

#include "Tests/Tools/VexatouchProgram.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <pty.h>
#include <sys/ioctl.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <termios.h>
#include <unistd.h>

#include <csignal>
#include <cstddef>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

namespace VexaTouch::Testing {

/// The program on a terminal of its own.
class ProgramOnTerminal {
public:
    explicit ProgramOnTerminal(const std::vector<std::string>& arguments) {
        const winsize size{.ws_row = 30, .ws_col = 80, .ws_xpixel = 0, .ws_ypixel = 0};
        process_ = forkpty(&terminal_, nullptr, nullptr, &size);
        if (process_ == 0) {
            std::vector<char*> pointers = {const_cast<char*>(vexatouchProgram())};
            for (const std::string& argument : arguments) {
                pointers.push_back(const_cast<char*>(argument.c_str()));
            }
            pointers.push_back(nullptr);
            // A test run in the background was started with interrupts ignored.
            std::signal(SIGINT, SIG_DFL);
            execv(vexatouchProgram(), pointers.data());
            _exit(127);
        }
    }
    ~ProgramOnTerminal() {
        if (process_ > 0) {
            kill(process_, SIGKILL);
            waitpid(process_, nullptr, 0);
        }
        close(terminal_);
    }
    ProgramOnTerminal(const ProgramOnTerminal&) = delete;
    ProgramOnTerminal& operator=(const ProgramOnTerminal&) = delete;

    /// Reads until the program has written this text once more; false when it ends before.
    bool readUntil(const std::string& text) {
        std::size_t from = read_.size();
        while (read_.find(text, from) == std::string::npos) {
            char piece[4096];
            const ssize_t got = read(terminal_, piece, sizeof piece);
            if (got <= 0) {
                return false;
            }
            read_.append(piece, static_cast<std::size_t>(got));
        }
        return true;
    }

    /// The terminal takes nothing more of what the program writes, as after Ctrl-S.
    void stopOutput() const {
        const int terminal = open(ptsname(terminal_), O_RDWR | O_NOCTTY | O_CLOEXEC);
        ASSERT_EQ(tcflow(terminal, TCOOFF), 0);
        close(terminal);
    }
    void signal(int number) const { kill(process_, number); }

    void type(std::string_view keys) const {
        ASSERT_EQ(write(terminal_, keys.data(), keys.size()), static_cast<ssize_t>(keys.size()));
    }

    /// Waits for the end and gives the status as waitpid does.
    int end() {
        readUntil("\xFF");
        int status = 0;
        waitpid(process_, &status, 0);
        process_ = -1;
        return status;
    }

    /// The same without reading what the program has written.
    int wait() {
        int status = 0;
        waitpid(process_, &status, 0);
        process_ = -1;
        return status;
    }

    /// Whether keys are again read by the line and echoed.
    [[nodiscard]] bool keyboardIsAsBefore() const {
        constexpr tcflag_t kUsual = ICANON | ECHO;
        termios now{};
        return tcgetattr(terminal_, &now) == 0 && (now.c_lflag & kUsual) == kUsual;
    }
    [[nodiscard]] const std::string& output() const { return read_; }

private:
    pid_t process_ = -1;
    int terminal_ = -1;
    std::string read_;
};

}  // namespace VexaTouch::Testing
