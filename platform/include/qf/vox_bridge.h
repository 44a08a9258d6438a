#pragma once

#include "qf/base.h"
#include "vox/value.h"

// Vox values as Qf values and back.
//
// | Vox                  | Qf                | back                          |
// |----------------------|-------------------|-------------------------------|
// | null                 | null              | null                          |
// | bool                 | boolean           | bool                          |
// | int64                | number, SInt64    | int64 (every signed number)   |
// | uint64               | number, UInt64    | uint64 (every unsigned one)   |
// | double               | number, Double    | double (Float too)            |
// | date, data, string   | the same          | the same                      |
// | array, dictionary    | the same, in order| the same                      |
// | UUID                 | string, 36 characters, lower case | string        |
// | error                | error, domain "vox"| error, code and description, |
// |                      |                   | which every Qf error has      |
// | endpoint, fd, connection | nothing (null)| -                             |
// | -                    | URL               | string                        |
// | -                    | locale, formatter | nothing (null)                |
//
// What has no counterpart is left out of a dictionary, and null in an array, whose
// other elements keep their places. So is an entry left out whose key has a NUL in
// it, which no Vox key can. A value of collections more than 64 deep, which no
// message can carry, converts to nothing, as a whole.
//
// Copies: what is made shares no bytes with what it was made from. Any thread.
#ifdef __cplusplus
extern "C" {
#endif

// Null for a null pointer and for what has no counterpart.
PLR_EXPORT QfTypeRef qf_create_from_vox(vox_object_t object);
PLR_EXPORT vox_object_t qf_create_vox(QfTypeRef value);

#ifdef __cplusplus
}
#endif
