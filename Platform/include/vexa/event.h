/* HID events: what a service hands to its host.
 *
 * An event is written through its reference and has no lock: its maker finishes writing before
 * another thread sees it; from then on it is only read.
 */
#ifndef VEXA_EVENT_H
#define VEXA_EVENT_H

#include <vexa/abi.h>
#include <vexa/value.h>

typedef struct vexa_event vexa_event;

/* Event types. The upper half of a field code names the type that has the field. */
#define VEXA_EVENT_TYPE_VENDOR_DEFINED 1u
#define VEXA_EVENT_TYPE_DIGITIZER 11u

/* Phases. */
#define VEXA_EVENT_PHASE_NONE 0u
#define VEXA_EVENT_PHASE_BEGAN 1u
#define VEXA_EVENT_PHASE_CHANGED 2u
#define VEXA_EVENT_PHASE_ENDED 4u
#define VEXA_EVENT_PHASE_CANCELLED 8u
#define VEXA_EVENT_PHASE_MAY_BEGIN 128u

/* The number of the sensing frame that caused a digitizer event (an integer field). */
#define VEXA_EVENT_FIELD_DIGITIZER_FRAME_NUMBER 0x000B001Bu

/* The content of a digitizer event as it is created. */
typedef struct vexa_digitizer_record {
    uint64_t timestamp; /* host ticks */
    uint32_t transducer_type;
    uint32_t index;
    uint32_t identity;
    uint32_t event_mask;
    uint32_t button_mask;
    double x;
    double y;
    double z;
    double tip_pressure;
    double barrel_pressure;
    bool in_range;
    bool touching;
    uint32_t options;
} vexa_digitizer_record;

/* The content of a vendor-defined event as it is created. */
typedef struct vexa_vendor_record {
    uint64_t timestamp; /* host ticks */
    uint32_t usage_page;
    uint32_t usage;
    uint32_t version;
    const uint8_t* payload; /* copied on creation; borrowed when read, good while the event lives;
                               may be NULL when payload_length is 0 */
    size_t payload_length;
    uint32_t options;
} vexa_vendor_record;

VEXA_BEGIN_C

/* [any] New events; the caller owns one reference. NULL: no memory, or no record, or no payload
 * for a payload_length above 0. */
VEXA_API vexa_event* vexa_event_create_digitizer(const vexa_digitizer_record* record) VEXA_NOEXCEPT;
VEXA_API vexa_event* vexa_event_create_vendor_defined(const vexa_vendor_record* record)
    VEXA_NOEXCEPT;
/* [any] As with values. */
VEXA_API vexa_event* vexa_event_retain(vexa_event* event) VEXA_NOEXCEPT;
VEXA_API void vexa_event_release(vexa_event* event) VEXA_NOEXCEPT;

/* [any] Readings; NULL reads as 0 and false. */
VEXA_API uint32_t vexa_event_get_type(const vexa_event* event) VEXA_NOEXCEPT;
VEXA_API uint64_t vexa_event_get_timestamp(const vexa_event* event) VEXA_NOEXCEPT; /* host ticks */
VEXA_API uint32_t vexa_event_get_phase(const vexa_event* event) VEXA_NOEXCEPT;
/* 0 when the field was never set or the event has no such field. */
VEXA_API int64_t vexa_event_get_integer(const vexa_event* event, uint32_t field) VEXA_NOEXCEPT;
/* Writes the record (with the current time stamp) and returns true; false for another type. */
VEXA_API bool vexa_event_get_digitizer(const vexa_event* event,
                                       vexa_digitizer_record* out) VEXA_NOEXCEPT;
VEXA_API bool vexa_event_get_vendor_defined(const vexa_event* event,
                                            vexa_vendor_record* out) VEXA_NOEXCEPT;
/* A readable line with every field that is not at its default, as a string value that the caller
 * owns. NULL: no memory. */
VEXA_API vexa_value* vexa_event_create_description(const vexa_event* event) VEXA_NOEXCEPT;

/* [any, before the event is shared] Writings. A field that the type does not have is ignored, and
 * so is NULL. */
VEXA_API void vexa_event_set_timestamp(vexa_event* event, uint64_t ticks) VEXA_NOEXCEPT;
VEXA_API void vexa_event_set_phase(vexa_event* event, uint32_t phase) VEXA_NOEXCEPT;
VEXA_API void vexa_event_set_integer(vexa_event* event, uint32_t field,
                                     int64_t value) VEXA_NOEXCEPT;

VEXA_END_C

#endif
