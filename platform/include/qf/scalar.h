#pragma once

#include "qf/base.h"

// Null, the booleans and numbers.
#ifdef __cplusplus
extern "C" {
#endif

PLR_EXPORT extern const QfNullRef kQfNull;
PLR_EXPORT extern const QfBooleanRef kQfBooleanTrue;
PLR_EXPORT extern const QfBooleanRef kQfBooleanFalse;
PLR_EXPORT bool qf_boolean_get_value(QfBooleanRef boolean);

// How a number is stored, and how a caller wants to read it. The C types are
// those of this platform.
typedef enum QfNumberType {
    kQfNumberSInt8Type,
    kQfNumberSInt16Type,
    kQfNumberSInt32Type,
    kQfNumberSInt64Type,
    kQfNumberUInt8Type,
    kQfNumberUInt16Type,
    kQfNumberUInt32Type,
    kQfNumberUInt64Type,
    kQfNumberFloatType,   // IEEE 754 binary32
    kQfNumberDoubleType,  // IEEE 754 binary64
} QfNumberType;

// `value` points to a C value of `type`.
PLR_EXPORT QfNumberRef qf_number_create(QfNumberType type, const void* value);
PLR_EXPORT QfNumberRef qf_number_create_int64(int64_t value);
PLR_EXPORT QfNumberRef qf_number_create_uint64(uint64_t value);
PLR_EXPORT QfNumberRef qf_number_create_double(double value);
PLR_EXPORT QfNumberType qf_number_get_type(QfNumberRef number);  // as created
PLR_EXPORT bool qf_number_is_float(QfNumberRef number);

// Writes the number to `value` as a C value of `type`. Returns whether nothing
// was lost: the written value equals the number (a NaN equals a NaN). What does
// not fit is still written: integers keep their low bits, a fraction is cut off,
// a float or double beyond the integer's range gives the nearest end of the range
// (NaN gives 0), an integer or a double becomes the nearest float.
PLR_EXPORT bool qf_number_get_value(QfNumberRef number, QfNumberType type, void* value);

#ifdef __cplusplus
}
#endif
