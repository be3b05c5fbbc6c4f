/* Takes more than a second to load. */
#define _POSIX_C_SOURCE 200809L

#include <time.h>

__attribute__((constructor)) static void take_long(void) {
    const struct timespec time = {.tv_sec = 1, .tv_nsec = 200000000};
    nanosleep(&time, NULL);
}
