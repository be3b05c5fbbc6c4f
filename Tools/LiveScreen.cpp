#include "Tools/LiveScreen.h"

#include <poll.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <iostream>
#include <utility>

namespace VexaTouch::Tools {
namespace {

constexpr std::array<int, 3> kSignals = {SIGINT, SIGTERM, SIGHUP};

volatile std::sig_atomic_t arrivedSignal = 0;

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
        sigaction(kSignals[i], &remember, &saved_->actions[i]);
    }
    // Keys only when they are ours to read: the process's own standard input, a terminal.
    if (&streams.in == &std::cin && tcgetattr(STDIN_FILENO, &saved_->keyboard) == 0) {
        termios raw = saved_->keyboard;
        raw.c_lflag &= ~static_cast<tcflag_t>(ICANON | ECHO);
        raw.c_cc[VMIN] = 0;
        raw.c_cc[VTIME] = 0;
        saved_->keyboardChanged = tcsetattr(STDIN_FILENO, TCSANOW, &raw) == 0;
        saved_->readsKeys = saved_->keyboardChanged;
    }
    streams_.out << "\x1B[?25l" << std::flush;
}

LiveScreen::~LiveScreen() {
    streams_.out << "\x1B[0m\x1B[?25h" << std::flush;
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

char LiveScreen::wait(std::chrono::steady_clock::time_point until) {
    while (interrupted() == 0) {
        const auto left = until - std::chrono::steady_clock::now();
        const bool due = left <= std::chrono::steady_clock::duration::zero();
        // In slices, since a signal may arrive just before the waiting begins.
        constexpr std::chrono::nanoseconds kSlice = std::chrono::milliseconds(50);
        const auto slice =
            due ? std::chrono::nanoseconds(0)
                : std::min<std::chrono::nanoseconds>(
                      std::chrono::duration_cast<std::chrono::nanoseconds>(left), kSlice);
        const timespec time{.tv_sec = 0, .tv_nsec = static_cast<long>(slice.count())};
        pollfd keyboard{
            .fd = saved_->readsKeys ? STDIN_FILENO : -1, .events = POLLIN, .revents = 0};
        if (ppoll(&keyboard, 1, &time, nullptr) > 0) {
            char key = 0;
            if (read(STDIN_FILENO, &key, 1) == 1) {
                return key;
            }
            saved_->readsKeys = false;  // the terminal is gone
        }
        if (due) {
            break;
        }
    }
    return 0;
}

int LiveScreen::interrupted() noexcept {
    return arrivedSignal;
}

}  // namespace VexaTouch::Tools
