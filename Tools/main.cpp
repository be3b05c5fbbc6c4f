#include "Tools/CommandLine.h"

#include <fcntl.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <iostream>
#include <string>
#include <vector>

namespace {

/// What is opened next must not become a standard stream that the caller has closed: messages would
/// be written into a result. What stands there instead is open the wrong way round, so that whoever
/// uses it learns that it is closed. False when it cannot be had.
bool keepStandardStreams() {
    for (const int number : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        const bool isClosed = fcntl(number, F_GETFD) < 0;
        const int wrongWay = number == STDIN_FILENO ? O_WRONLY : O_RDONLY;
        if (isClosed && open("/dev/null", wrongWay) != number) {
            return false;
        }
    }
    return true;
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
