#pragma once

#include <stddef.h>
#include <stdint.h>
#include <sys/types.h>

#include "plr/base/export.h"
#include "vox/connection.h"
#include "vox/limits.h"

// Vox listeners: they take the clients of a name, or of the endpoints made for
// them, and hand each to their handler as a connection event. A listener is set
// up, resumed and ended as every connection (vox/connection.h).
//
// Who may connect is decided before any message, from what the kernel tells of
// the client; SECURITY.md says what that protects and what it does not.

// Whom a listener takes: this process's own user and root always, and whoever is
// named here. The arrays are copied.
typedef struct vox_policy {
    const uid_t* users;
    size_t user_count;
    const gid_t* groups;  // primary or supplementary (SO_PEERGROUPS)
    size_t group_count;
    int everybody;  // not 0: any user
} vox_policy_t;

// Of one listener and all its clients, since it was made.
typedef struct vox_listener_statistics {
    uint64_t clients;           // connected now
    uint64_t clients_accepted;  // handed to the handler
    uint64_t refused_by_policy;
    uint64_t refused_by_limit;  // of connections
    uint64_t refused_without_descriptors;
    uint64_t ended_for_limits;    // clients that were disconnected for going over one
    uint64_t ended_for_protocol;  // or for bytes that make no sense
    uint64_t messages_sent;       // these four as in vox_statistics_t, of all clients
    uint64_t messages_received;
    uint64_t messages_dropped;
    uint64_t requests_refused;
} vox_listener_statistics_t;

// What the clients of one user on one listener cost now.
typedef struct vox_user_statistics {
    uint64_t connections;
    uint64_t queued_bytes;
    uint64_t queued_messages;
    uint64_t pending_replies;
    uint64_t open_requests;
    uint64_t held_descriptors;
    uint64_t partial_bytes;
} vox_user_statistics_t;

#ifdef __cplusplus
extern "C" {
#endif

// The listener of the service `name` (vox_connection_create() has the rules for
// names). `limits` null for the defaults.
//
// When the service manager has passed a listening socket of that name
// (LISTEN_PID, LISTEN_FDS, LISTEN_FDNAMES, as sd_listen_fds(3) has it; "<name>.socket"
// is found as well), it is used: clients that came before the service are waiting in it,
// and those that come after its end will wait for the next one. It must be a listening
// AF_UNIX stream socket and the only one of the name, else the listener fails
// (INVALID). To such clients the service manager is the peer (vox_connection_get_pid()).
//
// Otherwise the socket is made in the runtime directory. The directory is made when
// missing (mode 0700; /run/vox 0755) and refused when it is a symbolic
// link, belongs to another user than this one or root, or others may write to
// it. A stale socket is replaced, a live one never (INVALID event, EADDRINUSE
// in the text). The socket exists from vox_connection_resume() on; its mode is 0600,
// or 0666 when the policy lets others in.
PLR_EXPORT vox_connection_t vox_connection_create_listener(const char* name,
                                                           const vox_limits_t* limits);
// A listener without name, reached through endpoints only.
PLR_EXPORT vox_connection_t vox_connection_create_anonymous_listener(const vox_limits_t* limits);

// A value that travels in messages and lets its holders connect, as far as the policy goes. Costs a
// descriptor here until the last holder drops it: share one. The null object for no listener.
PLR_EXPORT vox_endpoint_t vox_endpoint_create(vox_connection_t listener);

// Before the first resume only. Null, or never called: this user and root. An
// anonymous listener takes every holder of an endpoint unless it has a policy.
// Refusals are reported at a bounded rate. `listener` must be one.
PLR_EXPORT void vox_listener_set_policy(vox_connection_t listener, const vox_policy_t* policy);

// Any thread. `listener` must be one.
PLR_EXPORT void vox_listener_get_statistics(vox_connection_t listener,
                                            vox_listener_statistics_t* statistics);
// All 0 for a user without clients.
PLR_EXPORT void vox_listener_get_user_statistics(vox_connection_t listener, uid_t user,
                                                 vox_user_statistics_t* statistics);

#ifdef __cplusplus
}
#endif
