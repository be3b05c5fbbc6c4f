/* A host in plain C, from the public headers alone.
 *
 * usage: PlainHost PLUGIN INPUT
 *
 * Takes a plug-in through its whole life by the slots of its tables, sends it the input through a
 * back-end of its own and prints each event as a JSON object on a line. A line of the input is one
 * report as hexadecimal bytes with spaces between them ("-" is the empty report), or a property to
 * set, "KEY = VALUE" with a number, true, false or null. Exit status 0, or 1 with a line on
 * standard error.
 */
#define _POSIX_C_SOURCE 200809L

#include <dlfcn.h>
#include <errno.h>
#include <sched.h>
#include <semaphore.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>
#include <vexa/vexa.h>

#define LONGEST_REPORT 512
#define LONGEST_LINE (4 * LONGEST_REPORT)

/* -- the device -- */

typedef struct surface {
    int ours;      /* the end that reports go into, -1 while closed */
    sem_t handled; /* posted for each report that the service is done with */
} surface;

static vexa_status device_open(void* context, uint32_t options, int* descriptor) {
    surface* self = context;
    int ends[2];
    (void)options;
    if (socketpair(AF_UNIX, SOCK_SEQPACKET, 0, ends) != 0) {
        return VEXA_STATUS_NO_RESOURCES;
    }
    self->ours = ends[0];
    *descriptor = ends[1];
    return VEXA_STATUS_SUCCESS;
}

static void device_close(void* context, uint32_t options) {
    surface* self = context;
    (void)options;
    close(self->ours);
    self->ours = -1;
}

static void device_report_handled(void* context) {
    surface* self = context;
    sem_post(&self->handled);
}

/* Sends a report and waits until the service has taken it. */
static bool device_send(surface* self, const uint8_t* report, size_t length) {
    if (send(self->ours, report, length, MSG_NOSIGNAL) != (ssize_t)length) {
        return false;
    }
    while (sem_wait(&self->handled) != 0) {
        if (errno != EINTR) {
            return false;
        }
    }
    return true;
}

/* -- the events -- */

static const char* digitizer_kind(uint32_t phase) {
    switch (phase) {
        case VEXA_EVENT_PHASE_MAY_BEGIN:
            return "may-begin";
        case VEXA_EVENT_PHASE_BEGAN:
            return "hold-start";
        case VEXA_EVENT_PHASE_CHANGED:
            return "hold-change";
        case VEXA_EVENT_PHASE_ENDED:
            return "hold-end";
        case VEXA_EVENT_PHASE_CANCELLED:
            return "cancel";
        default:
            return "tap";
    }
}

typedef struct audience {
    void* sender;  /* what events must name */
    bool deceived; /* an event came with a wrong argument */
} audience;

/* On the queue's thread. */
static void take_event(void* target, void* refcon, void* sender, vexa_event* event,
                       uint32_t options) {
    audience* self = target;
    vexa_digitizer_record record;
    if (refcon != &self->sender || sender != self->sender || options != 0) {
        self->deceived = true;
    }
    if (vexa_event_get_digitizer(event, &record)) {
        const uint32_t phase = vexa_event_get_phase(event);
        printf("{\"frame\":%lld,\"kind\":\"%s\",\"region\":%d,\"phase\":%u,\"mask\":%u}\n",
               (long long)vexa_event_get_integer(event, VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER),
               digitizer_kind(phase), (int)record.y, phase, record.event_mask);
    } else {
        printf("{\"frame\":0,\"kind\":\"firmware-reset\",\"region\":0,\"phase\":%u,\"mask\":0}\n",
               vexa_event_get_phase(event));
    }
}

/* -- the input -- */

/* The bytes of a line, or -1 when it is none of hexadecimal bytes. */
static int parse_report(const char* line, uint8_t* report) {
    int length = 0;
    if (strcmp(line, "-") == 0) {
        return 0;
    }
    while (*line != '\0') {
        char* end = NULL;
        const unsigned long byte = strtoul(line, &end, 16);
        if (end != line + 2 || byte > 0xFF || length == LONGEST_REPORT) {
            return -1;
        }
        report[length++] = (uint8_t)byte;
        line = *end == ' ' ? end + 1 : end;
    }
    return length;
}

static vexa_value* parse_value(const char* text) {
    char* end = NULL;
    if (strcmp(text, "null") == 0) {
        return vexa_value_create_null();
    }
    if (strcmp(text, "true") == 0 || strcmp(text, "false") == 0) {
        return vexa_value_create_boolean(text[0] == 't');
    }
    const double number = strtod(text, &end);
    return end != text && *end == '\0' ? vexa_value_create_double(number) : NULL;
}

static bool set_property(vexa_service_interface** service, char* line) {
    char* equals = strstr(line, " = ");
    if (equals == NULL) {
        return false;
    }
    vexa_value* key = vexa_value_create_string(line, (size_t)(equals - line));
    vexa_value* value = parse_value(equals + 3);
    const bool taken = value != NULL && (*service)->setProperty(service, key, value);
    vexa_value_release(value);
    vexa_value_release(key);
    return taken;
}

static bool play(FILE* input, surface* device, vexa_service_interface** service) {
    char line[LONGEST_LINE];
    uint8_t report[LONGEST_REPORT];
    while (fgets(line, sizeof line, input) != NULL) {
        line[strcspn(line, "\n")] = '\0';
        const int length = parse_report(line, report);
        if (length >= 0 ? !device_send(device, report, (size_t)length)
                        : !set_property(service, line)) {
            fprintf(stderr, "PlainHost: not taken: %s\n", line);
            return false;
        }
    }
    return true;
}

