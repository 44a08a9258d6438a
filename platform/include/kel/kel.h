#pragma once

#include <stdarg.h>
#include <stddef.h>
#include <stdint.h>

#include "plr/base/export.h"

// Kel: the system log.
//
// A client sends messages to the first of these that is there: the journal's
// native socket (all fields arrive as they are), /dev/log (RFC 3164), standard
// error (one line a message, "<N>" in front, control characters escaped).
//
// Owner:   kel_open() and kel_new() give, kel_close() and kel_free() take back.
// Threads: a client may be used by many threads at once, a message by one.
// Order:   messages of one thread leave in the order of their kel_send().
// Blocks:  never, except kel_flush() and kel_close() within their bounds. What
//          the log cannot take now waits in the client's backlog and is sent
//          later from a queue of the client's.
// Limits:  the backlog is bounded (kel_set_limits). What does not fit is
//          dropped and counted; after a drop, messages are taken again once the
//          backlog is down to three quarters. In the place of the gap, a message
//          of priority 4 says "<count> messages dropped", with the number in
//          the field KEL_DROPPED as well.
// Absence: a log that goes away is waited for (kel_limits.patience_ms), then
//          the next one in the list is used; a better one that comes back is
//          noticed within a second of further messages.
// Fork:    a child may go on with its parent's clients; what waits is the
//          parent's, and the child has no backlog: what is not taken at once
//          is dropped.
// Errors:  every function accepts null clients and messages and then does nothing.
//
// Journal fields: MESSAGE and PRIORITY come from the keys "Message" and "Level",
// SYSLOG_IDENTIFIER and SYSLOG_FACILITY from kel_open(). Every other key becomes
// a field by one rule: ASCII letters in upper case, anything but letters and
// digits as '_'; where that begins with '_' or a digit, is empty, or is a name
// that stands in this comment, "KEY_" goes in front; the first 64 bytes count.
// "Facility" is thus FACILITY, "a.b" A_B, "_x" KEY__X.
// See https://systemd.io/JOURNAL_NATIVE_PROTOCOL.
#ifdef __cplusplus
extern "C" {
#endif

typedef struct kel_client* kel_client_t;
typedef struct kel_message* kel_message_t;

// `ident`: SYSLOG_IDENTIFIER; null for the program's name. `facility`: a name of
// syslog(3) such as "daemon" or "local3" becomes SYSLOG_FACILITY; any other text
// is the "Facility" of messages that have none; null for none. Both are copied.
// `options`: 0. Opens no daemon: a log that is absent now may come later.
// Returns null when memory runs out.
PLR_EXPORT kel_client_t kel_open(const char* ident, const char* facility, uint32_t options);

// Bit N of `mask` lets messages of priority N through (RFC 5424: 0 is the most
// urgent, 7 debug); the rest is neither sent nor counted. All eight bits are set
// at first. Returns the previous mask.
PLR_EXPORT int kel_set_filter(kel_client_t client, int mask);

// A message without fields. `type`: 0. Null for other types and when memory
// runs out.
PLR_EXPORT kel_message_t kel_new(uint32_t type);

// Sets `key` to a copy of `value`, in place of an earlier value of the same key.
// "Level" is one of "Emergency", "Alert", "Critical", "Error", "Warning",
// "Notice", "Info", "Debug": priorities 0 to 7; 6 without one. A null value is
// the empty text. kel_set_bytes() takes any bytes.
// Returns 0, EINVAL for a null key, or ENOMEM.
PLR_EXPORT int kel_set(kel_message_t message, const char* key, const char* value);
PLR_EXPORT int kel_set_bytes(kel_message_t message, const char* key, const void* value,
                             size_t length);

// Sends the message, or leaves it to the backlog, or drops it; see above. The
// message stays the caller's and may be sent again.
PLR_EXPORT void kel_send(kel_client_t client, kel_message_t message);

PLR_EXPORT void kel_free(kel_message_t message);

// A last attempt for what waits, at most 100 ms, then the end: no other use of
// the client may go on or follow. Returns the number of messages given up.
PLR_EXPORT size_t kel_close(kel_client_t client);

// Waits until nothing waits in the backlog, at most `bound` milliseconds.
// Returns whether nothing does.
PLR_EXPORT int kel_flush(kel_client_t client, unsigned bound);

// What happened to the messages given to kel_send(); messages that the client
// made itself are not counted. sent + dropped + waiting is all of them.
struct kel_statistics {
    uint64_t sent;     // handed to the kernel
    uint64_t dropped;  // did not fit, or were refused
    uint64_t waiting;  // in the backlog now
};
PLR_EXPORT struct kel_statistics kel_get_statistics(kel_client_t client);

// How much the backlog holds: as many messages and bytes (fields, plus
// KEL_MESSAGE_OVERHEAD a message), whichever comes first; one message of any
// size is always taken. Patience: how long a log that went away is waited for
// before the next best is used.
// The default outlasts 5 s without the journal at 20,000 short messages a second.
struct kel_limits {
    size_t messages;
    size_t bytes;
    unsigned patience_ms;
};
#define KEL_DEFAULT_MESSAGES 131072u
#define KEL_DEFAULT_BYTES 67108864u
#define KEL_DEFAULT_PATIENCE_MS 10000u
#define KEL_MESSAGE_OVERHEAD 96u
PLR_EXPORT void kel_set_limits(kel_client_t client, struct kel_limits limits);

// A message of the library's own, without a client: "Message" is formatted like
// printf, `priority` 0 to 7. Goes through one client of the process's, which is
// never closed. Keeps errno.
PLR_EXPORT void kel_log(int priority, const char* format, ...)
    __attribute__((format(printf, 2, 3)));
PLR_EXPORT void kel_vlog(int priority, const char* format, va_list arguments)
    __attribute__((format(printf, 2, 0)));

// For crash handlers: one attempt to send a message at once, past the backlog.
// Async-signal-safe: no lock, no allocation, keeps errno; under 2 KiB of stack.
// `domain` ("Facility") may be null. At most KEL_SEND_NOW_BYTES of the text count,
// KEL_SEND_NOW_LINE where there is no journal. Not counted in the statistics.
// Returns whether the kernel took it.
#define KEL_SEND_NOW_BYTES 32768u
#define KEL_SEND_NOW_LINE 1024u
PLR_EXPORT int kel_send_now(kel_client_t client, int priority, const char* domain, const char* text,
                            size_t length);

// The same for what waits in the backlog: each message is tried once, in order.
// To be called once, in a process that ends: the client cannot be used
// afterwards but for kel_send_now(). A message that another thread was sending
// may appear twice. Gives up when the crash hit a thread that was changing the
// backlog. Returns whether everything was handed over.
PLR_EXPORT int kel_flush_now(kel_client_t client);

// Where clients opened from now on find the logs; for tests. A null path or a
// negative descriptor restores the default: "/run/systemd/journal/socket",
// "/dev/log", standard error. There is no environment variable for it, because
// that would let callers of privileged programs redirect their log.
PLR_EXPORT void kel_set_places(const char* journal, const char* syslog, int console);

#ifdef __cplusplus
}
#endif
