#include "Tools/LiveScreen.h"

#include "Shared/Util.h"
#include "Tools/FileDescriptor.h"

#include <fcntl.h>
#include <poll.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <csignal>
#include <iostream>
#include <string_view>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<int, 3> kSignals = {SIGINT, SIGTERM, SIGHUP};

volatile std::sig_atomic_t arrivedSignal = 0;

constexpr std::string_view kHideCursor = "\x1B[?25l";
constexpr std::string_view kShowCursor = "\x1B[0m\x1B[?25h";

// What abandon() needs, apart from the screen that may be going away meanwhile.
std::atomic<bool> cursorHidden = false;
std::atomic<bool> keyboardIsRaw = false;
termios keyboardBefore{};

extern "C" void rememberSignal(int signal) {
    arrivedSignal = signal;
}

}  // namespace

struct LiveScreen::Saved {
    std::array<struct sigaction, kSignals.size()> actions{};
    bool keyboardChanged = false;
    bool readsKeys = false;
    termios keyboard{};
};

LiveScreen::LiveScreen(Streams& streams) : streams_(streams), saved_(std::make_unique<Saved>()) {
    arrivedSignal = 0;
    struct sigaction remember{};
    remember.sa_handler = rememberSignal;  // without SA_RESTART: it interrupts the waiting
    sigemptyset(&remember.sa_mask);
    for (std::size_t i = 0; i < kSignals.size(); ++i) {
        sigaction(kSignals[i], nullptr, &saved_->actions[i]);
        // What the process was started to ignore stays ignored.
        if (saved_->actions[i].sa_handler != SIG_IGN) {
            sigaction(kSignals[i], &remember, nullptr);
        }
    }
    // Keys only when they are ours to read: the process's own standard input, a terminal.
    if (&streams.in == &std::cin && tcgetattr(STDIN_FILENO, &saved_->keyboard) == 0) {
        termios raw = saved_->keyboard;
        raw.c_lflag &= ~static_cast<tcflag_t>(ICANON | ECHO);
        raw.c_cc[VMIN] = 0;
        raw.c_cc[VTIME] = 0;
        keyboardBefore = saved_->keyboard;
        saved_->keyboardChanged = tcsetattr(STDIN_FILENO, TCSANOW, &raw) == 0;
        keyboardIsRaw = saved_->keyboardChanged;
        saved_->readsKeys = saved_->keyboardChanged;
    }
    cursorHidden = &streams_.out == &std::cout;
    streams_.out << kHideCursor << std::flush;
}

LiveScreen::~LiveScreen() {
    streams_.out << kShowCursor << std::flush;
    cursorHidden = false;
    keyboardIsRaw = false;
    if (saved_->keyboardChanged) {
        tcsetattr(STDIN_FILENO, TCSANOW, &saved_->keyboard);
    }
    for (std::size_t i = 0; i < kSignals.size(); ++i) {
        sigaction(kSignals[i], &saved_->actions[i], nullptr);
    }
}

void LiveScreen::draw(const std::vector<std::string>& lines) {
    // Begun and ended as one update, so that terminals that know of it never show half of it.
    std::string text = "\x1B[?2026h";
    if (drawnLines_ > 0) {
        text += "\x1B[" + std::to_string(drawnLines_) + "A";
    }
    for (const std::string& line : lines) {
        text += '\r' + line + "\x1B[K\n";
    }
    for (std::size_t i = lines.size(); i < drawnLines_; ++i) {
        text += "\r\x1B[K\n";
    }
    drawnLines_ = std::max(drawnLines_, lines.size());
    text += "\x1B[?2026l";
    streams_.out << text << std::flush;
}

char LiveScreen::wait(std::uint64_t untilNs) {
    // In slices: how long a key or a signal may go unnoticed.
    constexpr std::uint64_t kSliceUs = 10'000;
    constexpr std::uint64_t kNsPerUs = 1000;
    while (interrupted() == 0) {
        if (const char key = pressedKey(); key != 0) {
            return key;
        }
        const std::uint64_t now = nowNs();
        if (now >= untilNs) {
            break;
        }
        streams_.clock.sleepMicroseconds(std::min((untilNs - now) / kNsPerUs + 1, kSliceUs));
    }
    return 0;
}

std::uint64_t LiveScreen::nowNs() const {
    return Util::nanosecondsFromMachTime(streams_.clock.now());
}

char LiveScreen::pressedKey() {
    pollfd keyboard{.fd = saved_->readsKeys ? STDIN_FILENO : -1, .events = POLLIN, .revents = 0};
    char key = 0;
    if (poll(&keyboard, 1, 0) > 0 && read(STDIN_FILENO, &key, 1) != 1) {
        saved_->readsKeys = false;  // the terminal is gone
    }
    return key;
}

void LiveScreen::abandon() noexcept {
    if (keyboardIsRaw) {
        tcsetattr(STDIN_FILENO, TCSANOW, &keyboardBefore);
    }
    if (!cursorHidden) {
        return;
    }
    // Opened anew, since a descriptor that does not block is the shell's as well when it is ours.
    // Without the right to do so, what has room is written.
    const FileDescriptor unblocked(
        ::open("/proc/self/fd/1", O_WRONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    const int terminal = unblocked ? unblocked.get() : STDOUT_FILENO;
    pollfd room{.fd = terminal, .events = POLLOUT, .revents = 0};
    if (poll(&room, 1, 0) > 0 && (room.revents & POLLOUT) != 0) {
        static_cast<void>(::write(terminal, kShowCursor.data(), kShowCursor.size()) > 0);
    }
}

int LiveScreen::interrupted() noexcept {
    return arrivedSignal;
}

}  // namespace VexaTouch::Tools
