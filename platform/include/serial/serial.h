#pragma once

#include <stddef.h>
#include <stdint.h>
#include <sys/types.h>

#include "plr/base/export.h"

struct termios;

// Serial: a serial port, as POSIX (General Terminal Interface, termios.h) has it,
// with waits that another thread can end.
//
// Owner:   a port and a wake are descriptors; serial_open() and serial_wake_open()
//          give, serial_close() and serial_wake_close() take back. Neither goes to
//          programs that are started.
// Threads: one thread reads a port while another writes it; settings at any time.
//          Wakes from any thread. The owner closes when nobody uses them any more.
// Errors:  -1 with errno set. A line that hung up (unplugged, the other end of a
//          pseudo-terminal closed) is EIO in every read, write and wait, at once.
// Signals: interrupt nothing.
#ifdef __cplusplus
extern "C" {
#endif

// Opens the device for reading and writing. Does not wait for a carrier, and the
// port does not become the process's terminal.
PLR_EXPORT int serial_open(const char* path);

// Closes `port` after the driver has sent what it was given, for as long as that
// makes progress: what it has not begun to send for 100 ms (the peer holds
// its flow control) is discarded. A line that hung up is closed at once.
// Returns the result of close(2); the descriptor is gone in any case.
PLR_EXPORT int serial_close(int port);

// ---- Settings --------------------------------------------------------------

PLR_EXPORT int serial_get_attributes(int port, struct termios* attributes);
PLR_EXPORT int serial_set_attributes(int port, const struct termios* attributes);

// Eight bits, no parity, one stop bit, every byte as it is; no signals, lines or
// echo; modem lines ignored, hung up after the last close. With `flow_control`, RTS
// and CTS hold the sender of either side. Changes neither speed nor c_cc.
PLR_EXPORT void serial_make_raw(struct termios* attributes, int flow_control);

// Bits a second in both directions, any number. EINVAL for 0 and where the driver
// took a rate that is more than 3 % off, which a receiver does not follow.
PLR_EXPORT int serial_set_baud(int port, uint32_t baud);

// How many bytes must have come for a read to begin: VMIN, 0 to 255, EINVAL for
// others. With 0 a read does not wait.
PLR_EXPORT int serial_set_read_minimum(int port, uint32_t bytes);

// The driver's receive queue, in bytes. Linux drivers size theirs themselves: any
// size is accepted and changes nothing.
PLR_EXPORT int serial_set_receive_queue(int port, uint32_t bytes);

// Discard what was received and not read, or what was written and not sent.
PLR_EXPORT int serial_flush_input(int port);
PLR_EXPORT int serial_flush_output(int port);

// ---- Wakes -----------------------------------------------------------------

// A wake counts: each post ends one wait, the present or the next one.
PLR_EXPORT int serial_wake_open(void);
PLR_EXPORT void serial_wake_close(int wake);
// Async-signal-safe.
PLR_EXPORT void serial_wake_post(int wake);
// Takes one post back. Returns whether there was one.
PLR_EXPORT int serial_wake_take(int wake);

// ---- Bytes -----------------------------------------------------------------
// `wake` is negative where nobody ends the wait.

enum serial_event {
    SERIAL_HUNG_UP = 0,  // nothing but the end of the line
    SERIAL_READABLE = 1,
    SERIAL_WRITABLE = 2
};

// Waits for `event`. 1 when it is there, 0 when a post ended the wait, which it
// takes and which wins.
PLR_EXPORT int serial_wait(int port, int wake, enum serial_event event);

// What there is now, at most `length` bytes, 0 for none.
PLR_EXPORT ssize_t serial_read_now(int port, void* buffer, size_t length);
// The driver's room now, at most `length` bytes, 0 for none.
PLR_EXPORT ssize_t serial_write_now(int port, const void* source, size_t length);

// Waits until the read minimum is there, and reads once. A post ends it with
// what there is, perhaps nothing.
PLR_EXPORT ssize_t serial_read(int port, int wake, void* buffer, size_t length);

// Writes until all is written or a post ends it. `written` counts the bytes either
// way. Returns 0; the error number of the write that failed; EINTR for a post.
PLR_EXPORT int serial_write(int port, int wake, const void* source, size_t length, size_t* written);

#ifdef __cplusplus
}
#endif
