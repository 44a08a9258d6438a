#pragma once

#include "qf/base.h"

// Arrays and dictionaries. They retain their content; a null pointer cannot be
// put into one. A collection must not come to contain itself.
#ifdef __cplusplus
extern "C" {
#endif

PLR_EXPORT QfArrayRef qf_array_create(const QfTypeRef* values, size_t count);
PLR_EXPORT QfMutableArrayRef qf_array_create_mutable(void);
PLR_EXPORT size_t qf_array_get_count(QfArrayRef array);
PLR_EXPORT QfTypeRef qf_array_get_value(QfArrayRef array, size_t index);  // null past the end
PLR_EXPORT void qf_array_append_value(QfMutableArrayRef array, QfTypeRef value);

// Dictionaries: keys are strings; entries keep the order in which their keys
// first came; of equal keys the last wins. Finding and adding take the same
// time at any size.
PLR_EXPORT QfDictionaryRef qf_dictionary_create(const QfStringRef* keys, const QfTypeRef* values,
                                                size_t count);
PLR_EXPORT QfMutableDictionaryRef qf_dictionary_create_mutable(void);
PLR_EXPORT size_t qf_dictionary_get_count(QfDictionaryRef dictionary);
// Null for a missing key.
PLR_EXPORT QfTypeRef qf_dictionary_get_value(QfDictionaryRef dictionary, QfStringRef key);
// The same without making a string of the key.
PLR_EXPORT QfTypeRef qf_dictionary_get_value_for_utf8(QfDictionaryRef dictionary, const char* key,
                                                      size_t length);
// The entry at `position` in order, for walking: returns its value (lent) and
// stores its key (lent) in `key`; null past the end.
PLR_EXPORT QfTypeRef qf_dictionary_get_entry(QfDictionaryRef dictionary, size_t position,
                                             QfStringRef* key);
PLR_EXPORT void qf_dictionary_set_value(QfMutableDictionaryRef dictionary, QfStringRef key,
                                        QfTypeRef value);
// Nothing for a missing key. Takes time with the number of entries.
PLR_EXPORT void qf_dictionary_remove_value(QfMutableDictionaryRef dictionary, QfStringRef key);

#ifdef __cplusplus
}
#endif
