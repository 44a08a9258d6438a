#pragma once

#include <stdarg.h>
#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#include "plr/base/export.h"

// Ob: reference-counted string and number objects, and their format language.
//
// Owner:   a function named *_create* or *_copy_* gives its caller one
//          reference; one named *_get_* lends, for numbers until the calling
//          thread's autorelease pool is popped.
// Threads: objects never change and may be shared freely. Autorelease pools
//          belong to their thread.
// Errors:  creation never returns null: out of memory ends the process. So does
//          releasing an object more often than it was retained, when noticed.
#ifdef __cplusplus
extern "C" {
#endif

typedef struct ObString ObString;
typedef struct ObNumber ObNumber;

// Any object. Null is ignored; retain and autorelease return their argument.
PLR_EXPORT void* ob_retain(void* object);
PLR_EXPORT void ob_release(void* object);
// The references there are right now, 0 for null; for diagnostics and tests.
PLR_EXPORT long ob_get_reference_count(const void* object);

// Releases `object` once the innermost pool of this thread is popped; without a
// pool, when the thread ends.
PLR_EXPORT void* ob_autorelease(void* object);
// Pools nest. Popping one pops those pushed after it, too; popping one of these
// later does nothing. What is popped must have been pushed by the same thread,
// which is checked as far as possible.
PLR_EXPORT void* ob_autorelease_pool_push(void);
PLR_EXPORT void ob_autorelease_pool_pop(void* pool);
// Whether a pool of this thread has not been popped yet.
PLR_EXPORT bool ob_autorelease_pool_is_open(const void* pool);

// Text in UTF-8, which is not checked, kept with its length and a NUL behind it.
PLR_EXPORT ObString* ob_string_create(const char* utf8);
PLR_EXPORT ObString* ob_string_create_with_length(const char* utf8, size_t length);
PLR_EXPORT const char* ob_string_get_utf8(const ObString* string);
PLR_EXPORT size_t ob_string_get_length(const ObString* string);  // bytes

// Formats like printf of C11, without limits of length, and "%@" for any object:
// a string's text, a number's string value, "(null)" for null; its flags, width
// and precision mean nothing.
// "%n" writes nothing: it takes its argument and stays in the text. What is no
// conversion stays in the text as well and takes no argument; arguments with
// numbers ("%1$d") are none.
PLR_EXPORT ObString* ob_string_create_with_format(const ObString* format, ...);
PLR_EXPORT ObString* ob_string_create_with_format_arguments(const ObString* format,
                                                            va_list arguments);

PLR_EXPORT ObNumber* ob_number_create_bool(bool value);
PLR_EXPORT ObNumber* ob_number_create_int64(int64_t value);
PLR_EXPORT ObNumber* ob_number_create_uint64(uint64_t value);
PLR_EXPORT ObNumber* ob_number_create_double(double value);

// "true" or "false", decimal digits, or for doubles the shortest text that reads
// back as the same value ("0.1", "1e+21", "inf", "nan"). No locale.
PLR_EXPORT ObString* ob_number_copy_string_value(const ObNumber* number);
// The same, autoreleased.
PLR_EXPORT ObString* ob_number_get_string_value(const ObNumber* number);

#ifdef __cplusplus
}
#endif
