#pragma once

#include <sys/types.h>

#include "dispatch/dispatch.h"
#include "plr/base/export.h"
#include "vox/limits.h"
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

// Counters of one connection since it was made.
typedef struct vox_statistics {
    uint64_t messages_sent;      // handed to the kernel completely
    uint64_t messages_received;  // delivered or waiting for delivery
    uint64_t messages_dropped;   // refused here by the overflow policy
    uint64_t peer_dropped;       // what the peer said it dropped for us
    uint64_t requests_refused;   // requests of the peer, for the limit of open ones
    uint64_t replies_refused;    // requests of this side, for the limit of pending replies
    uint64_t peer_refused;       // requests of this side that the peer refused
    // Now:
    uint64_t queued_messages;  // waiting to be written
    uint64_t queued_bytes;
    uint64_t pending_replies;   // requests of this side that wait for the peer
    uint64_t open_requests;     // requests of the peer that wait for this side
    uint64_t held_descriptors;  // as vox_limits_t has it
    uint64_t partial_bytes;     // read of a frame that is not whole
} vox_statistics_t;

#ifdef __cplusplus
extern "C" {
#endif

// ---- Making connections -------------------------------------------------------

// A client of the service `name` (1 to 100 characters of [A-Za-z0-9._-], not
// starting with '.'): the socket `name` in $VOX_RUNTIME_DIR, else in
// $XDG_RUNTIME_DIR/vox, else in /run/vox. Never fails itself: what is wrong
// arrives as the error event.
PLR_EXPORT vox_connection_t vox_connection_create(const char* name);

// A client of the listener that made `endpoint` (vox/listener.h).
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

// The same with a time limit and a number to cancel it by. `timeout_ms`: from now,
// 0 for none. When it is over, `handler` gets REQUEST_TIMED_OUT, the pending entry is
// gone at once, and the peer is told; a reply that comes later is ignored. Returns the
// request's number, not 0; 0 when nothing was sent and the handler gets the error.
PLR_EXPORT uint64_t vox_connection_send_request(vox_connection_t connection, vox_object_t message,
                                                uint32_t timeout_ms, const dispatch::queue* queue,
                                                const dispatch::block<void(vox_object_t)>* handler);
// Gives up a request: its handler gets REQUEST_CANCELLED, and the peer is told.
// Returns 0; ESRCH when its handler was called or queued already, or never was one.
PLR_EXPORT int vox_connection_cancel_request(vox_connection_t connection, uint64_t number);

// Runs `barrier` on the target queue once every message sent before was handed
// to the kernel, or can never be. On a connection that was never resumed it
// waits for the resume.
PLR_EXPORT void vox_connection_send_barrier(vox_connection_t connection,
                                            const dispatch::block<void()>* barrier);

// ---- Requests and replies --------------------------------------------------------

// A new dictionary that answers `request` when it is sent; a null pointer when
// `request` is no received request, or has got its reply dictionary already. A
// request that is released unanswered stays unanswered: its asker waits until
// its own time limit, or until the connection ends.
PLR_EXPORT vox_object_t vox_dictionary_create_reply(vox_object_t request);
// Whether nobody waits for the reply any more: the asker gave the request up, or
// its connection ended. `message` is the request or the reply made for it; 0 for
// others, and for those that were answered. Sending such a reply gives ECANCELED (EPIPE).
PLR_EXPORT int vox_dictionary_is_cancelled(vox_object_t message);
// Runs `handler` once, on the connection's target queue, when that happens, or
// now if it has; released unrun once the reply is sent or can never be. One a
// request: a second replaces the first. EINVAL for what is no open request.
PLR_EXPORT int vox_dictionary_set_cancel_handler(vox_object_t message,
                                                 const dispatch::block<void()>* handler);
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
// Its supplementary groups, from then too (SO_PEERGROUPS): writes up to `most` to
// `groups` and returns how many there are; 0 when not known.
PLR_EXPORT size_t vox_connection_get_groups(vox_connection_t connection, gid_t* groups,
                                            size_t most);
PLR_EXPORT void vox_connection_get_statistics(vox_connection_t connection,
                                              vox_statistics_t* statistics);

#ifdef __cplusplus
}
#endif
