/* The smallest whole plug-in: properties go to its device and back, and each report that begins
 * with the bytes 2 and 0 becomes one vendor-defined event.
 *
 * Built with -DDEFECT=<name> it has just that one defect; Defects.h lists them.
 */
#define _POSIX_C_SOURCE 200809L

#include "Tests/Plugins/Defects.h"

#include <pthread.h>
#include <sched.h>
#include <semaphore.h>
#include <signal.h>
#include <stdatomic.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>
#include <unistd.h>
#include <vexa/vexa.h>

enum defect {
    None,
#define VEXA_NAME(defect, ...) defect,
    VEXA_DEFECTS(VEXA_NAME)
#undef VEXA_NAME
};
#ifndef DEFECT
#define DEFECT None
#endif

enum { kReportRoom = 512, kManyStarts = 700, kManyReferences = 100 };
static const char* const kMode = "SampleReports";

typedef struct sample_service sample_service;

/* One run of the input thread, from scheduling to unscheduling. But for the loop, all is fixed
 * before the thread starts. */
typedef struct input_run {
    sample_service* service; /* retained */
    vexa_device* device;     /* retained; may be NULL */
    vexa_queue* queue;       /* retained */
    vexa_event_callback callback;
    void* target;
    void* refcon;
    pthread_t thread;
    sem_t ready;         /* posted once `loop` is set */
    vexa_run_loop* loop; /* the thread's, retained */
    uint8_t report[kReportRoom];
} input_run;

struct sample_service {
    vexa_plugin_interface* plugin; /* the addresses of these two are the interface references */
    vexa_service_interface* service;
    vexa_plugin_interface plugin_table;
    vexa_service_interface service_table;
    atomic_uint references;
    vexa_device* device;
    vexa_event_callback callback;
    void* target;
    void* refcon;
    input_run* run; /* NULL while not scheduled */
    bool opened;
    bool stopped;
};

/* An event on its way to the host. */
typedef struct delivery {
    sample_service* service; /* retained */
    vexa_event* event;       /* retained */
    vexa_event_callback callback;
    void* target;
    void* refcon;
} delivery;

static bool has(enum defect defect) {
    return defect == DEFECT;
}

static void pause_ms(long milliseconds) {
    const struct timespec time = {.tv_sec = 0, .tv_nsec = milliseconds * 1000000};
    nanosleep(&time, NULL);
}

static bool same(vexa_identifier a, vexa_identifier b, size_t bytes) {
    return memcmp(a.bytes, b.bytes, bytes) == 0;
}

/* For the defects NoOwner and SharesOneService. */
static sample_service* last_made;

static sample_service* owner(void* self) {
    /* Both tables begin with the owner. */
    sample_service* service = (*(vexa_plugin_interface**)self)->_reserved;
    return has(NoOwner) && service == NULL ? last_made : service;
}

/* References */

/* A count that is read and written one after the other, while many references are held: nobody else
 * counts then. */
static bool counts_badly(sample_service* service) {
    return has(CountsWithoutAtomics) && atomic_load(&service->references) > kManyReferences;
}

static uint32_t retain(sample_service* service) {
    if (counts_badly(service)) {
        const unsigned before = atomic_load(&service->references);
        sched_yield();
        atomic_store(&service->references, before + 1);
        return before + 1;
    }
    return atomic_fetch_add(&service->references, 1) + 1;
}

static void destroy(sample_service* service) {
    if (has(AbortsDestroyedAfterStart) && service->device != NULL) abort();
    if (has(AbortsDestroyedWhileScheduled) && service->run != NULL) abort();
    if (!has(KeepsDeviceWhenDestroyed)) vexa_device_release(service->device);
    if (last_made == service) last_made = NULL;
    free(service);
}

static uint32_t release(sample_service* service) {
    if (counts_badly(service)) {
        const unsigned before = atomic_load(&service->references);
        sched_yield();
        atomic_store(&service->references, before - 1);
        return before - 1;
    }
    const unsigned left = atomic_fetch_sub(&service->references, 1) - 1;
    if (has(DestroyedEarly) && left == 1) {
        vexa_device_release(service->device);
        service->device = NULL;
    }
    if (left == 0) destroy(service);
    return left;
}

