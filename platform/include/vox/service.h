#pragma once

#include <stdint.h>

#include "dispatch/dispatch.h"
#include "plr/base/export.h"

// What a service process tells its service manager, and how it leaves when
// nobody needs it.

#ifdef __cplusplus
extern "C" {
#endif

// ---- Transactions ---------------------------------------------------------------

// A process-wide count of activities under way. More ends than begins stop the
// process. Any thread.
PLR_EXPORT void vox_transaction_begin(void);
PLR_EXPORT void vox_transaction_end(void);
PLR_EXPORT uint64_t vox_transaction_count(void);

// ---- Idle exit --------------------------------------------------------------------

// Opts in to ending when idle: once no transaction is open, no request of a client
// is unanswered, no request of this process waits for its reply, and no connection
// has anything to read, to deliver or to write, and all that for `idle_ms`
// milliseconds (up to half as long again), `leave` runs on `queue`, once; it ends the
// process. Taps (vox/tap.h) keep nobody.
//
// Nothing is lost on the way. First the listeners take no more clients: those wait for the
// next process in a socket of the service manager; a socket of this process's own is
// withdrawn, and who had connected to it is served still. Then the connections stop
// receiving, those of clients first: what a peer sends from then on fails at the peer,
// who learns it (INTERRUPTED; the next connection starts the service again where the
// service manager holds the socket). What came before that is delivered; requests among
// it are answered, and their askers wait for that; transactions that it begins are waited
// for. Connections that this process made work until then. STOPPING=1 is told, and `leave`
// runs. What the process begins by itself at that very moment is cut off.
//
// Connected clients alone do not keep a process: hold a transaction for those that
// must not be disconnected. A suspended connection with something to read does.
//
// `idle_ms` 0 opts out again, and does nothing once the connections stop
// receiving. Called again: the new values hold. Any thread.
PLR_EXPORT void vox_set_idle_exit(uint32_t idle_ms, const dispatch::queue* queue,
                                  const dispatch::block<void()>* leave);

// ---- The service manager ------------------------------------------------------------

// Tells the service manager `state`, lines like "READY=1" or "STATUS=registering",
// as sd_notify(3) has it: one datagram to $NOTIFY_SOCKET, a path or "@" and an
// abstract name. Returns 0; ENOENT without a service manager; EINVAL for a null or empty
// state; EAFNOSUPPORT for other places; or the error number of sending. Never waits. Any thread.
PLR_EXPORT int vox_notify(const char* state);
// READY=1: the service has its listeners and serves.
PLR_EXPORT int vox_notify_ready(void);
// STOPPING=1.
PLR_EXPORT int vox_notify_stopping(void);

#ifdef __cplusplus
}
#endif
