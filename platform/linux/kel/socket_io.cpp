#include "platform/linux/kel/socket_io.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstring>

namespace kel {
namespace {

constexpr int kWithoutWaiting = MSG_DONTWAIT | MSG_NOSIGNAL;
constexpr int kSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE | F_SEAL_SEAL;

// Repeats a call that a signal interrupted.
template <class Call>
ssize_t uninterrupted(Call call) noexcept {
    ssize_t result;
    do
        result = call();
    while (result < 0 && errno == EINTR);
    return result;
}

bool is_ready(int fd) noexcept {
    pollfd state{fd, POLLOUT, 0};
    return ::poll(&state, 1, 0) > 0;
}

bool write_all(int fd, std::string_view bytes) noexcept {
    while (!bytes.empty()) {
        const ssize_t count =
            uninterrupted([&] { return ::write(fd, bytes.data(), bytes.size()); });
        if (count <= 0)
            return false;
        bytes.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
}

// The receiver maps it, so nobody may change it any more. -1 on failure.
int make_sealed_file(std::string_view bytes) noexcept {
    const int file = ::memfd_create("kel", MFD_CLOEXEC | MFD_ALLOW_SEALING);
    if (file < 0 || (write_all(file, bytes) && ::fcntl(file, F_ADD_SEALS, kSeals) == 0))
        return file;
    ::close(file);
    return -1;
}

// An empty datagram that carries `file`.
outcome send_descriptor(int fd, int file) noexcept {
    alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof file)> control{};
    msghdr header{};
    header.msg_control = control.data();
    header.msg_controllen = control.size();
    cmsghdr* const rights = CMSG_FIRSTHDR(&header);
    rights->cmsg_level = SOL_SOCKET;
    rights->cmsg_type = SCM_RIGHTS;
    rights->cmsg_len = CMSG_LEN(sizeof file);
    std::memcpy(CMSG_DATA(rights), &file, sizeof file);
    const ssize_t sent = uninterrupted([&] { return ::sendmsg(fd, &header, kWithoutWaiting); });
    return sent >= 0 ? outcome::sent : outcome_of(errno);
}

outcome send_as_file(int fd, std::string_view bytes) noexcept {
    if (!is_ready(fd))
        return outcome::full;  // before the file is made
    const int file = make_sealed_file(bytes);
    if (file < 0)
        return outcome::refused;  // no descriptor or no memory for it
    const outcome result = send_descriptor(fd, file);
    ::close(file);
    return result;
}

}  // namespace

outcome outcome_of(int error) noexcept {
    switch (error) {
        case EAGAIN:
            return outcome::full;
        case ENOBUFS:
        case ENOMEM:
        case ETOOMANYREFS:
            return outcome::shortage;
        case ECONNREFUSED:
        case ECONNRESET:
        case ENOTCONN:
        case EDESTADDRREQ:
        case ENOENT:
        case EPIPE:
        case EBADF:
        case ENOTSOCK:
            return outcome::absent;
        default:
            return outcome::refused;
    }
}

int make_socket() noexcept {
    return ::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
}

bool connect_socket(int fd, const std::string& path) noexcept {
    sockaddr_un address{};
    if (fd < 0 || path.size() >= sizeof address.sun_path)
        return false;
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, path.size());
    return uninterrupted([&] {
               return ::connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address);
           }) == 0;
}

outcome send_datagram(int fd, std::string_view bytes) noexcept {
    const ssize_t sent =
        uninterrupted([&] { return ::send(fd, bytes.data(), bytes.size(), kWithoutWaiting); });
    return sent >= 0 ? outcome::sent : outcome_of(errno);
}

outcome send_native(int fd, std::string_view bytes) noexcept {
    const outcome result = send_datagram(fd, bytes);
    return result == outcome::refused && errno == EMSGSIZE ? send_as_file(fd, bytes) : result;
}

outcome write_ready(int fd, std::string_view& bytes) noexcept {
    while (!bytes.empty()) {
        ssize_t count =
            uninterrupted([&] { return ::send(fd, bytes.data(), bytes.size(), kWithoutWaiting); });
        if (count < 0 && errno == ENOTSOCK) {
            pollfd state{fd, POLLOUT, 0};
            if (::poll(&state, 1, 0) <= 0)
                return outcome::shortage;
            // Nobody reads the pipe: writing would raise SIGPIPE.
            if ((state.revents & (POLLERR | POLLHUP | POLLNVAL)) != 0)
                return outcome::refused;
            const std::size_t piece = std::min<std::size_t>(bytes.size(), PIPE_BUF);
            count = uninterrupted([&] { return ::write(fd, bytes.data(), piece); });
        }
        if (count < 0)
            return errno == EAGAIN || errno == ENOBUFS ? outcome::shortage : outcome::refused;
        bytes.remove_prefix(static_cast<std::size_t>(count));
    }
    return outcome::sent;
}

}  // namespace kel
