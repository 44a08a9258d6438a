#pragma once

#include <sys/types.h>

#include "dispatch/dispatch.h"
#include "plr/base/export.h"
#include "vox/value.h"

// Vox connections: messages between processes over AF_UNIX stream sockets.
// docs/wire-protocol.md describes the bytes.
//
// A connection is made suspended. Its owner sets an event handler and a target
// queue and resumes it; messages sent earlier wait until then. Every event is
// delivered on the target queue, one at a time:
//   - a dictionary: a message, or a request when
//     vox_dictionary_create_reply() gives a reply for it;
//   - a connection, on listeners: a new client, suspended; it is refused
//     unless the handler keeps a reference (its event handler may be the one);
//   - an error: the last event there is. INTERRUPTED: the other end closed, or
//     nobody serves the name now; a new connection may succeed. INVALID: it
//     was cancelled, broke the protocol or a limit, or the name cannot be used.
//     All messages that arrived before it are delivered before it.
//
// Owner:   references as for all values. Dropping the last reference without
//          cancel cancels. The event handler is released after the error event;
//          one that captures its own connection keeps it alive until then.
// Threads: every function on any thread.
// Order:   messages arrive in the order sent, replies included; a reply handler
//          whose queue is the target queue runs in that same order.
// Cost:    a message is encoded and written on the calling thread; one that
//          arrives is read, decoded and handled on the thread that woke up for
//          it (bench/vox_cases.h).
//
// Transport errors are never ignored silently: what ends a connection is told
// by its error event, and when the peer is to blame also in one line through
// the report hook.

// What a listener grants its clients, and any connection its peer. The limits
// in force are told to the peer when the connection starts, so that it refuses
// to send what would not be accepted.
typedef enum vox_overflow_policy {
    VOX_OVERFLOW_DISCONNECT,  // the peer that does not read is disconnected (INVALID)
    VOX_OVERFLOW_DROP,        // new messages for it are dropped and counted; it learns the count
} vox_overflow_policy_t;

typedef struct vox_limits {
    uint32_t max_message_bytes;    // body of one message; default 16 MiB, at most 1 GiB. An eighth
                                   // of it is the limit for the values in one message
    uint32_t max_depth;            // nested arrays and dictionaries; default and most 64
    uint32_t max_descriptors;      // in one message; default and most 64
    uint32_t max_queued_bytes;     // waiting for a peer that does not read; default 16 MiB
                                   // (a message is accepted when nothing waits, whatever its size)
    uint32_t max_queued_messages;  // the same, in messages; default 65536
    uint32_t max_connections;      // of one listener at once; default 4096
    uint32_t max_connections_per_uid;  // of these by one user; default 2048
    uint32_t incomplete_frame_ms;      // a started frame must be whole by then; default 30000
    vox_overflow_policy_t overflow;    // default VOX_OVERFLOW_DISCONNECT
} vox_limits_t;

// Counters of one connection since it was made.
typedef struct vox_statistics {
    uint64_t messages_sent;      // handed to the kernel completely
    uint64_t messages_received;  // delivered or waiting for delivery
    uint64_t messages_dropped;   // refused here by the overflow policy
    uint64_t peer_dropped;       // what the peer said it dropped for us
    uint64_t queued_messages;    // waiting now to be written
    uint64_t queued_bytes;
} vox_statistics_t;

