#include <fcntl.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <time.h>
#include <unistd.h>

#include <cerrno>

#include "serial/serial.h"

namespace {

constexpr long kLookMs = 5;     // how often a line that sends is looked at
constexpr long kStuckMs = 100;  // without progress, then it is given up

// Bytes that the driver has yet to send, 0 for a line that is gone.
int unsent(int port) noexcept {
    int count = 0;
    return ::ioctl(port, TIOCOUTQ, &count) == 0 ? count : 0;
}

// close(2) waits up to 30 s for a line that takes nothing, and tcdrain(3) for ever;
// no event tells of progress.
void drain(int port) noexcept {
    const timespec look{0, kLookMs * 1'000'000};
    int last = unsent(port);
    for (long stuck = 0; last > 0 && stuck < kStuckMs; stuck += kLookMs) {
        ::clock_nanosleep(CLOCK_MONOTONIC, 0, &look, nullptr);
        const int now = unsent(port);
        if (now != last)
            stuck = 0;
        last = now;
    }
    if (last > 0)
        ::tcflush(port, TCOFLUSH);
}

}  // namespace

extern "C" {

int serial_open(const char* path) {
    int port;
    do
        port = ::open(path, O_RDWR | O_NOCTTY | O_CLOEXEC | O_NONBLOCK);
    while (port < 0 && errno == EINTR);
    return port;
}

int serial_close(int port) {
    drain(port);
    return ::close(port);
}

int serial_flush_input(int port) {
    return ::tcflush(port, TCIFLUSH);
}

int serial_flush_output(int port) {
    return ::tcflush(port, TCOFLUSH);
}

}  // extern "C"
