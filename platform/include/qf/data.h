#pragma once

#include "qf/base.h"

// Bytes.
#ifdef __cplusplus
extern "C" {
#endif

PLR_EXPORT QfDataRef qf_data_create(const void* bytes, size_t length);
// A copy in memory of `allocator`; null when it has none.
PLR_EXPORT QfDataRef qf_data_create_with_allocator(QfAllocatorRef allocator, const void* bytes,
                                                   size_t length);
// Refers to `bytes` without copying. Once the value goes, `deallocator` is
// given bytes and length; null: nobody is told, the bytes outlive the value.
PLR_EXPORT QfDataRef qf_data_create_no_copy(const void* bytes, size_t length,
                                            QfAllocatorRef deallocator);
PLR_EXPORT const void* qf_data_get_bytes_ptr(QfDataRef data);  // not null, even of length 0
PLR_EXPORT size_t qf_data_get_length(QfDataRef data);

#ifdef __cplusplus
}
#endif
