#pragma once

#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#include "plr/base/export.h"

// Qf values: the platform's property-list values.
//
// Owner:   every value has an atomic reference count. A function named *_create
//          or *_copy gives its caller one reference; one named *_get_* lends a
//          pointer that lives as long as the value it was taken from;
//          collections retain what is put into them.
// Threads: values never change and may be shared freely; a mutable collection
//          may be read by many threads, or changed by one.
// Errors:  creation never returns null unless it says so: out of memory ends
//          the process. A null pointer, or a value of another type, where a
//          function asks for a value of its type is a programming error that
//          ends the process, as is releasing a value more often than it was
//          retained, when it is noticed.
#ifdef __cplusplus
extern "C" {
#endif

typedef const void* QfTypeRef;  // any value
typedef const struct qf_null* QfNullRef;
typedef const struct qf_boolean* QfBooleanRef;
typedef const struct qf_number* QfNumberRef;
typedef const struct qf_string* QfStringRef;
typedef const struct qf_data* QfDataRef;
typedef const struct qf_date* QfDateRef;
typedef const struct qf_url* QfURLRef;
typedef const struct qf_error* QfErrorRef;
typedef const struct qf_locale* QfLocaleRef;
typedef const struct qf_date_formatter* QfDateFormatterRef;
typedef const struct qf_array* QfArrayRef;
typedef struct qf_array* QfMutableArrayRef;
typedef const struct qf_dictionary* QfDictionaryRef;
typedef struct qf_dictionary* QfMutableDictionaryRef;

// Names a type of values; 0 names none. A mutable collection has the type of
// the constant one.
typedef unsigned long QfTypeID;

// Counts. retain returns its argument. Null, the booleans and constant strings
// are never destroyed, and their count does not move.
PLR_EXPORT QfTypeRef qf_retain(QfTypeRef value);
PLR_EXPORT void qf_release(QfTypeRef value);
// The references there are right now; for diagnostics and tests.
PLR_EXPORT long qf_get_retain_count(QfTypeRef value);
// Counted values alive in this process, in builds with PELORIN_CHECKS; -1 in
// others. For tests: what a piece of code made it has also released.
PLR_EXPORT long qf_get_live_count(void);

PLR_EXPORT QfTypeID qf_get_type_id(QfTypeRef value);
PLR_EXPORT QfTypeID qf_null_get_type_id(void);
PLR_EXPORT QfTypeID qf_boolean_get_type_id(void);
PLR_EXPORT QfTypeID qf_number_get_type_id(void);
PLR_EXPORT QfTypeID qf_string_get_type_id(void);
PLR_EXPORT QfTypeID qf_data_get_type_id(void);
PLR_EXPORT QfTypeID qf_date_get_type_id(void);
PLR_EXPORT QfTypeID qf_url_get_type_id(void);
PLR_EXPORT QfTypeID qf_error_get_type_id(void);
PLR_EXPORT QfTypeID qf_locale_get_type_id(void);
PLR_EXPORT QfTypeID qf_date_formatter_get_type_id(void);
PLR_EXPORT QfTypeID qf_array_get_type_id(void);
PLR_EXPORT QfTypeID qf_dictionary_get_type_id(void);
// "QfString", "QfDictionary", …: for people; "?" for none.
PLR_EXPORT const char* qf_type_get_name(QfTypeID type);

// Same type and same content. Numbers are equal by value whatever they were
// made from (2 and 2.0; a NaN equals a NaN); dictionaries whatever their order;
// a mutable collection may equal a constant one. A boolean is no number.
PLR_EXPORT bool qf_equal(QfTypeRef left, QfTypeRef right);
// Equal values hash alike, in this process.
PLR_EXPORT size_t qf_hash(QfTypeRef value);

// A description for logs, UTF-8, one line, on one scheme for all types:
// strings in quotes only inside of collections.
PLR_EXPORT QfStringRef qf_copy_description(QfTypeRef value);

// Memory of other people's making: where bytes come from and go to. A null
// allocator is malloc() and free().
typedef struct QfAllocator {
    void* (*allocate)(size_t size, void* context);  // null when out of memory
    void (*deallocate)(void* memory, size_t size, void* context);
    void* context;  // handed to both; outlives every value made with it
} QfAllocator;
typedef const QfAllocator* QfAllocatorRef;

#ifdef __cplusplus
}
#endif
