/* The ABI of libvexaplatform, and what every other header here stands on.
 *
 * All headers are C11 and C++20. Objects are opaque and counted: whoever gets one from a function
 * whose name says `create`, `copy` or `retain` owns one reference and gives it back with the
 * object's `release`. Every `release` takes NULL and does nothing with it. Counts are atomic.
 *
 * Each function says the thread on which and the state in which it may be called:
 *   [any]    any thread, at any time, also from several threads at once
 *   [loop]   the thread that owns the run loop
 *   [main]   before other threads use the library
 * No exception leaves a function, and none may leave a callback. Where a function may run out of
 * memory it says what it returns then.
 */
#ifndef VEXA_ABI_H
#define VEXA_ABI_H

#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#if defined(__GNUC__)
#define VEXA_API __attribute__((visibility("default")))
#else
#define VEXA_API
#endif

/* Codes of an enumeration may be any int, so that one that is not known can be told. C says so by
 * itself, C++ must be told. */
#ifdef __cplusplus
#define VEXA_ENUM : int
#else
#define VEXA_ENUM
#endif

#ifdef __cplusplus
#define VEXA_BEGIN_C extern "C" {
#define VEXA_END_C }
#define VEXA_NOEXCEPT noexcept
#else
#define VEXA_BEGIN_C
#define VEXA_END_C
#define VEXA_NOEXCEPT
#endif

/* The ABI that these headers describe. The major number changes when something breaks, the minor
 * one when something is added. */
#define VEXA_ABI_MAJOR 1u
#define VEXA_ABI_MINOR 1u
#define VEXA_ABI_VERSION ((VEXA_ABI_MAJOR << 16) | VEXA_ABI_MINOR)

VEXA_BEGIN_C

/* [any] The ABI of the library that was loaded, as VEXA_ABI_VERSION. */
VEXA_API uint32_t vexa_abi_version(void) VEXA_NOEXCEPT;

/* [any] Whether the loaded library serves a program built with headers of version `built_for`: the
 * same major number, and nothing newer than it has. A host asks before anything else with
 * VEXA_ABI_VERSION; a plug-in's factory answers NULL when this is false. */
VEXA_API bool vexa_abi_serves(uint32_t built_for) VEXA_NOEXCEPT;

/* Kinds of counted objects, for vexa_live_objects. */
typedef enum vexa_object_kind VEXA_ENUM {
    VEXA_OBJECT_VALUE = 0,
    VEXA_OBJECT_EVENT = 1,
    VEXA_OBJECT_QUEUE = 2,
    VEXA_OBJECT_DEVICE = 3,
    VEXA_OBJECT_RUN_LOOP = 4
} vexa_object_kind;

/* [any] How many objects of this kind live now, in the whole process; -1 for an unknown kind. For
 * tests that look for leaks: the number is exact once all threads that make objects are at rest.
 * Shared constants (null, true, false) are not counted. */
VEXA_API int64_t vexa_live_objects(vexa_object_kind kind) VEXA_NOEXCEPT;

VEXA_END_C

#endif