static uint32_t add_reference(void* self) {
    const uint32_t count = retain(owner(self));
    return has(CountsAreNonsense) ? 0 : count;
}

static uint32_t drop_reference(void* self) {
    return release(owner(self));
}

static vexa_status query_interface(void* self, vexa_identifier identifier, void** out) {
    /* 00000000-0000-0000-C000-000000000046 */
    static const vexa_identifier base = {{[8] = 0xC0, [15] = 0x46}};
    sample_service* service = owner(self);
    const size_t compared = has(AnswersNearlyRightInterface) ? 15 : sizeof identifier.bytes;
    if (same(identifier, VEXA_PLUGIN_INTERFACE, compared) ||
        (has(AnswersBaseInterface) && same(identifier, base, sizeof base.bytes))) {
        *out = has(AnswersOwnReference) ? self : &service->plugin;
    } else if (same(identifier, VEXA_SERVICE_INTERFACE, compared)) {
        *out = &service->service;
    } else {
        if (has(ClearsOutPointer)) *out = NULL;
        if (has(UnknownInterfaceAddsReference)) retain(service);
        return has(WrongInterfaceStatus) ? VEXA_STATUS_UNSUPPORTED : VEXA_STATUS_NO_INTERFACE;
    }
    retain(service);
    return VEXA_STATUS_SUCCESS;
}

/* The plug-in interface */

static vexa_status probe(void* self, const vexa_value* properties, uint32_t service,
                         int32_t* score) {
    (void)self;
    (void)service;
    (void)score;
    if (has(ProbeTakesServiceFirst) && vexa_value_get_count(properties) > 0) {
        /* Crashes, as the handle is no value. */
        (void)vexa_value_get_count((const vexa_value*)(uintptr_t)service);
    }
    if (has(ProbeReleasesProperties) && vexa_value_get_count(properties) > 0) {
        vexa_value_release(properties);
    }
    return VEXA_STATUS_SUCCESS;
}

static vexa_status start(void* self, const vexa_value* properties, uint32_t service) {
    static atomic_int starts;
    static void* volatile lost; /* or the compiler leaves it out */
    (void)lost;
    sample_service* owned = owner(self);
    (void)properties;
    if (atomic_fetch_add(&starts, 1) >= kManyStarts) {
        if (has(GivesUpAfterManyStarts)) return VEXA_STATUS_NO_RESOURCES;
        if (has(ExitsAfterManyStarts)) {
            fputs("that is all\n", stderr);
            exit(0);
        }
    }
    if (has(RewritesItsTable)) owned->plugin_table.revision = 1;
    if (has(LeaksMemory)) lost = malloc(40);
    if (has(LeaksValue)) (void)vexa_value_create_signed(1);
    if (has(LeaksDescriptor)) (void)!dup(STDERR_FILENO);
    vexa_device* device = NULL;
    if (has(StartTakesServiceFirst) && vexa_value_get_count(properties) > 0) {
        service = (uint32_t)(uintptr_t)properties;
    }
    if (has(StartsNeighbour)) device = vexa_device_create(service - 1);
    if (device == NULL) device = vexa_device_create(service);
    if (has(LeaksDevice)) vexa_device_retain(device);
    vexa_device_release(owned->device);
    owned->device = device;
    owned->stopped = false;
    if (has(StartsWithoutDevice)) return VEXA_STATUS_SUCCESS;
    return device != NULL ? VEXA_STATUS_SUCCESS : VEXA_STATUS_NO_RESOURCES;
}

static vexa_status stop(void* self) {
    sample_service* service = owner(self);
    while (has(HangsStoppedTwice) && service->stopped) pause_ms(900);
    service->stopped = true;
    vexa_device_release(service->device);
    service->device = NULL;
    return VEXA_STATUS_SUCCESS;
}

