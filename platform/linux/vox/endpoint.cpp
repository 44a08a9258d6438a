#include "platform/linux/vox/endpoint.h"

#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>

#include "platform/linux/vox/peer_identity.h"
#include "platform/linux/vox/socket_io.h"
#include "platform/linux/vox/value_layout.h"

namespace vox_link {
namespace {

// Whether `fd` ends in its sender. Somebody else's socket, passed on, would
// make that somebody the client: what it sends would be taken for its wishes.
bool is_client_socket(int fd, pid_t sender) noexcept {
    return is_stream_socket(fd, false) && credentials_of(fd).pid == sender;
}

int send_client(int endpoint, int client) noexcept {
    std::uint8_t byte = 0;
    iovec piece = {&byte, 1};
    return send_pieces(endpoint, {&piece, 1}, {&client, 1}).error;
}

}  // namespace

int make_endpoint_pair(int& listeners, int& holders) noexcept {
    std::array<int, 2> ends;
    if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends.data()) != 0)
        return errno;
    const int on = 1;
    if (::setsockopt(ends[0], SOL_SOCKET, SO_PASSCRED, &on, sizeof on) != 0) {
        const int error = errno;
        ::close(ends[0]);
        ::close(ends[1]);
        return error;
    }
    listeners = ends[0];
    holders = ends[1];
    return 0;
}

int connect_endpoint(vox_object_t endpoint, int& fd, std::string& why) {
    const auto* held = vox_values::as<vox_descriptor_object>(endpoint, VOX_TYPE_ENDPOINT);
    if (!held) {
        why = "the value is no endpoint";
        return EINVAL;
    }
    std::array<int, 2> ends;
    int error = 0;
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends.data()) != 0) {
        error = errno;
    } else {
        error = send_client(held->descriptor, ends[1]);
        ::close(ends[1]);
        if (error == 0)
            fd = ends[0];
        else
            ::close(ends[0]);
    }
    if (error == ETOOMANYREFS)  // too many are under way
        error = EAGAIN;
    if (error != 0)
        why = std::string("endpoint: ") + ::strerrordesc_np(error);
    return error;
}

int take_client(int listeners, int& fd) noexcept {
    std::array<std::uint8_t, 8> packet;
    received got;
    receive_once(listeners, packet, got);
    if (got.error != 0)
        return got.error;
    if (got.lost_descriptors && got.descriptor_count == 0)
        return EMFILE;
    if (got.bytes == 0 && got.descriptor_count == 0)
        return ECONNRESET;
    if (got.bytes == 1 && got.descriptor_count == 1 &&
        is_client_socket(got.descriptors[0], got.sender)) {
        fd = got.descriptors[0];
        return 0;
    }
    got.close_descriptors();
    return EPROTO;
}

}  // namespace vox_link
