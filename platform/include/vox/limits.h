#pragma once

#include <stdint.h>

#include "plr/base/export.h"

// What a peer may cost. A listener grants its limits to every client, any other
// connection to its peer; those on messages are told to the peer when the
// connection starts, so that it refuses to send what would not be accepted.
//
// At a limit, the one that goes over it pays, and nobody else:
//
//   message size, depth, descriptors   the sender's call fails (EMSGSIZE); a peer
//                                      that sends it nonetheless is disconnected
//   queued bytes, messages             `overflow` decides, for the connection that
//                                      would go over
//   pending replies                    the reply handler gets MESSAGE_REFUSED
//   open requests                      the asker gets MESSAGE_REFUSED at once; the
//                                      service does not see the request
//   held descriptors                   received: the connection ends, the message is
//                                      not delivered; sent: as queued bytes
//   partial bytes, incomplete frame    the connection ends
//   connections                        the new one is closed before any message
//
// Everything is counted (vox_statistics_t, vox_listener_statistics_t), and every
// connection that ends for a limit is reported in one line, at a bounded rate.
typedef enum vox_overflow_policy {
    VOX_OVERFLOW_DISCONNECT,  // the peer that does not read is disconnected (INVALID)
    VOX_OVERFLOW_DROP,        // new messages for it are dropped and counted; it learns the count
} vox_overflow_policy_t;

typedef struct vox_limits {
    // Of one message.
    uint32_t max_message_bytes;  // body; default 16 MiB, at most 1 GiB. An eighth of it is the
                                 // limit for the values in one message
    uint32_t max_depth;          // nested arrays and dictionaries; default and most 64
    uint32_t max_descriptors;    // default and most 64

    // Of one connection.
    uint32_t max_queued_bytes;      // waiting for a peer that does not read; default 16 MiB
                                    // (a message is accepted when nothing waits, whatever its size)
    uint32_t max_queued_messages;   // the same, in messages; default 65536
    uint32_t max_pending_replies;   // requests of this side that wait for the peer; default 65536
    uint32_t max_open_requests;     // requests of the peer that wait for this side; default 4096
    uint32_t max_held_descriptors;  // that came from the peer and are still held as values, or wait
                                    // to be written to it; default 256
    uint32_t incomplete_frame_ms;   // a started frame must be whole by then, and the first one of a
                                    // client come and be whole; default 30000

    // Of one listener: all clients, and those of one user (uid) together.
    uint32_t max_connections;               // default 4096
    uint32_t max_connections_per_uid;       // default 2048
    uint32_t max_queued_bytes_per_uid;      // default 64 MiB
    uint32_t max_queued_messages_per_uid;   // default 262144
    uint32_t max_pending_replies_per_uid;   // default 262144
    uint32_t max_open_requests_per_uid;     // default 16384
    uint32_t max_held_descriptors_per_uid;  // default 512
    uint32_t max_partial_bytes_per_uid;     // of frames that are not whole yet; default 64 MiB

    vox_overflow_policy_t overflow;  // default VOX_OVERFLOW_DISCONNECT
} vox_limits_t;

#ifdef __cplusplus
extern "C" {
#endif

// Limits that are given as 0 where that makes no sense are read as 1.
PLR_EXPORT vox_limits_t vox_limits_default(void);

#ifdef __cplusplus
}
#endif
