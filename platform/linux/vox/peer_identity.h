#pragma once

#include <sys/socket.h>
#include <sys/types.h>

#include <vector>

// What the kernel tells of the process at the other end of an AF_UNIX stream
// socket, as it was when the connection was made.
namespace vox_link {

// SO_PEERCRED; {-1, -1, -1} when not known.
[[nodiscard]] ucred credentials_of(int fd) noexcept;
// SO_PEERGROUPS: the supplementary groups; empty when not known.
[[nodiscard]] std::vector<gid_t> groups_of(int fd);

}  // namespace vox_link
