#pragma once

#include "plr/base/export.h"
#include "vox/connection.h"

// A tap shows what passes a service: the headers and values of every message of
// every client of one listener, both ways, while it happens.
//
// Who:     peers with the service's own uid, and root; others are refused
//          (INVALID), and more than 16. A listener may refuse all (vox_listener_set_taps).
// Cost:    one relaxed load for each message without taps. With taps a message is
//          copied, up to 64 KiB of it, to a bounded list; a queue of low priority sends it.
// Loss:    a tap never slows the service: when the list (16384 entries, 4 MiB) is full, or the
//          tap does not read what waits for it (1 MiB), entries are left out and counted.
// Service: a tap is a client; its listener's handler gets a connection event for it, and
//          then nothing comes from it until it ends. Messages for it are dropped
//          (ENOBUFS). It takes a client's place (vox_limits_t). Taps do not see taps.
//
// Each event of a tap is a dictionary:
//
//   "k"   string   what passed: "message", "request", "reply", "cancel", "refused";
//                  "dropped": out, a message that was dropped as the client does not
//                  read; in, the client's count of those it dropped (the value);
//                  "open" and "close" of the connection itself. Besides: "start", the
//                  first event, only "t" with it: what passes from then on is seen; and
//                  "missed", only "l" with it
//   "t"   date     when it passed
//   "c"   uint64   which connection: a number, not used twice by one process
//   "p"   int64    its peer's pid; "u" its uid
//   "d"   string   "in", from the client; "out", to it; absent for open and close, as are:
//   "i"   uint64   the id of a request and of what belongs to it; else absent
//   "n"   uint64   bytes of the body
//   "f"   uint64   descriptors beside it; they do not travel, and stand in the value as null
//   "v"            the value; absent when the body has more than 64 KiB. Of "close" the
//                  error that the service got; absent when the client became a tap
//   "b"   data     a body that is no value, in place of "v"
//   "l"   uint64   entries that were left out here
//
// "out" is seen when it is accepted for sending, "in" before its handler runs. A
// connection is "open" once its client has said hello or something passed on it.
#ifdef __cplusplus
extern "C" {
#endif

// A tap on the service `name`: a connection that is set up and ended as every
// other; sending on it fails (EINVAL).
PLR_EXPORT vox_connection_t vox_connection_create_tap(const char* name);

// Whether `listener` takes taps; it does unless told otherwise. Any time: taps that
// are there stay. `listener` must be one.
PLR_EXPORT void vox_listener_set_taps(vox_connection_t listener, int allowed);

#ifdef __cplusplus
}
#endif
