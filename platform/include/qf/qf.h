#pragma once

#include <stddef.h>
#include <stdint.h>

#include "plr/base/export.h"

// Qf values: the platform's property-list values. Strings and numbers.
//
// Owner:   every value has an atomic reference count. A function named *_create
//          gives its caller one reference; one named *_get_* lends.
// Threads: values never change and may be shared freely.
// Errors:  creation never returns null: out of memory ends the process.
//          Releasing a value more often than it was retained ends the process
//          when it is noticed.
#ifdef __cplusplus
extern "C" {
#endif

typedef const void* QfTypeRef;  // any value
typedef const struct qf_string* QfStringRef;
typedef const struct qf_number* QfNumberRef;

// Names a type of values; 0 names none.
typedef unsigned long QfTypeID;

// Counts. Neither accepts a null pointer (as a programming error it ends the
// process); retain returns its argument.
PLR_EXPORT QfTypeRef qf_retain(QfTypeRef value);
PLR_EXPORT void qf_release(QfTypeRef value);
// The references there are right now; for diagnostics and tests.
PLR_EXPORT long qf_get_retain_count(QfTypeRef value);

PLR_EXPORT QfTypeID qf_get_type_id(QfTypeRef value);
PLR_EXPORT QfTypeID qf_string_get_type_id(void);
PLR_EXPORT QfTypeID qf_number_get_type_id(void);

// Text in UTF-8, kept with its length and a NUL behind it.
PLR_EXPORT QfStringRef qf_string_create(const char* text);
PLR_EXPORT QfStringRef qf_string_create_with_length(const char* text, size_t length);
PLR_EXPORT const char* qf_string_get_string_ptr(QfStringRef string);
PLR_EXPORT size_t qf_string_get_length(QfStringRef string);  // bytes

// Signed 64-bit numbers.
PLR_EXPORT QfNumberRef qf_number_create_int64(int64_t value);
PLR_EXPORT int64_t qf_number_get_int64(QfNumberRef number);

#ifdef __cplusplus
}
#endif
