/* A plug-in for the tests of hosts: it notes every call and fails where it is told to. When it is
 * unscheduled it hands one last event to the queue. */
#include "Tests/Host/SamplePlugin.h"

#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <vexa/vexa.h>

typedef struct service {
    vexa_plugin_interface plugin_table;
    vexa_service_interface service_table;
    vexa_plugin_interface* plugin;
    vexa_service_interface* service;
    uint32_t references;
    vexa_event_callback callback;
    void* target;
    void* refcon;
} service;

static sample_plugin plugin;

static void note(const char* line) {
    const size_t used = strlen(plugin.journal);
    snprintf(plugin.journal + used, sizeof plugin.journal - used, "%s\n", line);
}

/* Both interface references begin with a pointer to a table that begins with the object. */
static service* owner(void* self) {
    return *(service**)*(void**)self;
}

static uint32_t add_reference(void* self) {
    note("AddRef");
    return ++owner(self)->references;
}

static uint32_t release(void* self) {
    service* object = owner(self);
    note("Release");
    const uint32_t left = --object->references;
    if (left == 0) {
        --plugin.live;
        free(object);
    }
    return left;
}

static vexa_status query_interface(void* self, vexa_identifier identifier, void** out) {
    service* object = owner(self);
    note("QueryInterface");
    if (plugin.failure == SAMPLE_HAS_NO_SERVICE_INTERFACE ||
        memcmp(&identifier, &VEXA_SERVICE_INTERFACE, sizeof identifier) != 0) {
        return VEXA_STATUS_NO_INTERFACE;
    }
    ++object->references;
    *out = &object->service;
    return VEXA_STATUS_SUCCESS;
}

static vexa_status probe(void* self, const vexa_value* properties, uint32_t handle,
                         int32_t* score) {
    char line[96];
    (void)self;
    snprintf(line, sizeof line, "Probe device %u, %zu properties, score %d", handle,
             vexa_value_get_count(properties), *score);
    note(line);
    *score = 5;
    return plugin.failure == SAMPLE_PROBE_FAILS ? VEXA_STATUS_UNSUPPORTED : VEXA_STATUS_SUCCESS;
}

static vexa_status start(void* self, const vexa_value* properties, uint32_t handle) {
    char line[96];
    (void)self;
    snprintf(line, sizeof line, "Start device %u, %zu properties", handle,
             vexa_value_get_count(properties));
    note(line);
    return plugin.failure == SAMPLE_START_FAILS ? VEXA_STATUS_NO_RESOURCES : VEXA_STATUS_SUCCESS;
}

static vexa_status stop(void* self) {
    (void)self;
    note("Stop");
    return plugin.failure == SAMPLE_STOP_FAILS ? VEXA_STATUS_IO_ERROR : VEXA_STATUS_SUCCESS;
}

static bool open_device(void* self, uint32_t options) {
    char line[32];
    (void)self;
    snprintf(line, sizeof line, "open %u", options);
    note(line);
    return plugin.failure != SAMPLE_OPEN_FAILS;
}

static void close_device(void* self, uint32_t options) {
    char line[32];
    (void)self;
    snprintf(line, sizeof line, "close %u", options);
    note(line);
}

/* The key itself, so that a host sees that it arrived. */
static vexa_value* copy_property(void* self, const vexa_value* key) {
    (void)self;
    return vexa_value_retain(key);
}

static bool set_property(void* self, const vexa_value* key, const vexa_value* value) {
    char line[96];
    (void)self;
    snprintf(line, sizeof line, "setProperty %s = %llu", vexa_value_get_string(key, NULL),
             (unsigned long long)vexa_value_to_unsigned(value));
    note(line);
    return vexa_value_to_unsigned(value) != 0;
}

static void set_event_callback(void* self, vexa_event_callback callback, void* target,
                               void* refcon) {
    service* object = owner(self);
    note("setEventCallback");
    object->callback = callback;
    object->target = target;
    object->refcon = refcon;
}

static void schedule(void* self, vexa_queue* queue) {
    (void)self;
    note(queue != NULL ? "schedule" : "schedule without a queue");
}

static void deliver(void* context) {
    service* object = context;
    const vexa_vendor_record record = {.usage_page = 0xFF60, .usage = 2};
    vexa_event* event = vexa_event_create_vendor_defined(&record);
    object->callback(object->target, object->refcon, &object->service, event, 0);
    vexa_event_release(event);
}

static void unschedule(void* self, vexa_queue* queue) {
    note("unschedule");
    vexa_queue_submit(queue, deliver, owner(self));
}

static vexa_event* copy_event(void* self, uint32_t type, vexa_event* matching, uint32_t options) {
    (void)self;
    (void)type;
    (void)options;
    return vexa_event_retain(matching);
}

static vexa_status set_output_event(void* self, vexa_event* event) {
    (void)self;
    (void)event;
    return VEXA_STATUS_UNSUPPORTED;
}

VEXA_API sample_plugin* sample_plugin_access(void);
sample_plugin* sample_plugin_access(void) {
    plugin.note = note;
    return &plugin;
}

/* An interface reference whose table is missing. */
static vexa_plugin_interface* no_table = NULL;

VEXA_API void* VexaTouchHIDServiceFactory(void* allocator, vexa_identifier type);
void* VexaTouchHIDServiceFactory(void* allocator, vexa_identifier type) {
    (void)allocator;
    if (plugin.failure == SAMPLE_FACTORY_MAKES_NOTHING ||
        memcmp(&type, &VEXA_HID_SERVICE_PLUGIN_TYPE, sizeof type) != 0) {
        return NULL;
    }
    service* object = calloc(1, sizeof *object);
    if (object == NULL) {
        return NULL;
    }
    object->plugin_table = (vexa_plugin_interface){
        object, query_interface, add_reference, release, 1, 0, probe, start, stop};
    object->service_table = (vexa_service_interface){
        object,          query_interface, add_reference,      release,  open_device, close_device,
        copy_property,   set_property,    set_event_callback, schedule, unschedule,  copy_event,
        set_output_event};
    object->plugin = &object->plugin_table;
    object->service = &object->service_table;
    object->references = 1;
    ++plugin.live;
    switch (plugin.failure) {
        case SAMPLE_TABLE_IS_MISSING:
            /* What nobody can release is not made. */
            free(object);
            --plugin.live;
            note("factory");
            return &no_table;
        case SAMPLE_VERSION_IS_2:
            object->plugin_table.version = 2;
            break;
        case SAMPLE_SLOT_IS_EMPTY:
            object->plugin_table.Start = NULL;
            break;
        case SAMPLE_SERVICE_SLOT_IS_EMPTY:
            object->service_table.copyProperty = NULL;
            break;
        default:
            break;
    }
    note("factory");
    return &object->plugin;
}
