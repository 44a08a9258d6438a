#include <poll.h>
#include <unistd.h>

#include <array>
#include <cerrno>

#include "serial/serial.h"

namespace {

constexpr short kGone = POLLHUP | POLLERR | POLLNVAL;

// Repeats a call that a signal interrupted.
template <class Call>
auto uninterrupted(Call call) noexcept {
    decltype(call()) result;
    do
        result = call();
    while (result < 0 && errno == EINTR);
    return result;
}

int fail(int error) noexcept {
    errno = error;
    return -1;
}

int poll_both(std::array<pollfd, 2>& states, int timeout) noexcept {
    return uninterrupted([&] { return ::poll(states.data(), states.size(), timeout); });
}

bool is_hung_up(int port) noexcept {
    std::array<pollfd, 2> states{{{port, 0, 0}, {-1, 0, 0}}};
    return poll_both(states, 0) < 0 || (states[0].revents & kGone) != 0;
}

short events_of(serial_event event) noexcept {
    switch (event) {
        case SERIAL_READABLE:
            return POLLIN;
        case SERIAL_WRITABLE:
            return POLLOUT;
        case SERIAL_HUNG_UP:
            break;
    }
    return 0;
}

}  // namespace

extern "C" {

int serial_wait(int port, int wake, serial_event event) {
    std::array<pollfd, 2> states{{{port, events_of(event), 0}, {wake, POLLIN, 0}}};
    for (;;) {
        if (poll_both(states, -1) < 0)
            return -1;
        if (states[1].revents != 0 && serial_wake_take(wake))
            return 0;
        // What came before the end may be read first.
        if ((states[0].revents & POLLIN) != 0)
            return 1;
        if ((states[0].revents & kGone) != 0)
            return fail(EIO);
        if (states[0].revents != 0)
            return 1;
    }
}

ssize_t serial_read_now(int port, void* buffer, size_t length) {
    const ssize_t count = uninterrupted([&] { return ::read(port, buffer, length); });
    if (count < 0)
        return errno == EAGAIN ? 0 : -1;
    // 0 bytes are the end of the line, or a read minimum of 0.
    return count == 0 && length > 0 && is_hung_up(port) ? fail(EIO) : count;
}

ssize_t serial_write_now(int port, const void* source, size_t length) {
    const ssize_t count = uninterrupted([&] { return ::write(port, source, length); });
    return count < 0 && errno == EAGAIN ? 0 : count;
}

ssize_t serial_read(int port, int wake, void* buffer, size_t length) {
    for (;;) {
        const int result = serial_wait(port, wake, SERIAL_READABLE);
        if (result < 0)
            return -1;
        const ssize_t count = serial_read_now(port, buffer, length);
        // Another thread may have discarded what poll(2) saw.
        if (count != 0 || result == 0 || length == 0)
            return count;
    }
}

int serial_write(int port, int wake, const void* source, size_t length, size_t* written) {
    *written = 0;
    for (;;) {
        const ssize_t count =
            serial_write_now(port, static_cast<const char*>(source) + *written, length - *written);
        if (count < 0)
            return errno;
        *written += static_cast<size_t>(count);
        if (*written == length)
            return 0;
        const int result = serial_wait(port, wake, SERIAL_WRITABLE);
        if (result <= 0)
            return result < 0 ? errno : EINTR;
    }
}

}  // extern "C"
