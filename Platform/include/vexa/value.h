/* Property values: dynamically typed, immutable, counted.
 *
 * A value never changes once made, so all threads may read and share it. A function that borrows
 * (returns `const`) gives a pointer that lives as long as the value it came from.
 */
#ifndef VEXA_VALUE_H
#define VEXA_VALUE_H

#include <vexa/abi.h>

typedef struct vexa_value vexa_value;

typedef enum vexa_value_type VEXA_ENUM {
    VEXA_VALUE_NONE = 0, /* the type of NULL: no value at all */
    VEXA_VALUE_NULL = 1, /* the value null */
    VEXA_VALUE_BOOLEAN = 2,
    VEXA_VALUE_SIGNED = 3,   /* 64-bit signed integer */
    VEXA_VALUE_UNSIGNED = 4, /* 64-bit unsigned integer */
    VEXA_VALUE_FLOAT = 5,    /* single precision, kept exactly */
    VEXA_VALUE_DOUBLE = 6,
    VEXA_VALUE_STRING = 7, /* bytes, by convention UTF-8; may hold zero bytes */
    VEXA_VALUE_BYTES = 8,
    VEXA_VALUE_ARRAY = 9,
    VEXA_VALUE_DICTIONARY = 10 /* keys are strings, sorted bytewise */
} vexa_value_type;

/* A member of a dictionary, or of one to be. */
typedef struct vexa_member {
    const char* key; /* may be NULL when key_length is 0 */
    size_t key_length;
    const vexa_value* value; /* may be NULL: the dictionary then holds "no value" there */
} vexa_member;

/* Room for the text of any floating-point number and a zero byte. */
#define VEXA_NUMBER_TEXT_SIZE 32u

VEXA_BEGIN_C

/* [any] One more reference; returns its argument. NULL gives NULL. */
VEXA_API vexa_value* vexa_value_retain(const vexa_value* value) VEXA_NOEXCEPT;
/* [any] One reference fewer; the last one frees the value and releases what it holds. */
VEXA_API void vexa_value_release(const vexa_value* value) VEXA_NOEXCEPT;

/* [any] New values. The caller owns one reference; NULL when there is no memory, or a pointer is
 * NULL with a length or count above 0. Text, bytes and keys are copied; elements and members are
 * retained, not taken over. null, true and false are shared constants: making one never fails. */
VEXA_API vexa_value* vexa_value_create_null(void) VEXA_NOEXCEPT;
VEXA_API vexa_value* vexa_value_create_boolean(bool value) VEXA_NOEXCEPT;
VEXA_API vexa_value* vexa_value_create_signed(int64_t value) VEXA_NOEXCEPT;
VEXA_API vexa_value* vexa_value_create_unsigned(uint64_t value) VEXA_NOEXCEPT;
VEXA_API vexa_value* vexa_value_create_float(float value) VEXA_NOEXCEPT;
VEXA_API vexa_value* vexa_value_create_double(double value) VEXA_NOEXCEPT;
/* `length` bytes of text; `text` may be NULL when it is 0. */
VEXA_API vexa_value* vexa_value_create_string(const char* text, size_t length) VEXA_NOEXCEPT;
VEXA_API vexa_value* vexa_value_create_bytes(const uint8_t* bytes, size_t length) VEXA_NOEXCEPT;
/* An element may be NULL: the array then holds "no value" there. */
VEXA_API vexa_value* vexa_value_create_array(const vexa_value* const* elements,
                                             size_t count) VEXA_NOEXCEPT;
/* The same, but takes over the caller's references to the elements; when it returns NULL they are
 * still the caller's. */
VEXA_API vexa_value* vexa_value_create_array_adopting(const vexa_value* const* elements,
                                                      size_t count) VEXA_NOEXCEPT;
/* `keys[i]` is a string value and names `members[i]`, which may be NULL. Of equal keys the last one
 * counts. NULL also when a key is not a string. */
VEXA_API vexa_value* vexa_value_create_dictionary(const vexa_value* const* keys,
                                                  const vexa_value* const* members,
                                                  size_t count) VEXA_NOEXCEPT;
/* The same with the keys as texts. Fastest when they come in order. */
VEXA_API vexa_value* vexa_value_create_dictionary_of(const vexa_member* members,
                                                     size_t count) VEXA_NOEXCEPT;

/* [any] */
VEXA_API vexa_value_type vexa_value_get_type(const vexa_value* value) VEXA_NOEXCEPT;

