#pragma once

#include <stdint.h>

#include "plr/base/export.h"
#include "vox/connection.h"

// A tap shows what passes a service: the headers and values of every message of
// every client of one listener, both ways, while it happens.
//
// Who:     peers with the service's own uid, and root; others are refused
//          (INVALID). A listener may refuse all (vox_listener_set_taps).
// Cost:    one load for each message without taps. With taps a message is copied, up to
//          64 KiB of it, to a bounded list; another queue sends it.
// Loss:    a tap never slows the service: when the list is full, or the tap does
//          not read, entries are left out, and the next one tells how many.
//
// Each event of a tap is a dictionary:
//
//   "t"   date     when it passed
//   "c"   uint64   which connection: a number, not used twice by one process
//   "p"   int64    its peer's pid; "u" its uid
//   "d"   string   "in", from the client; "out", to it
//   "k"   string   "message", "request", "reply", "cancel", "refused", "dropped";
//                  "open" and "close" for the connection itself
//   "i"   uint64   the id of a request and of what belongs to it; else absent
//   "n"   uint64   bytes of the body
//   "f"   uint64   descriptors beside it; they do not travel, and stand in the value as null
//   "v"            the value; absent when the body has more than 64 KiB
//   "l"   uint64   entries that were left out before this one; absent for none
#ifdef __cplusplus
extern "C" {
#endif

// A tap on the service `name`: a connection that is set up and ended as every
// other; sending on it fails (EINVAL).
PLR_EXPORT vox_connection_t vox_connection_create_tap(const char* name);

// Whether `listener` takes taps; it does unless told otherwise. Before the first
// resume only. `listener` must be one.
PLR_EXPORT void vox_listener_set_taps(vox_connection_t listener, int allowed);

#ifdef __cplusplus
}
#endif
