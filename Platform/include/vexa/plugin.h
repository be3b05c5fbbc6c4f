/* The interface between a host and a HID service plug-in.
 *
 * A plug-in is a shared object that exports one function, VexaTouchHIDServiceFactory. The factory
 * makes a service and returns its plug-in interface; QueryInterface gives the other one. An
 * interface reference is a pointer to a pointer to a table; it is the first argument of every slot:
 *
 *     vexa_plugin_interface** plugin = factory(NULL, VEXA_HID_SERVICE_PLUGIN_TYPE);
 *     vexa_service_interface** service = NULL;
 *     (*plugin)->QueryInterface(plugin, VEXA_SERVICE_INTERFACE, (void**)&service);
 *
 * The order of a host: factory, Probe, Start, setEventCallback, scheduleWithDispatchQueue, open,
 * then properties and events as they come, close, unscheduleFromDispatchQueue, Stop, Release. The
 * slots of one service are called by one thread at a time, except copyProperty and setProperty,
 * which any threads may call at any time between Start and Stop, also while the others run.
 * [order] marks where a slot stands in that order.
 */
#ifndef VEXA_PLUGIN_H
#define VEXA_PLUGIN_H

#include <vexa/abi.h>
#include <vexa/event.h>
#include <vexa/queue.h>
#include <vexa/status.h>
#include <vexa/value.h>

/* An identifier: 16 bytes, passed by value, equal when all bytes are. */
typedef struct vexa_identifier {
    uint8_t bytes[16];
} vexa_identifier;

#define VEXA_IDENTIFIER_INIT_(...) \
    {                              \
        {                          \
            __VA_ARGS__            \
        }                          \
    }

/* Selects the factory of HID services. */
static const vexa_identifier VEXA_HID_SERVICE_PLUGIN_TYPE = VEXA_IDENTIFIER_INIT_(
    0x0D, 0xC7, 0x05, 0xB2, 0x6C, 0x28, 0x4E, 0x2F, 0x97, 0x1A, 0x30, 0x7A, 0xFA, 0x69, 0x1F, 0x3D);
/* Answered by QueryInterface with the plug-in interface. */
static const vexa_identifier VEXA_PLUGIN_INTERFACE = VEXA_IDENTIFIER_INIT_(
    0x5B, 0xB2, 0xA4, 0xB3, 0x48, 0x2D, 0x42, 0x51, 0x82, 0xE9, 0x74, 0xB4, 0x21, 0x72, 0x86, 0x2C);
/* Answered by QueryInterface with the service interface (version 2). */
static const vexa_identifier VEXA_SERVICE_INTERFACE = VEXA_IDENTIFIER_INIT_(
    0xFE, 0x55, 0xA5, 0x4B, 0x63, 0xAB, 0x48, 0xA6, 0x8D, 0x28, 0xD9, 0x75, 0x2B, 0x68, 0x86, 0x4E);

/* Called on the host's queue for each event. The event is good during the call; retain it to keep
 * it. `sender` is the service interface reference, `options` 0. */
typedef void (*vexa_event_callback)(void* target, void* refcon, void* sender, vexa_event* event,
                                    uint32_t options);

/* The three slots that both tables begin with. `self` is either interface reference.
 *
 * QueryInterface: for the two interface identifiers above, stores the reference, adds one
 * reference to the service and returns 0; otherwise returns VEXA_STATUS_NO_INTERFACE and leaves
 * `*out` alone; `out` is never NULL. AddRef and Release return the new count, for information only.
 * [any thread] */
#define VEXA_UNKNOWN_SLOTS_                                                            \
    /* The owning object; belongs to the plug-in. */                                   \
    void* _reserved;                                                                   \
    vexa_status (*QueryInterface)(void* self, vexa_identifier identifier, void** out); \
    uint32_t (*AddRef)(void* self);                                                    \
    uint32_t (*Release)(void* self)

typedef struct vexa_plugin_interface {
    VEXA_UNKNOWN_SLOTS_;
    uint16_t version;  /* 1 */
    uint16_t revision; /* 0 */
    /* [after the factory] May change `*score`, how well the service fits (this service never does).
     * 0 when the service takes part. */
    vexa_status (*Probe)(void* self, const vexa_value* properties, uint32_t service,
                         int32_t* score);
    /* [after Probe] Takes the device of this service handle. 0, or VEXA_STATUS_NO_RESOURCES when
     * there is none: the service then has no device, and the host releases it. */
    vexa_status (*Start)(void* self, const vexa_value* properties, uint32_t service);
    /* [after close and unscheduling] Gives the device back. 0. */
    vexa_status (*Stop)(void* self);
} vexa_plugin_interface;

typedef struct vexa_service_interface {
    VEXA_UNKNOWN_SLOTS_;
    /* [after Start] Opens the device. True exactly when the device says so; false when it is open
     * already, is gone, refuses or is not there, and nothing has changed then. */
    bool (*open)(void* self, uint32_t options);
    /* [after open] Closes the device; nothing happens when it is not open. */
    void (*close)(void* self, uint32_t options);
    /* [Start to Stop, any thread] The value with one reference that the caller owns, or NULL. `key`
     * is a string value; NULL or anything else gives NULL. */
    vexa_value* (*copyProperty)(void* self, const vexa_value* key);
    /* [Start to Stop, any thread] Whether the value was taken. Keys of the domain "Pipeline" always
     * are; all others are the device's to take. False when `key` is NULL or no string. */
    bool (*setProperty)(void* self, const vexa_value* key, const vexa_value* value);
    /* [before scheduling] Where events go; without a callback they are dropped. What is set later
     * is for the next scheduling. `target` and `refcon` stay good until the host has unscheduled
     * and then drained the queue (vexa_queue_drain): releasing the queue does not wait, since what
     * was submitted holds it. */
    void (*setEventCallback)(void* self, vexa_event_callback callback, void* target, void* refcon);
    /* [after setEventCallback] Starts the input thread and returns when it runs, or when it could
     * not be started (which is logged; no report is then read). Events are delivered on `queue`,
     * which the service retains until it is unscheduled. Not on the input thread, and not twice
     * without unscheduling: the first thread could never be stopped. */
    void (*scheduleWithDispatchQueue)(void* self, vexa_queue* queue);
    /* [after scheduling] Returns when the input thread has done its work: its probes are gone and
     * the device is unscheduled. Events that are on the queue already still come; vexa_queue_drain
     * waits for the last one. `queue` is not looked at. Not on the input thread, so not
     * within a sink of the trace points that runs there either: it waits forever, a debug build
     * aborts. */
    void (*unscheduleFromDispatchQueue)(void* self, vexa_queue* queue);
    /* [after Start] An event with one reference that the caller owns, or NULL (always so for this
     * service). `matching` may be NULL. */
    vexa_event* (*copyEvent)(void* self, uint32_t type, vexa_event* matching, uint32_t options);
    /* [after Start] VEXA_STATUS_UNSUPPORTED for this service. */
    vexa_status (*setOutputEvent)(void* self, vexa_event* event);
} vexa_service_interface;

#undef VEXA_UNKNOWN_SLOTS_

/* The factory's name and type. `allocator` is ignored. It returns the plug-in interface reference
 * with one reference that the caller owns, or NULL for another type, a library whose ABI does not
 * serve the plug-in, or when there is no memory. [any thread] */
#define VEXA_PLUGIN_FACTORY_NAME "VexaTouchHIDServiceFactory"
typedef void* (*vexa_plugin_factory)(void* allocator, vexa_identifier type);

#endif
