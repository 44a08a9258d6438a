#pragma once

#include <stdarg.h>
#include <stddef.h>
#include <stdint.h>

#include "plr/base/export.h"

// Vox values: what messages are made of.
//
// Owner:   every object has an atomic reference count. A function named
//          *_create or *_copy gives its caller one reference; one named *_get_*
//          lends a pointer that lives as long as the object it was taken from;
//          containers retain what is put into them.
// Threads: scalar values never change and may be shared freely. An array or a
//          dictionary may be read by many threads, or changed by one.
// Errors:  creation never returns null: out of memory ends the process, as it
//          would in the middle of any message. Reading a value through the
//          function of another type gives that function's neutral answer (0,
//          null, empty). A null pointer is read as the null object.
#ifdef __cplusplus
extern "C" {
#endif

typedef struct vox_object* vox_object_t;
// The same pointers, where only that type makes sense.
typedef struct vox_object* vox_connection_t;
typedef struct vox_object* vox_endpoint_t;

typedef enum vox_type {
    VOX_TYPE_NULL,
    VOX_TYPE_BOOL,
    VOX_TYPE_INT64,
    VOX_TYPE_UINT64,
    VOX_TYPE_DOUBLE,
    VOX_TYPE_DATE,
    VOX_TYPE_DATA,
    VOX_TYPE_STRING,
    VOX_TYPE_UUID,
    VOX_TYPE_ARRAY,
    VOX_TYPE_DICTIONARY,
    VOX_TYPE_ERROR,
    VOX_TYPE_CONNECTION,
    VOX_TYPE_ENDPOINT,
    VOX_TYPE_FD,
} vox_type_t;

// Counts. Both accept a null pointer; retain returns its argument. Null and
// the booleans are singletons and not counted.
PLR_EXPORT vox_object_t vox_retain(vox_object_t object);
PLR_EXPORT void vox_release(vox_object_t object);

PLR_EXPORT vox_type_t vox_get_type(vox_object_t object);
// "null", "bool", "int64", …: for people.
PLR_EXPORT const char* vox_type_get_name(vox_type_t type);
// Same type and same content; doubles by their bits; dictionaries whatever
// their order; descriptors, connections and endpoints by identity.
PLR_EXPORT int vox_equal(vox_object_t left, vox_object_t right);
// A description for logs, of any value; free() it.
PLR_EXPORT char* vox_copy_description(vox_object_t object);

PLR_EXPORT vox_object_t vox_null_create(void);
PLR_EXPORT vox_object_t vox_bool_create(int value);
PLR_EXPORT int vox_bool_get_value(vox_object_t boolean);
PLR_EXPORT vox_object_t vox_int64_create(int64_t value);
PLR_EXPORT int64_t vox_int64_get_value(vox_object_t number);
PLR_EXPORT vox_object_t vox_uint64_create(uint64_t value);
PLR_EXPORT uint64_t vox_uint64_get_value(vox_object_t number);
PLR_EXPORT vox_object_t vox_double_create(double value);
PLR_EXPORT double vox_double_get_value(vox_object_t number);

// Nanoseconds since 1970-01-01T00:00:00Z, without leap seconds (POSIX time).
PLR_EXPORT vox_object_t vox_date_create(int64_t nanoseconds);
PLR_EXPORT vox_object_t vox_date_create_from_current(void);
PLR_EXPORT int64_t vox_date_get_value(vox_object_t date);

PLR_EXPORT vox_object_t vox_data_create(const void* bytes, size_t length);
PLR_EXPORT const void* vox_data_get_bytes_ptr(vox_object_t data);
PLR_EXPORT size_t vox_data_get_length(vox_object_t data);

// UTF-8 (RFC 3629), stored with its length and a NUL behind it. Text that is
// not valid UTF-8 is kept as given but cannot be sent (EILSEQ).
PLR_EXPORT vox_object_t vox_string_create(const char* text);
PLR_EXPORT vox_object_t vox_string_create_with_length(const char* text, size_t length);
PLR_EXPORT vox_object_t vox_string_create_with_format(const char* format, ...)
    __attribute__((format(printf, 1, 2)));
PLR_EXPORT vox_object_t vox_string_create_with_format_and_arguments(const char* format,
                                                                    va_list arguments);
PLR_EXPORT const char* vox_string_get_string_ptr(vox_object_t string);
PLR_EXPORT size_t vox_string_get_length(vox_object_t string);

// 16 bytes, RFC 4122 order.
PLR_EXPORT vox_object_t vox_uuid_create(const uint8_t bytes[16]);
PLR_EXPORT const uint8_t* vox_uuid_get_bytes(vox_object_t uuid);

// A file descriptor. create keeps a close-on-exec duplicate of `descriptor`
// (null object when it cannot be duplicated); dup gives the caller a new one to
// close, or -1 with errno.
PLR_EXPORT vox_object_t vox_fd_create(int descriptor);
PLR_EXPORT int vox_fd_dup(vox_object_t fd);

// Arrays. An index past the end reads as null pointer; setting there does
// nothing. A null value is stored as the null object.
PLR_EXPORT vox_object_t vox_array_create(void);
PLR_EXPORT size_t vox_array_get_count(vox_object_t array);
PLR_EXPORT vox_object_t vox_array_get_value(vox_object_t array, size_t index);
PLR_EXPORT void vox_array_append_value(vox_object_t array, vox_object_t value);
PLR_EXPORT void vox_array_set_value(vox_object_t array, size_t index, vox_object_t value);

// Dictionaries: keys are NUL-terminated UTF-8; entries keep the order in which
// their keys first came. set_value with a null pointer removes the key (the
// null object is a value like others). get_value gives a null pointer for a
// missing key. Finding and adding take the same time at any size; removing moves
// the entries behind the key.
PLR_EXPORT vox_object_t vox_dictionary_create(void);
PLR_EXPORT size_t vox_dictionary_get_count(vox_object_t dictionary);
PLR_EXPORT vox_object_t vox_dictionary_get_value(vox_object_t dictionary, const char* key);
PLR_EXPORT void vox_dictionary_set_value(vox_object_t dictionary, const char* key,
                                         vox_object_t value);
// The entry at `position` in order, for walking: returns its value (lent) and
// stores its key (lent) in `key`; null pointer at the end.
PLR_EXPORT vox_object_t vox_dictionary_get_entry(vox_object_t dictionary, size_t position,
                                                 const char** key);

// Errors: a code and, unless `description` is null, a text for people.
typedef enum vox_error_code {
    VOX_ERROR_CONNECTION_INTERRUPTED = 1,  // the peer went away or is not there yet
    VOX_ERROR_CONNECTION_INVALID = 2,      // this connection will never be usable again
    VOX_ERROR_MESSAGE_REFUSED = 3,         // this message was not taken; see the description
    VOX_ERROR_REQUEST_TIMED_OUT = 4,       // no reply came in time
    VOX_ERROR_REQUEST_CANCELLED = 5,       // the asker gave it up
    VOX_ERROR_APPLICATION = 1000,          // the first code that is free for users
} vox_error_code_t;
PLR_EXPORT vox_object_t vox_error_create(int64_t code, const char* description);
PLR_EXPORT int64_t vox_error_get_code(vox_object_t error);
// The entry that vox_error_get_value() gives for this key is the description,
// a string; a null pointer when the error has none, or for any other key.
PLR_EXPORT extern const char* const vox_error_key_description;
PLR_EXPORT vox_object_t vox_error_get_value(vox_object_t error, const char* key);

#ifdef __cplusplus
}
#endif
