/* Status codes: what host-facing operations return. */
#ifndef VEXA_STATUS_H
#define VEXA_STATUS_H

#include <vexa/abi.h>

/* 0 is success, every other value a failure. */
typedef uint32_t vexa_status;

#define VEXA_STATUS_SUCCESS 0u
/* Something could not be made or opened: no memory, no such device. */
#define VEXA_STATUS_NO_RESOURCES 0xE00002BEu
/* The object does not know this operation. */
#define VEXA_STATUS_UNSUPPORTED 0xE00002C7u
/* QueryInterface: the object does not have this interface. */
#define VEXA_STATUS_NO_INTERFACE 0x80000004u

/* Of devices. */
#define VEXA_STATUS_NOT_OPEN 0xA7510001u     /* the device is not open */
#define VEXA_STATUS_ALREADY_OPEN 0xA7510002u /* the device is open already */
#define VEXA_STATUS_GONE 0xA7510003u         /* the device was unplugged */
#define VEXA_STATUS_IO_ERROR 0xA7510004u     /* the device refused, or the transfer failed */
#define VEXA_STATUS_BAD_ARGUMENT 0xA7510005u /* an argument makes no sense */

#endif