/* The service interface */

static bool open_device(void* self, uint32_t options) {
    sample_service* service = owner(self);
    if (has(CrashesBeforeStart) && service->device == NULL) raise(SIGSEGV);
    if (service->device == NULL) return false;
    if (has(AbortsOnSecondOpen) && service->opened) abort();
    service->opened = true;
    const vexa_status status = vexa_device_open(service->device, options);
    if (has(LosesDescriptorOnFailedOpen) && status == VEXA_STATUS_IO_ERROR) {
        (void)!dup(STDERR_FILENO);
    }
    return has(IgnoresOpenFailure) || status == VEXA_STATUS_SUCCESS;
}

static void close_device(void* self, uint32_t options) {
    sample_service* service = owner(self);
    if (service->device == NULL) return;
    if (has(AbortsWhenUnplugged) && !vexa_device_is_present(service->device)) abort();
    if (has(LosesDescriptorWhenUnplugged) && !vexa_device_is_present(service->device)) {
        (void)!dup(STDERR_FILENO);
    }
    service->opened = false;
    vexa_device_close(service->device, options);
}

/* What another program might store a value as. */
static vexa_value* narrowed(vexa_value* value) {
    vexa_value* other = NULL;
    int64_t number = 0;
    if (has(FloatsBecomeDoubles) && vexa_value_get_type(value) == VEXA_VALUE_FLOAT) {
        other = vexa_value_create_double((double)vexa_value_to_float(value));
    } else if (has(IntegersLoseTheirSign) && vexa_value_get_signed(value, &number) && number >= 0) {
        other = vexa_value_create_unsigned((uint64_t)number);
    } else if (has(StringsEndAtZero) && vexa_value_get_type(value) == VEXA_VALUE_STRING) {
        const char* text = vexa_value_get_string(value, NULL);
        other = vexa_value_create_string(text, strlen(text));
    }
    if (other == NULL) return value;
    vexa_value_release(value);
    return other;
}

static vexa_value* copy_property(void* self, const vexa_value* key) {
    static atomic_int inside;
    sample_service* service = owner(self);
    if (has(CrashesOnNullKey) && key == NULL) raise(SIGSEGV);
    if (service->device == NULL) return NULL;
    if (vexa_value_get_type(key) != VEXA_VALUE_STRING) return NULL;
    if (has(PropertiesNeedOneThread)) {
        const bool alone = atomic_fetch_add(&inside, 1) == 0;
        sched_yield();
        atomic_fetch_sub(&inside, 1);
        if (!alone) return NULL;
    }
    vexa_value* value = vexa_device_copy_property(service->device, key);
    if (has(AnswersUnknownKeys) && value == NULL) return vexa_value_create_null();
    if (has(LeaksProperty)) vexa_value_retain(value);
    return narrowed(value);
}

static bool set_property(void* self, const vexa_value* key, const vexa_value* value) {
    sample_service* service = owner(self);
    if (service->device == NULL) return false;
    if (vexa_value_get_type(key) != VEXA_VALUE_STRING && !has(TakesAnyKey)) return false;
    const bool taken = vexa_device_set_property(service->device, key, value);
    return taken || has(IgnoresRefusedProperty);
}

static void set_event_callback(void* self, vexa_event_callback callback, void* target,
                               void* refcon) {
    sample_service* service = owner(self);
    service->callback = callback;
    service->target = target;
    service->refcon = refcon;
    if (has(TakesLateCallback) && service->run != NULL) {
        service->run->callback = callback;
        service->run->target = target;
        service->run->refcon = refcon;
    }
}

static void deliver(void* context) {
    delivery* delivered = context;
    void* sender =
        has(WrongSender) ? (void*)&delivered->service->plugin : (void*)&delivered->service->service;
    delivered->callback(delivered->target, has(WrongRefcon) ? sender : delivered->refcon, sender,
                        delivered->event, has(DeliversOptions) ? 1 : 0);
    if (!has(LeaksEvent)) vexa_event_release(delivered->event);
    release(delivered->service);
    free(delivered);
}

