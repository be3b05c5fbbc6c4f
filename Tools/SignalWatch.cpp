#include "Tools/SignalWatch.h"

#include "Platform/SignalsBlocked.h"
#include "Tools/Failure.h"
#include "Tools/LiveScreen.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <string>
#include <system_error>

namespace VexaTouch::Tools {
namespace {

bool isIgnored(int signal) {
    struct sigaction action{};
    sigaction(signal, nullptr, &action);
    return action.sa_handler == SIG_IGN;
}

/// SIGHUP and SIGINT only unless the process was started to ignore them: by nohup, and by a shell
/// without job control that put it into the background.
sigset_t watchedSignals() {
    sigset_t set{};
    sigemptyset(&set);
    for (const int signal : {SIGTERM, SIGUSR1}) {
        sigaddset(&set, signal);
    }
    for (const int signal : {SIGINT, SIGHUP}) {
        if (!isIgnored(signal)) {
            sigaddset(&set, signal);
        }
    }
    return set;
}

/// Does what the signal does to a process that does not know it.
[[noreturn]] void endBy(int signal) {
    struct sigaction standard{};
    standard.sa_handler = SIG_DFL;
    sigaction(signal, &standard, nullptr);
    sigset_t set{};
    sigemptyset(&set);
    sigaddset(&set, signal);
    pthread_sigmask(SIG_UNBLOCK, &set, nullptr);
    ::raise(signal);
    constexpr int kShellsOffset = 128;
    _exit(kShellsOffset + signal);
}

}  // namespace

SignalWatch::SignalWatch(const WakeUp& wake) : wake_(wake) {
    const sigset_t set = watchedSignals();
    signals_ = FileDescriptor(signalfd(-1, &set, SFD_CLOEXEC | SFD_NONBLOCK));
    over_ = FileDescriptor(eventfd(0, EFD_CLOEXEC));
    if (!signals_ || !over_) {
        throw Failure(std::string("cannot watch for signals: ") + std::strerror(errno));
    }
    pthread_sigmask(SIG_BLOCK, &set, &previousMask_);
    struct sigaction ignore{};
    ignore.sa_handler = SIG_IGN;
    sigaction(SIGPIPE, &ignore, &previousPipe_);
    sigaction(SIGXFSZ, &ignore, &previousFileSize_);
    try {
        // All are blocked there: SIGTTOU would stop a process in the background that tidies its
        // terminal up.
        const Vexa::SignalsBlocked blocked;
        thread_ = std::thread([this] { watch(); });
    } catch (const std::system_error& error) {
        sigaction(SIGPIPE, &previousPipe_, nullptr);
        sigaction(SIGXFSZ, &previousFileSize_, nullptr);
        pthread_sigmask(SIG_SETMASK, &previousMask_, nullptr);
        throw Failure(std::string("cannot watch for signals: ") + error.what());
    }
}

SignalWatch::~SignalWatch() {
    const std::uint64_t one = 1;
    static_cast<void>(::write(over_.get(), &one, sizeof one) == sizeof one);
    thread_.join();
    sigaction(SIGPIPE, &previousPipe_, nullptr);
    sigaction(SIGXFSZ, &previousFileSize_, nullptr);
    pthread_sigmask(SIG_SETMASK, &previousMask_, nullptr);
}

void SignalWatch::watch() noexcept {
    std::array<pollfd, 2> waiting = {{{.fd = over_.get(), .events = POLLIN, .revents = 0},
                                      {.fd = signals_.get(), .events = POLLIN, .revents = 0}}};
    while (true) {
        const int ready = poll(waiting.data(), waiting.size(), -1);
        signalfd_siginfo info{};
        while (ready > 0 && ::read(signals_.get(), &info, sizeof info) == sizeof info) {
            take(static_cast<int>(info.ssi_signo));
        }
        if (ready > 0 && waiting[0].revents != 0) {
            return;
        }
    }
}

void SignalWatch::take(int signal) noexcept {
    if (signal == SIGUSR1) {
        recordingWanted_.store(true);
    } else if (endWanted_.exchange(true)) {
        LiveScreen::abandon();
        endBy(signal);
    }
    wake_.notify();
}

}  // namespace VexaTouch::Tools
