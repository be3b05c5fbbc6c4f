#pragma once

#include "Tests/Tools/VexatouchProgram.h"

#include <fcntl.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstddef>
#include <cstdlib>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace VexaTouch::Testing {

/// The program as a process of its own, its two outputs in pipes.
class ProgramRun {
public:
    /// `interrupt` is what it was started to do at SIGINT, SIG_DFL or SIG_IGN.
    explicit ProgramRun(const std::vector<std::string>& arguments,
                        sighandler_t interrupt = SIG_DFL) {
        int out[2];
        int error[2];
        if (pipe2(out, O_CLOEXEC) != 0 || pipe2(error, O_CLOEXEC) != 0) {
            throw std::runtime_error("no pipes");
        }
        fcntl(out[0], F_SETPIPE_SZ, kPipeBytes);
        std::vector<char*> pointers = {const_cast<char*>(vexatouchProgram())};
        for (const std::string& argument : arguments) {
            pointers.push_back(const_cast<char*>(argument.c_str()));
        }
        pointers.push_back(nullptr);
        process_ = fork();
        if (process_ == 0) {
            dup2(out[1], STDOUT_FILENO);
            dup2(error[1], STDERR_FILENO);
            // A test run in the background was started with interrupts ignored.
            std::signal(SIGINT, interrupt);
            execv(vexatouchProgram(), pointers.data());
            _exit(127);
        }
        close(out[1]);
        close(error[1]);
        out_ = out[0];
        error_ = error[0];
    }
    ~ProgramRun() {
        if (process_ > 0) {
            kill(process_, SIGKILL);
            waitpid(process_, nullptr, 0);
        }
        closeOut();
        close(error_);
    }
    ProgramRun(const ProgramRun&) = delete;
    ProgramRun& operator=(const ProgramRun&) = delete;

    /// Reads until this text has come once more; false when the output ends before.
    bool readOutUntil(std::string_view text) { return readUntil(out_, outText_, text); }
    bool readErrorUntil(std::string_view text) { return readUntil(error_, errorText_, text); }

    /// Nobody reads the output any more.
    void closeOut() {
        if (out_ >= 0) {
            close(std::exchange(out_, -1));
        }
    }
    /// Returns when the program has written as much as fits into the pipe and is not read.
    void waitUntilStuck() const {
        constexpr int kLongestLine = 160;
        int waiting = 0;
        while (waiting <= kPipeBytes - kLongestLine) {
            if (ioctl(out_, FIONREAD, &waiting) != 0 || waitpid(process_, nullptr, WNOHANG) != 0) {
                throw std::runtime_error("the program has ended");
            }
            sched_yield();
        }
    }
    void signal(int number) const { kill(process_, number); }
    [[nodiscard]] pid_t process() const { return process_; }

    /// Reads all that comes and gives the status as waitpid does.
    int end() {
        while (out_ >= 0 && readPiece(out_, outText_)) {
        }
        while (readPiece(error_, errorText_)) {
        }
        return wait();
    }
    /// The same without reading the results.
    int wait() {
        int status = 0;
        waitpid(process_, &status, 0);
        process_ = -1;
        return status;
    }

    [[nodiscard]] const std::string& out() const { return outText_; }
    [[nodiscard]] const std::string& error() const { return errorText_; }

private:
    static constexpr int kPipeBytes = 4096;

    static bool readPiece(int descriptor, std::string& text) {
        char piece[4096];
        const ssize_t got = read(descriptor, piece, sizeof piece);
        if (got > 0) {
            text.append(piece, static_cast<std::size_t>(got));
        }
        return got > 0;
    }
    static bool readUntil(int descriptor, std::string& text, std::string_view wanted) {
        const std::size_t from = text.size();
        while (text.find(wanted, from) == std::string::npos) {
            if (!readPiece(descriptor, text)) {
                return false;
            }
        }
        return true;
    }

    pid_t process_ = -1;
    int out_ = -1;
    int error_ = -1;
    std::string outText_;
    std::string errorText_;
};

}  // namespace VexaTouch::Testing