static void send_event(const input_run* run, const uint8_t* report, size_t length,
                       uint64_t timestamp) {
    const vexa_vendor_record record = {.timestamp = timestamp,
                                       .usage_page = 0xFF60,
                                       .usage = 2,
                                       .payload = report,
                                       .payload_length = length};
    delivery* delivered = malloc(sizeof *delivered);
    if (delivered == NULL) return;
    *delivered = (delivery){.service = run->service,
                            .event = vexa_event_create_vendor_defined(&record),
                            .callback = run->callback,
                            .target = run->target,
                            .refcon = run->refcon};
    retain(run->service);
    if (has(DeliversOnInputThread)) {
        deliver(delivered);
        return;
    }
    if (delivered->event == NULL || !vexa_queue_submit(run->queue, deliver, delivered)) {
        vexa_event_release(delivered->event);
        release(run->service);
        free(delivered);
    }
}

static void* idle(void* milliseconds) {
    const long time = *(long*)milliseconds;
    free(milliseconds);
    while (time < 0) pause_ms(900);
    pause_ms(time);
    return NULL;
}

/* Negative: for ever. */
static void start_idle_thread(long milliseconds) {
    pthread_t thread;
    long* time = malloc(sizeof *time);
    *time = milliseconds;
    if (pthread_create(&thread, NULL, idle, time) == 0) pthread_detach(thread);
}

static void handle_report(void* context, vexa_status result, vexa_device* sender,
                          vexa_report_type type, uint32_t report_id, const uint8_t* report,
                          size_t length, uint64_t timestamp) {
    input_run* run = context;
    (void)result;
    (void)type;
    (void)report_id;
    vexa_trace(VEXA_TRACE_REPORT, length > 0 ? report[0] : 0, length > 1 ? report[1] : 0,
               length > 2 ? report[2] : 0, length > 3 ? report[3] : 0);
    if (has(CrashesOnLongReport) && length == 300 && report[1] == 0) raise(SIGSEGV);
    if (has(AbortsOnOddReport) && length > 0 && report[0] == 0xA5) abort();
    if (has(LeavesThreadBehind) && length == 3) start_idle_thread(-1);
    if (has(StopsReadingAfterLongReport) && length == 400 && report[1] == 0) {
        vexa_device_set_input_report_callback(sender, NULL, 0, NULL, NULL);
    }
    if (length >= 2 && report[0] == 2 && report[1] == 0 && run->callback != NULL) {
        send_event(run, report, length, timestamp);
    }
}

static void stop_loop(void* context) {
    vexa_run_loop_stop(context);
}

static void release_run(input_run* run) {
    vexa_run_loop_release(run->loop);
    vexa_device_release(run->device);
    vexa_queue_release(run->queue);
    sem_destroy(&run->ready);
    free(run);
}

static void* read_reports(void* context) {
    input_run* run = context;
    vexa_run_loop* loop = vexa_run_loop_retain(vexa_run_loop_current());
    run->loop = loop;
    if (run->device != NULL) {
        vexa_device_set_input_report_callback(run->device, run->report, sizeof run->report,
                                              handle_report, run);
        vexa_device_schedule(run->device, loop, kMode);
    }
    sem_post(&run->ready);
    vexa_run_loop_run(loop, kMode, VEXA_RUN_FOREVER, false);
    if (has(UnschedulesLate)) {
        /* The loop goes on as if nobody had asked it to stop. */
        vexa_run_loop_run(loop, kMode, UINT64_C(20000000), false);
    }
    if (run->device != NULL) {
        vexa_device_unschedule(run->device, loop, kMode);
        vexa_device_set_input_report_callback(run->device, run->report, sizeof run->report, NULL,
                                              NULL);
    }
    if (!has(AbortsDestroyedWhileScheduled)) release(run->service);
    if (has(UnschedulesLate)) release_run(run);
    return NULL;
}

