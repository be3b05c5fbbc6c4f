#include "Tools/CommandLine.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <iostream>
#include <string>
#include <vector>

int main(int argc, char** argv) {
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
