#include "Tools/CommandLine.h"

#include <fcntl.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <iostream>
#include <string>
#include <vector>

namespace {

/// What is opened next must not become a standard stream that the caller has closed: messages would
/// be written into a result. False when /dev/null cannot be had.
bool keepStandardStreams() {
    for (;;) {
        const int descriptor = open("/dev/null", O_RDWR);
        if (descriptor < 0) {
            return false;
        }
        if (descriptor > STDERR_FILENO) {
            return close(descriptor) == 0;
        }
    }
}

}  // namespace

int main(int argc, char** argv) {
    if (!keepStandardStreams()) {
        return VexaTouch::Tools::kExitFailure;
    }
    std::ios::sync_with_stdio(false);
    std::cin.tie(nullptr);
    VexaTouch::Tools::Streams streams{.in = std::cin, .out = std::cout, .error = std::cerr};
    streams.outIsTerminal = isatty(STDOUT_FILENO) == 1;
    streams.errorIsTerminal = isatty(STDERR_FILENO) == 1;
    winsize size{};
    if (ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 0) {
        streams.columns = size.ws_col;
        streams.rows = size.ws_row;
    }
    const std::vector<std::string> arguments(argv + (argc > 0 ? 1 : 0), argv + argc);
    try {
        return VexaTouch::Tools::CommandLine::run(arguments, streams);
    } catch (const std::exception& error) {
        std::cerr << "vexatouch: " << error.what() << '\n';
        return VexaTouch::Tools::kExitFailure;
    }
}
