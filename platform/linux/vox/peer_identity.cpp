#include "platform/linux/vox/peer_identity.h"

#include <cerrno>

namespace vox_link {

ucred credentials_of(int fd) noexcept {
    ucred peer = {-1, static_cast<uid_t>(-1), static_cast<gid_t>(-1)};
    socklen_t size = sizeof peer;
    ::getsockopt(fd, SOL_SOCKET, SO_PEERCRED, &peer, &size);
    return peer;
}

std::vector<gid_t> groups_of(int fd) {
    constexpr std::size_t kUsual = 32;  // ERANGE tells the size of more
    std::vector<gid_t> groups(kUsual);
    auto bytes = static_cast<socklen_t>(groups.size() * sizeof(gid_t));
    int error = ::getsockopt(fd, SOL_SOCKET, SO_PEERGROUPS, groups.data(), &bytes) == 0 ? 0 : errno;
    if (error == ERANGE) {
        groups.resize(bytes / sizeof(gid_t));
        error = ::getsockopt(fd, SOL_SOCKET, SO_PEERGROUPS, groups.data(), &bytes) == 0 ? 0 : errno;
    }
    groups.resize(error == 0 ? bytes / sizeof(gid_t) : 0);
    return groups;
}

}  // namespace vox_link
