/* HID devices as a service sees them, and the back-ends that stand behind them.
 *
 * A host registers a back-end and gets a service handle, a number. The service makes a device for
 * that handle and works with the device only.
 */
#ifndef VEXA_DEVICE_H
#define VEXA_DEVICE_H

#include <vexa/abi.h>
#include <vexa/run_loop.h>
#include <vexa/status.h>
#include <vexa/value.h>

typedef struct vexa_device vexa_device;

typedef enum vexa_report_type VEXA_ENUM {
    VEXA_REPORT_INPUT = 0,
    VEXA_REPORT_OUTPUT = 1,
    VEXA_REPORT_FEATURE = 2
} vexa_report_type;

/* Called on the run loop's thread for each input report. `result` is 0, `sender` the device. The
 * bytes stand in the buffer that was registered and are only good during the call; the first one is
 * the report id. `timestamp` is in host ticks, taken when the report was read. */
typedef void (*vexa_input_report_callback)(void* context, vexa_status result, vexa_device* sender,
                                           vexa_report_type type, uint32_t report_id,
                                           const uint8_t* report, size_t length,
                                           uint64_t timestamp);

/* What stands behind a device. All calls get `context`; they come from whatever thread uses the
 * device, several at once if several threads use it, and may themselves use the device. Set `size`
 * to sizeof(vexa_device_backend). Each entry but `open` may be NULL. */
typedef struct vexa_device_backend {
    size_t size;
    /* Opens the device. Stores a descriptor of which each read() gives one whole input report
     * (SOCK_SEQPACKET socket, raw HID node); the library sets it non-blocking, owns and closes it.
     * It must be one that can be waited for, so no regular file.
     * A read of 0 bytes is an empty report, unless the descriptor hangs up (POLLHUP or POLLRDHUP):
     * then, and when a read fails (but for "again" and "interrupted"), the device is unplugged.
     * What was sent before is read all the same, from a packet socket of the local kind empty
     * reports as well; others had better not hang up while those are left. */
    vexa_status (*open)(void* context, uint32_t options, int* descriptor);
    /* Told once for each successful open, also when the device could not be opened after all or was
     * unplugged. No more reports are read and the descriptor is closed; of a report that was read
     * before, `report_handled` may still come. NULL: nothing to do. */
    void (*close)(void* context, uint32_t options);
    /* Fills `report` with at most `*length` bytes, stores how many. NULL: unsupported. Not called
     * once the device was found to be unplugged, nor are those for properties. */
    vexa_status (*get_report)(void* context, vexa_report_type type, uint32_t report_id,
                              uint8_t* report, size_t* length);
    /* The value with a reference for the caller, or NULL. NULL: no properties. */
    vexa_value* (*copy_property)(void* context, const vexa_value* key);
    /* Whether the value was taken; it may be NULL, no value. NULL: never. */
    bool (*set_property)(void* context, const vexa_value* key, const vexa_value* value);
    /* Called on the run loop's thread after the callback has returned for one report. NULL: not
     * told. Must not block. */
    void (*report_handled)(void* context);
    /* The last reference to the back-end is gone: the registration's and every device's. */
    void (*destroy)(void* context);
    /* Called on the run loop's thread with each report just read, before the callback: `length`
     * bytes as the callback gets them, which are only good during the call. NULL: not told. Must
     * not block. */
    void (*report_arrived)(void* context, const uint8_t* report, size_t length);
} vexa_device_backend;

VEXA_BEGIN_C

/* [any] Registers a back-end (copied) and returns its service handle, never 0; 0 when there is no
 * memory or `backend` is malformed: no `open`, or too small (`destroy` is then not called). */
VEXA_API uint32_t vexa_service_register(const vexa_device_backend* backend,
                                        void* context) VEXA_NOEXCEPT;
/* [any] No further device can be made for the handle; those that exist go on. False: unknown. */
VEXA_API bool vexa_service_unregister(uint32_t service) VEXA_NOEXCEPT;

/* [any] A device for a registered handle, closed; the caller owns one reference. NULL for an
 * unknown handle and when there is no memory. */