static void schedule(void* self, vexa_queue* queue) {
    sample_service* service = owner(self);
    if (service->run != NULL) {
        if (has(AbortsOnSecondSchedule)) abort();
        return;
    }
    input_run* run = calloc(1, sizeof *run);
    if (run == NULL) return;
    run->service = service;
    if (!has(AbortsDestroyedWhileScheduled)) retain(service);
    run->device = vexa_device_retain(service->device);
    run->queue = vexa_queue_retain(queue);
    run->callback = service->callback;
    run->target = service->target;
    run->refcon = service->refcon;
    sem_init(&run->ready, 0, 0);
    if (pthread_create(&run->thread, NULL, read_reports, run) != 0) {
        release(service);
        release_run(run);
        return;
    }
    while (sem_wait(&run->ready) != 0) {
    }
    service->run = run;
    if (has(LingersAfterUnloading)) start_idle_thread(20);
}

static void unschedule(void* self, vexa_queue* queue) {
    sample_service* service = owner(self);
    input_run* run = service->run;
    (void)queue;
    if (run == NULL) return;
    service->run = NULL;
    const pthread_t thread = run->thread;
    vexa_run_loop_submit(run->loop, kMode, stop_loop, NULL, run->loop);
    if (has(UnschedulesLate)) {
        pthread_detach(thread);
        return;
    }
    pthread_join(thread, NULL);
    release_run(run);
}

static vexa_event* copy_event(void* self, uint32_t type, vexa_event* matching, uint32_t options) {
    (void)self;
    (void)type;
    (void)options;
    if (has(AbortsOnEventQuery) && matching != NULL) abort();
    return NULL;
}

static vexa_status set_output_event(void* self, vexa_event* event) {
    (void)self;
    if (has(KeepsOutputEvent)) vexa_event_retain(event);
    return VEXA_STATUS_UNSUPPORTED;
}

/* The factory */

static sample_service* create(void) {
    sample_service* service = calloc(1, sizeof *service);
    if (service == NULL) return NULL;
    service->plugin = &service->plugin_table;
    service->service = &service->service_table;
    service->plugin_table = (vexa_plugin_interface){._reserved = service,
                                                    .QueryInterface = query_interface,
                                                    .AddRef = add_reference,
                                                    .Release = drop_reference,
                                                    .version = has(WrongVersion) ? 2 : 1,
                                                    .revision = 0,
                                                    .Probe = probe,
                                                    .Start = start,
                                                    .Stop = stop};
    service->service_table =
        (vexa_service_interface){._reserved = has(NoOwner) ? NULL : service,
                                 .QueryInterface = query_interface,
                                 .AddRef = add_reference,
                                 .Release = drop_reference,
                                 .open = open_device,
                                 .close = close_device,
                                 .copyProperty = copy_property,
                                 .setProperty = set_property,
                                 .setEventCallback = set_event_callback,
                                 .scheduleWithDispatchQueue = schedule,
                                 .unscheduleFromDispatchQueue = unschedule,
                                 .copyEvent = has(MissingSlot) ? NULL : copy_event,
                                 .setOutputEvent = set_output_event};
    atomic_init(&service->references, has(FactoryKeepsReference) ? 2 : 1);
    last_made = service;
    return service;
}

VEXA_API void* VexaTouchHIDServiceFactory(void* allocator, vexa_identifier type);

VEXA_API void* VexaTouchHIDServiceFactory(void* allocator, vexa_identifier type) {
    const size_t compared = has(AnswersNearlyRightType) ? 12 : sizeof type.bytes;
    if (!vexa_abi_serves(VEXA_ABI_VERSION) || has(AnswersNothing)) return NULL;
    if (!same(type, VEXA_HID_SERVICE_PLUGIN_TYPE, compared) && !has(AnswersAnyType)) return NULL;
    if (has(SharesOneService) && last_made != NULL) {
        retain(last_made);
        return &last_made->plugin;
    }
    if (has(RefusesAllocator) && allocator != NULL) return NULL;
    sample_service* service = create();
    return service != NULL ? &service->plugin : NULL;
}
