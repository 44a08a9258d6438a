#pragma once

#include "qf/base.h"

// Text in UTF-8 (RFC 3629), kept with its length and a NUL behind it.
#ifdef __cplusplus
extern "C" {
#endif

typedef enum QfStringEncoding {
    kQfStringEncodingUTF8,
    kQfStringEncodingASCII,      // 7 bits
    kQfStringEncodingISOLatin1,  // ISO 8859-1
    kQfStringEncodingUTF16BE,    // RFC 2781, no byte order mark
    kQfStringEncodingUTF16LE,
} QfStringEncoding;

// Text that is not UTF-8 is kept as given; it is the maker's business.
PLR_EXPORT QfStringRef qf_string_create(const char* text);
PLR_EXPORT QfStringRef qf_string_create_with_length(const char* text, size_t length);
// `bytes` in `encoding`; the text's memory comes from `allocator`. Null when
// the bytes are not valid in the encoding, or the allocator has none.
PLR_EXPORT QfStringRef qf_string_create_with_bytes(QfAllocatorRef allocator, const void* bytes,
                                                   size_t length, QfStringEncoding encoding);
PLR_EXPORT QfStringRef qf_string_create_with_format(const char* format, ...)
    __attribute__((format(printf, 1, 2)));

PLR_EXPORT const char* qf_string_get_string_ptr(QfStringRef string);
PLR_EXPORT size_t qf_string_get_length(QfStringRef string);  // bytes

// Order by bytes, which is that of code points: negative, 0 or positive.
PLR_EXPORT int qf_string_compare(QfStringRef left, QfStringRef right);
// The same with ASCII letters of either case alike (no locale).
PLR_EXPORT int qf_string_compare_case_insensitive(QfStringRef left, QfStringRef right);

// The number that the text begins with, after white space: an optional sign
// and decimal digits; 0 when there is none; the nearest end of the range when
// it does not fit. What follows the digits is ignored.
PLR_EXPORT int32_t qf_string_get_int_value(QfStringRef string);
// The same with fraction and exponent ("-1.5e3"); never locale, hexadecimal,
// "inf" or "nan".
PLR_EXPORT double qf_string_get_double_value(QfStringRef string);

#ifdef __cplusplus
}
#endif
