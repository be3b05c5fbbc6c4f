/* The smallest host: loads a plug-in, gives it a device that tells of one firmware reset, and
 * prints the event that comes of it.
 *
 *     cc -std=c11 smallest-host.c -lvexaplatform -o smallest-host
 *     ./smallest-host ./libVexaTouchHIDService.so
 */
#define _POSIX_C_SOURCE 200809L

#include <dlfcn.h>
#include <semaphore.h>
#include <stdio.h>
#include <sys/socket.h>
#include <unistd.h>
#include <vexa/vexa.h>

/* The device: one end of a socket pair, of which each packet is a report. */
static int reports = -1;

static vexa_status open_device(void* context, uint32_t options, int* descriptor) {
    int ends[2];
    (void)context;
    (void)options;
    if (socketpair(AF_UNIX, SOCK_SEQPACKET, 0, ends) != 0) return VEXA_STATUS_NO_RESOURCES;
    reports = ends[0];
    *descriptor = ends[1];
    return VEXA_STATUS_SUCCESS;
}

static void close_device(void* context, uint32_t options) {
    (void)context;
    (void)options;
    close(reports);
}

/* Runs on the queue's thread. */
static void event_came(void* target, void* refcon, void* sender, vexa_event* event,
                       uint32_t options) {
    (void)refcon;
    (void)sender;
    (void)options;
    printf("type %u, phase %u\n", vexa_event_get_type(event), vexa_event_get_phase(event));
    sem_post(target);
}

static int fail(const char* what) {
    fprintf(stderr, "smallest-host: %s\n", what);
    return 1;
}

int main(int count, char** arguments) {
    static const uint8_t firmware_reset[10] = {2, 0};
    const vexa_device_backend backend = {
        .size = sizeof backend, .open = open_device, .close = close_device};
    vexa_plugin_interface** plugin;
    vexa_service_interface** service;
    int32_t score = 0;
    sem_t came;

    if (!vexa_abi_serves(VEXA_ABI_VERSION)) return fail("another ABI");
    void* library = dlopen(count > 1 ? arguments[1] : "./libVexaTouchHIDService.so", RTLD_NOW);
    if (!library) return fail(dlerror());
    vexa_plugin_factory factory;
    *(void**)&factory = dlsym(library, VEXA_PLUGIN_FACTORY_NAME);
    if (!factory) return fail("no factory");

    plugin = factory(NULL, VEXA_HID_SERVICE_PLUGIN_TYPE);
    if (!plugin) return fail("the factory makes no HID service");
    if ((*plugin)->QueryInterface(plugin, VEXA_SERVICE_INTERFACE, (void**)&service) != 0) {
        return fail("no service interface");
    }
    const uint32_t handle = vexa_service_register(&backend, NULL);
    vexa_queue* queue = vexa_queue_create("events");
    sem_init(&came, 0, 0);

    if ((*plugin)->Probe(plugin, NULL, handle, &score) != 0) return fail("Probe");
    if ((*plugin)->Start(plugin, NULL, handle) != 0) return fail("Start");
    (*service)->setEventCallback(service, event_came, &came, NULL);
    (*service)->scheduleWithDispatchQueue(service, queue);
    if (!(*service)->open(service, 0)) return fail("open");

    if (send(reports, firmware_reset, sizeof firmware_reset, 0) < 0) return fail("send");
    sem_wait(&came);

    (*service)->close(service, 0);
    (*service)->unscheduleFromDispatchQueue(service, queue);
    (*plugin)->Stop(plugin);
    (*service)->Release(service);
    (*plugin)->Release(plugin);
    vexa_queue_drain(queue); /* what is left of the events may still be on it */
    vexa_queue_release(queue);
    vexa_service_unregister(handle);
    dlclose(library);
    return 0;
}