/* -- the life of the plug-in -- */

static bool has_version_13(vexa_service_interface** service) {
    vexa_value* key = vexa_value_create_string("Version", strlen("Version"));
    vexa_value* version = (*service)->copyProperty(service, key);
    const bool right = vexa_value_get_count(version) == 3 &&
                       vexa_value_to_unsigned(vexa_value_get_element(version, 0)) == 13;
    vexa_value_release(version);
    vexa_value_release(key);
    return right;
}

/* From scheduling to unscheduling; the first step that failed, or NULL. */
static const char* run_scheduled(vexa_service_interface** service, surface* device, FILE* input) {
    const char* failed = NULL;
    audience listener = {service, false};
    vexa_queue* queue = vexa_queue_create("plain-host");
    if (queue == NULL) {
        return "vexa_queue_create";
    }
    (*service)->setEventCallback(service, take_event, &listener, &listener.sender);
    (*service)->scheduleWithDispatchQueue(service, queue);
    if (!(*service)->open(service, 0)) {
        failed = "open";
    } else {
        if (!has_version_13(service)) {
            failed = "copyProperty";
        } else if (!play(input, device, service)) {
            failed = "play";
        }
        (*service)->close(service, 0);
    }
    (*service)->unscheduleFromDispatchQueue(service, queue);
    vexa_queue_drain(queue);
    vexa_queue_release(queue);
    return failed == NULL && listener.deceived ? "callback" : failed;
}

static const char* run_started(vexa_plugin_interface** plugin, vexa_service_interface** service,
                               uint32_t handle, surface* device, FILE* input) {
    int32_t score = 1234;
    const char* failed = NULL;
    vexa_value* properties = vexa_value_create_dictionary(NULL, NULL, 0);
    if ((*plugin)->Probe(plugin, properties, handle, &score) != VEXA_STATUS_SUCCESS) {
        failed = "Probe";
    } else if (score != 1234) {
        failed = "Probe changed the score";
    } else if ((*plugin)->Start(plugin, properties, handle) != VEXA_STATUS_SUCCESS) {
        failed = "Start";
    } else {
        failed = run_scheduled(service, device, input);
        if ((*plugin)->Stop(plugin) != VEXA_STATUS_SUCCESS && failed == NULL) {
            failed = "Stop";
        }
    }
    vexa_value_release(properties);
    return failed;
}

static const char* run(vexa_plugin_factory factory, uint32_t handle, surface* device, FILE* input) {
    vexa_plugin_interface** plugin = factory(NULL, VEXA_HID_SERVICE_PLUGIN_TYPE);
    vexa_service_interface** service = NULL;
    void* interface = NULL;
    const char* failed = NULL;
    if (plugin == NULL) {
        return VEXA_PLUGIN_FACTORY_NAME;
    }
    if ((*plugin)->QueryInterface(plugin, VEXA_SERVICE_INTERFACE, &interface) !=
        VEXA_STATUS_SUCCESS) {
        failed = "QueryInterface";
    } else {
        service = interface;
        failed = run_started(plugin, service, handle, device, input);
        (*service)->Release(service);
    }
    (*plugin)->Release(plugin);
    return failed;
}

/* What still lives, or NULL. */
static const char* living(void) {
    static const char* const names[] = {"value", "event", "queue", "device", "run loop"};
    for (size_t kind = 0; kind < sizeof names / sizeof *names; ++kind) {
        if (vexa_live_objects((vexa_object_kind)kind) != 0) {
            return names[kind];
        }
    }
    return NULL;
}

/* What is left over, or NULL. The input thread has done its work when unscheduling returns, but may
 * still be about to let go of what it held. */
static const char* leftover(void) {
    const int manyTimes = 5000000;
    for (int i = 0; i < manyTimes && living() != NULL; ++i) {
        sched_yield();
    }
    return living();
}

static int fail(const char* what, const char* why) {
    fprintf(stderr, "PlainHost: %s: %s\n", what, why);
    return EXIT_FAILURE;
}

int main(int argc, char** argv) {
    vexa_plugin_factory factory = NULL;
    static surface device = {.ours = -1};
    const vexa_device_backend backend = {.size = sizeof backend,
                                         .open = device_open,
                                         .close = device_close,
                                         .report_handled = device_report_handled};
    if (argc != 3) {
        return fail("usage", "PlainHost PLUGIN INPUT");
    }
    if (!vexa_abi_serves(VEXA_ABI_VERSION)) {
        return fail("libvexaplatform", "another ABI");
    }
    void* library = dlopen(argv[1], RTLD_NOW | RTLD_LOCAL);
    if (library == NULL) {
        return fail(argv[1], dlerror());
    }
    /* ISO C has no way from an object pointer to a function pointer; POSIX says that this works. */
    *(void**)&factory = dlsym(library, VEXA_PLUGIN_FACTORY_NAME);
    if (factory == NULL) {
        return fail(argv[1], "no factory");
    }
    FILE* input = fopen(argv[2], "r");
    if (input == NULL) {
        return fail(argv[2], strerror(errno));
    }
    sem_init(&device.handled, 0, 0);
    const uint32_t handle = vexa_service_register(&backend, &device);
    const char* failed = run(factory, handle, &device, input);
    vexa_service_unregister(handle);
    sem_destroy(&device.handled);
    fclose(input);
    dlclose(library);
    if (failed != NULL) {
        return fail(failed, "failed");
    }
    if (leftover() != NULL) {
        return fail(leftover(), "left over");
    }
    return fflush(stdout) == 0 ? EXIT_SUCCESS : fail("standard output", strerror(errno));
}
