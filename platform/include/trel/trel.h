#pragma once

#include "plr/base/export.h"

// Trel: handles of the trace log. A handle names a pair of subsystem and
// category.
//
// Owner:   the process. One handle a pair is made on first use and never
//          destroyed, whatever its reference count says: the count may fall to
//          zero and below, and nothing happens.
// Threads: everything on any thread.
// Cost:    trel_create() takes a lock and looks the pair up; the rest is one
//          load or one atomic operation.
#ifdef __cplusplus
extern "C" {
#endif

typedef struct trel* trel_t;  // null is no handle

// The handle of the pair, with one reference more for the caller. Equal pairs
// give the same handle. The texts are copied; null is the empty text. Never
// returns null: out of memory ends the process.
PLR_EXPORT trel_t trel_create(const char* subsystem, const char* category);

// Count up and down. A null handle is ignored; retain returns its argument.
PLR_EXPORT trel_t trel_retain(trel_t handle);
PLR_EXPORT void trel_release(trel_t handle);

// NUL-terminated, valid for the life of the process; "" for a null handle.
PLR_EXPORT const char* trel_get_subsystem(trel_t handle);
PLR_EXPORT const char* trel_get_category(trel_t handle);

// References right now, which may be negative; 0 for a null handle. For
// diagnostics and tests.
PLR_EXPORT long trel_get_reference_count(trel_t handle);

#ifdef __cplusplus
}
#endif