/* [any] Readings of any value, NULL included. A boolean counts as 0 or 1; what is neither boolean
 * nor number reads as 0.
 * boolean: true for any number but 0, not-a-number included.
 * unsigned: floating-point values are truncated toward zero, negative ones go through 64-bit two's
 * complement, what is out of range saturates, not-a-number is 0.
 * float: rounded once to nearest, overflow gives infinity. */
VEXA_API bool vexa_value_to_boolean(const vexa_value* value) VEXA_NOEXCEPT;
VEXA_API uint64_t vexa_value_to_unsigned(const vexa_value* value) VEXA_NOEXCEPT;
VEXA_API float vexa_value_to_float(const vexa_value* value) VEXA_NOEXCEPT;
VEXA_API double vexa_value_to_double(const vexa_value* value) VEXA_NOEXCEPT;

/* [any] The exact content of a value of just this type: writes it to `*out` and returns true; false
 * and nothing written for every other type. */
VEXA_API bool vexa_value_get_signed(const vexa_value* value, int64_t* out) VEXA_NOEXCEPT;
VEXA_API bool vexa_value_get_unsigned(const vexa_value* value, uint64_t* out) VEXA_NOEXCEPT;

/* [any] The text of a string, with a zero byte behind it, borrowed; its length goes to `*length`
 * unless that is NULL. NULL for every other type. */
VEXA_API const char* vexa_value_get_string(const vexa_value* value, size_t* length) VEXA_NOEXCEPT;
/* [any] The content of a byte value, borrowed, never NULL; NULL for every other type. */
VEXA_API const uint8_t* vexa_value_get_bytes(const vexa_value* value, size_t* length) VEXA_NOEXCEPT;

/* [any] How many elements an array or members a dictionary has; 0 for every other type. */
VEXA_API size_t vexa_value_get_count(const vexa_value* value) VEXA_NOEXCEPT;
/* [any] An element of an array or a member of a dictionary by its place in the order of keys,
 * borrowed; NULL beyond the end and for every other type. */
VEXA_API const vexa_value* vexa_value_get_element(const vexa_value* value,
                                                  size_t index) VEXA_NOEXCEPT;
/* [any] The key of that member (with a zero byte behind it), borrowed; NULL as above. */
VEXA_API const char* vexa_value_get_key(const vexa_value* value, size_t index,
                                        size_t* length) VEXA_NOEXCEPT;
/* [any] All elements of an array, all members of a dictionary in the order of keys, borrowed, for
 * those who go through them all; their number goes to `*count` unless that is NULL. NULL for every
 * other type (and the count stays), not NULL for an empty one. */
VEXA_API const vexa_value* const* vexa_value_get_elements(const vexa_value* array,
                                                          size_t* count) VEXA_NOEXCEPT;
VEXA_API const vexa_member* vexa_value_get_members(const vexa_value* dictionary,
                                                   size_t* count) VEXA_NOEXCEPT;
/* [any] The place of the member with this key, or SIZE_MAX when there is none. */
VEXA_API size_t vexa_value_find_key(const vexa_value* value, const char* key,
                                    size_t length) VEXA_NOEXCEPT;

/* [any] Equal values of the same kind: integers by value whatever their sign type, float and double
 * by the bits they have as doubles (0.0 is not -0.0), every not-a-number equals every other, an
 * integer never equals a floating-point value; arrays and dictionaries member by member, however
 * deep. NULL equals NULL only. False also when there is no memory to compare two that are nested
 * more than 128 levels deep; anything else needs none. */
VEXA_API bool vexa_value_equal(const vexa_value* a, const vexa_value* b) VEXA_NOEXCEPT;

/* [any] A readable text as a string value that the caller owns, for logs: strings in quotes, bytes
 * as <hex>, floating-point numbers as below. NULL: no memory. */
VEXA_API vexa_value* vexa_value_create_description(const vexa_value* value) VEXA_NOEXCEPT;

/* [any] Writes the shortest text that reads back to the same number to `out` (room for
 * VEXA_NUMBER_TEXT_SIZE bytes), with a zero byte behind, and returns its length: always with a
 * point or an exponent, else inf, -inf or nan. */
VEXA_API size_t vexa_number_text_of_float(float value, char* out) VEXA_NOEXCEPT;
VEXA_API size_t vexa_number_text_of_double(double value, char* out) VEXA_NOEXCEPT;

VEXA_END_C

#endif
