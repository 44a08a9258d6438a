#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>

#include "serial/serial.h"

extern "C" {

int serial_wake_open(void) {
    return ::eventfd(0, EFD_SEMAPHORE | EFD_CLOEXEC | EFD_NONBLOCK);
}

void serial_wake_close(int wake) {
    ::close(wake);
}

void serial_wake_post(int wake) {
    const int before = errno;
    const std::uint64_t one = 1;
    // Fails only where 2^64 - 2 posts are waiting.
    static_cast<void>(!::write(wake, &one, sizeof one));
    errno = before;
}

int serial_wake_take(int wake) {
    const int before = errno;
    std::uint64_t one;
    const bool taken = ::read(wake, &one, sizeof one) == sizeof one;
    errno = before;
    return taken;
}

}  // extern "C"