#ifdef __cplusplus
extern "C" {
#endif

PLR_EXPORT vox_limits_t vox_limits_default(void);

// ---- Making connections -------------------------------------------------------

// A client of the service `name` (1 to 100 characters of [A-Za-z0-9._-], not
// starting with '.'): the socket `name` in $VOX_RUNTIME_DIR, else in
// $XDG_RUNTIME_DIR/vox, else in /run/vox. Never fails itself: what is wrong
// arrives as the error event.
PLR_EXPORT vox_connection_t vox_connection_create(const char* name);

// The listener of that name. `limits` null for the defaults. The directory is
// made when missing (mode 0700; /run/vox 0755) and refused when it is a symbolic
// link, belongs to another user than this one or root, or others may write to
// it. A stale socket is replaced, a live one never (INVALID event, EADDRINUSE
// in the text). The socket exists from vox_connection_resume() on.
PLR_EXPORT vox_connection_t vox_connection_create_listener(const char* name,
                                                           const vox_limits_t* limits);
// A listener without name, reached through endpoints only.
PLR_EXPORT vox_connection_t vox_connection_create_anonymous_listener(const vox_limits_t* limits);
// A value that travels in messages and lets its holder connect to an anonymous
// listener. The null object when `listener` is not one.
PLR_EXPORT vox_endpoint_t vox_endpoint_create(vox_connection_t listener);
PLR_EXPORT vox_connection_t vox_connection_create_from_endpoint(vox_endpoint_t endpoint);

// Both ends of a new connection inside this process.
PLR_EXPORT void vox_connection_create_pair(vox_connection_t* left, vox_connection_t* right,
                                           const vox_limits_t* limits);
// Takes over a connected AF_UNIX stream socket.
PLR_EXPORT vox_connection_t vox_connection_create_from_socket(int descriptor,
                                                              const vox_limits_t* limits);

// ---- Setting up ----------------------------------------------------------------

// Both before the first resume only. Without a target queue a connection makes
// a serial one of its own.
PLR_EXPORT void vox_connection_set_event_handler(
    vox_connection_t connection, const dispatch::block<void(vox_object_t)>* handler);
PLR_EXPORT void vox_connection_set_target_queue(vox_connection_t connection,
                                                const dispatch::queue* queue);
// Counted; one suspension stands from the start. While suspended nothing is
// delivered, and nothing is read from the peer.
PLR_EXPORT void vox_connection_resume(vox_connection_t connection);
PLR_EXPORT void vox_connection_suspend(vox_connection_t connection);
// Closes the connection at once; what was not yet handed to the kernel is lost
// (send a barrier first to keep it). Every outstanding reply handler is called
// with the error, then the event handler gets INVALID, also while suspended.
// Again: nothing.
PLR_EXPORT void vox_connection_cancel(vox_connection_t connection);

// ---- Sending -------------------------------------------------------------------

// `message` is a dictionary, or a reply made by vox_dictionary_create_reply(),
// which must go to the request's own connection (EINVAL otherwise) and only once
// (EALREADY). The message is encoded before the call returns and may be changed
// afterwards. Returns 0 when it was accepted for sending, else an error number
// and nothing is sent: EINVAL not a dictionary, EMSGSIZE larger or deeper or with
// more descriptors than the peer accepts, EILSEQ text that is not UTF-8, ENOBUFS
// dropped by the overflow policy, EPIPE the connection has ended.
PLR_EXPORT int vox_connection_send_message(vox_connection_t connection, vox_object_t message);

// The same, asking for a reply. `handler` runs exactly once on `queue`: with the
// reply (a dictionary) or with an error object; also when the message could not
// be sent.
PLR_EXPORT void vox_connection_send_message_with_reply(
    vox_connection_t connection, vox_object_t message, const dispatch::queue* queue,
    const dispatch::block<void(vox_object_t)>* handler);

// Runs `barrier` on the target queue once every message sent before was handed
// to the kernel, or can never be. On a connection that was never resumed it
// waits for the resume.
PLR_EXPORT void vox_connection_send_barrier(vox_connection_t connection,
                                            const dispatch::block<void()>* barrier);

// ---- Requests and replies --------------------------------------------------------

// A new dictionary that answers `request` when it is sent; a null pointer when
// `request` is no received request, or has got its reply dictionary already. A
// request that is released unanswered stays unanswered: its asker waits until
// the connection ends.
PLR_EXPORT vox_object_t vox_dictionary_create_reply(vox_object_t request);
// The connection that a received message came on, or that a reply will go to
// (lent); null pointer for others.
PLR_EXPORT vox_connection_t vox_dictionary_get_remote_connection(vox_object_t message);

// ---- Looking ---------------------------------------------------------------------

// The service's name; "" for connections without one.
PLR_EXPORT const char* vox_connection_get_name(vox_connection_t connection);
// The peer, as the kernel knew it when the connection was made (SO_PEERCRED);
// -1 when not connected yet.
PLR_EXPORT pid_t vox_connection_get_pid(vox_connection_t connection);
PLR_EXPORT uid_t vox_connection_get_uid(vox_connection_t connection);
PLR_EXPORT gid_t vox_connection_get_gid(vox_connection_t connection);
PLR_EXPORT void vox_connection_get_statistics(vox_connection_t connection,
                                              vox_statistics_t* statistics);

// A process-wide count of activities under way. More ends than begins stop the
// process.
PLR_EXPORT void vox_transaction_begin(void);
PLR_EXPORT void vox_transaction_end(void);
PLR_EXPORT uint64_t vox_transaction_count(void);

#ifdef __cplusplus
}
#endif
