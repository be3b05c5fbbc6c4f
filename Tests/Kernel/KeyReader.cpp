// usage: KeyReader NAME
//
// Waits for the input device of that name, says "reading /dev/input/eventN" on standard error and
// prints a line for each of its key events until the device is gone: the seconds of the kernel's
// monotonic clock, the key, and "press", "release" or "repeat", as "12.345678 KEY_VOLUMEUP press".

#include "Tests/Kernel/KeyDevice.h"

#include <libevdev/libevdev.h>

#include <array>
#include <chrono>
#include <cstdio>
#include <exception>
#include <iostream>
#include <string>

namespace {

const char* actionOf(int value) {
    static constexpr std::array<const char*, 3> kActions = {"release", "press", "repeat"};
    return value >= 0 && value < 3 ? kActions.at(static_cast<std::size_t>(value)) : "?";
}

void print(const input_event& event) {
    const char* key = libevdev_event_code_get_name(event.type, event.code);
    std::printf("%lld.%06lld %s %s\n", static_cast<long long>(event.input_event_sec),
                static_cast<long long>(event.input_event_usec), key == nullptr ? "?" : key,
                actionOf(event.value));
}

}  // namespace

int main(int count, char** arguments) {
    try {
        const VexaTouch::Testing::KeyDevice device(count == 2 ? arguments[1] : "",
                                                   std::chrono::seconds(20));
        std::cerr << "reading " << device.node() << std::endl;
        input_event event{};
        while (device.read(event)) {
            if (event.type == EV_KEY) {
                print(event);
            } else if (event.type == EV_SYN && event.code == SYN_DROPPED) {
                std::printf("events were lost\n");
            }
            std::fflush(stdout);
        }
        return 0;
    } catch (const std::exception& fault) {
        std::cerr << "KeyReader: " << fault.what() << '\n';
        return 1;
    }
}