VEXA_API vexa_device* vexa_device_create(uint32_t service) VEXA_NOEXCEPT;
VEXA_API vexa_device* vexa_device_retain(vexa_device* device) VEXA_NOEXCEPT;
/* [any] The last reference closes the device if it is open (with options 0) and unschedules it. The
 * loop holds one while it handles a report; then this happens on its thread when the callback has
 * returned. */
VEXA_API void vexa_device_release(vexa_device* device) VEXA_NOEXCEPT;

/* [any] Opens the device through its back-end. 0, or what the back-end answered; a second open
 * without a close is VEXA_STATUS_ALREADY_OPEN (as is one while another thread opens or closes), one
 * after an unplug VEXA_STATUS_GONE; VEXA_STATUS_IO_ERROR for a descriptor that is none,
 * VEXA_STATUS_NO_RESOURCES for one that cannot be watched. */
VEXA_API vexa_status vexa_device_open(vexa_device* device, uint32_t options) VEXA_NOEXCEPT;
/* [any] Closes it and returns 0; when it is not open nothing happens and VEXA_STATUS_NOT_OPEN is
 * returned. An unplugged device is closed like any other. No report is read afterwards; one that is
 * being handled on the loop's thread may still be in the callback. Reports that were not read are
 * lost. */
VEXA_API vexa_status vexa_device_close(vexa_device* device, uint32_t options) VEXA_NOEXCEPT;

/* [any] Asks for a report. `*length` is the room in `buffer` going in and what was written coming
 * out, 0 when it fails. Blocks the caller as long as the device takes. Works whether the device is
 * open or not, as far as its back-end does. 0, what the back-end answered,
 * VEXA_STATUS_UNSUPPORTED when it has no such operation, VEXA_STATUS_GONE after an unplug or
 * VEXA_STATUS_BAD_ARGUMENT when `buffer` or `length` is NULL. */
VEXA_API vexa_status vexa_device_get_report(vexa_device* device, vexa_report_type type,
                                            uint32_t report_id, uint8_t* buffer,
                                            size_t* length) VEXA_NOEXCEPT;

/* [any] A property of the device: the value with a reference for the caller, or NULL, as always for
 * a NULL key and after an unplug. */
VEXA_API vexa_value* vexa_device_copy_property(vexa_device* device,
                                               const vexa_value* key) VEXA_NOEXCEPT;
/* [any] Whether the device took the value; never with a NULL key or after an unplug. */
VEXA_API bool vexa_device_set_property(vexa_device* device, const vexa_value* key,
                                       const vexa_value* value) VEXA_NOEXCEPT;

/* [loop, or while the device is not scheduled] Where reports go: each is read into `buffer` (room
 * for `length` bytes, owned by the caller, a longer report is cut) and `callback` is called. A NULL
 * callback ends it: afterwards neither buffer nor context is touched. An empty buffer cuts all
 * reports to nothing. */
VEXA_API void vexa_device_set_input_report_callback(vexa_device* device, uint8_t* buffer,
                                                    size_t length,
                                                    vexa_input_report_callback callback,
                                                    void* context) VEXA_NOEXCEPT;

/* [loop] Reports are read while this loop runs in this mode and the device is open, whichever came
 * first; without a callback they wait. Each costs one system call to wait and one to read it, no
 * memory is allocated. A device is scheduled on one loop and mode at a time: 0,
 * VEXA_STATUS_BAD_ARGUMENT when it is scheduled already (unless the thread of that loop has ended),
 * when the thread of this one has, or when `loop` or `mode` is NULL; VEXA_STATUS_NO_RESOURCES. The
 * loop is retained until the device leaves it. */
VEXA_API vexa_status vexa_device_schedule(vexa_device* device, vexa_run_loop* loop,
                                          const char* mode) VEXA_NOEXCEPT;
/* [loop] No callback comes afterwards. Nothing happens when it is not scheduled there. Another
 * thread may call it too, but then the callback may still be in progress. */
VEXA_API void vexa_device_unschedule(vexa_device* device, vexa_run_loop* loop,
                                     const char* mode) VEXA_NOEXCEPT;

/* [any] False once the device was found to be unplugged while it was read: all reports sent before
 * have been read then. It never comes back; whoever plugs it in again registers it again. */
VEXA_API bool vexa_device_is_present(const vexa_device* device) VEXA_NOEXCEPT;

VEXA_END_C

#endif
