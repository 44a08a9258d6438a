// What a service tells its service manager (vox/service.h).
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "vox/service.h"

namespace {

// Where `place` is: the address and its length; 0 when it is none.
socklen_t read_address(std::string_view place, sockaddr_un& address) noexcept {
    const bool is_abstract = place.front() == '@';
    if ((!is_abstract && place.front() != '/') || place.size() < 2 ||
        place.size() >= sizeof address.sun_path)
        return 0;
    address.sun_family = AF_UNIX;
    place.copy(address.sun_path, place.size());
    if (is_abstract)
        address.sun_path[0] = '\0';
    // The length of an abstract name counts; a path ends with its NUL.
    return static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + place.size() +
                                  (is_abstract ? 0 : 1));
}

int send_state(const sockaddr_un& address, socklen_t size, std::string_view state) noexcept {
    const int fd = ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    if (fd < 0)
        return errno;
    int error = EINTR;
    while (error == EINTR) {
        const ssize_t sent = ::sendto(fd, state.data(), state.size(), MSG_NOSIGNAL,
                                      reinterpret_cast<const sockaddr*>(&address), size);
        error = sent < 0 ? errno : 0;
    }
    ::close(fd);
    return error;
}

}  // namespace

int vox_notify(const char* state) {
    if (!state || !*state)
        return EINVAL;
    const char* place = std::getenv("NOTIFY_SOCKET");  // NOLINT(concurrency-mt-unsafe): only reads
    if (!place || !*place)
        return ENOENT;
    sockaddr_un address = {};
    const socklen_t size = read_address(place, address);
    return size > 0 ? send_state(address, size, state) : EAFNOSUPPORT;
}

int vox_notify_ready(void) {
    return vox_notify("READY=1");
}

int vox_notify_stopping(void) {
    return vox_notify("STOPPING=1");
}
