#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <ctime>
#include <limits>

#include "Pelorin"

namespace {

// What select(2) calls readable: data, the end, a hang-up or an error (the latter two
// poll reports unasked).
constexpr short kReadable = POLLIN | POLLRDNORM | POLLRDBAND;

constexpr std::uint32_t kMostAtOnce = std::numeric_limits<std::int32_t>::max();

timespec toTimespec(std::uint32_t milliseconds) {
    return {static_cast<time_t>(milliseconds / 1000),
            static_cast<long>(milliseconds % 1000) * 1'000'000};
}

// The result of poll, but for descriptors that are not open, which are an error.
int waitFor(std::array<pollfd, 2>& descriptors, std::uint32_t timeoutMs) {
    const timespec timeout = toTimespec(timeoutMs);
    const int ready = ::ppoll(descriptors.data(), descriptors.size(),
                              timeoutMs == PELORIN_FOREVER ? nullptr : &timeout, nullptr);
    for (const pollfd& descriptor : descriptors)
        if (ready > 0 && (descriptor.revents & POLLNVAL) != 0) {
            errno = EBADF;
            return -1;
        }
    return ready;
}

// Nothing was read, for this reason.
std::int32_t nothing(int reason) {
    errno = reason;
    return 0;
}

}  // namespace

extern "C" {

std::int32_t PelorinUnblockableReadWithTimeout(int fd, int unblockFd, void* buffer,
                                               std::uint32_t length, std::uint32_t timeoutMs) {
    if (fd < 0) {
        errno = EBADF;
        return -9;
    }
    // Deliberate: poll passes over a negative descriptor, the one that is not to unblock.
    std::array<pollfd, 2> descriptors{{{fd, kReadable, 0}, {unblockFd, kReadable, 0}}};
    const int ready = waitFor(descriptors, timeoutMs);
    if (ready < 1)
        return ready < 0 ? ready : nothing(ETIMEDOUT);
    if (descriptors[1].revents != 0)
        return nothing(ECANCELED);
    const ssize_t result = ::read(fd, buffer, std::min(length, kMostAtOnce));
    return result != 0 ? static_cast<std::int32_t>(result) : nothing(ENODATA);
}

bool PelorinUnblockableReadToCompletionWithTimeout(int fd, int unblockFd, void* buffer,
                                                   std::uint32_t length, std::uint32_t timeoutMs) {
    auto* to = static_cast<std::uint8_t*>(buffer);
    while (length != 0) {
        const std::int32_t result =
            PelorinUnblockableReadWithTimeout(fd, unblockFd, to, length, timeoutMs);
        if (result < 1)
            return false;
        to += result;
        length -= static_cast<std::uint32_t>(result);
    }
    return true;
}

std::int32_t PelorinWriteToCompletion(int fd, const void* buffer, std::uint32_t length,
                                      std::uint32_t* written) {
    *written = 0;
    while (*written != length) {
        const ssize_t result =
            ::write(fd, static_cast<const std::uint8_t*>(buffer) + *written, length - *written);
        // Deliberate: an interruption by a signal is not retried.
        if (result < 0)
            return errno;
        *written += static_cast<std::uint32_t>(result);
    }
    return 0;
}

}  // extern "C"
