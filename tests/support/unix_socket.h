#pragma once

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstddef>
#include <string>

// Unix sockets at paths.
namespace plr::test {

struct UnixAddress {
    // "@name" is a name without a file.
    explicit UnixAddress(const std::string& path) {
        path.copy(un.sun_path, sizeof un.sun_path - 1);
        if (path.starts_with('@')) {
            un.sun_path[0] = '\0';
            size = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + path.size());
        }
    }
    operator const sockaddr*() const { return reinterpret_cast<const sockaddr*>(&un); }

    sockaddr_un un = {.sun_family = AF_UNIX, .sun_path = {}};
    socklen_t size = sizeof un;
};

inline int boundSocket(int type, const std::string& path) {
    const UnixAddress address(path);
    const int fd = ::socket(AF_UNIX, type | SOCK_CLOEXEC, 0);
    EXPECT_EQ(::bind(fd, address, address.size), 0) << path;
    return fd;
}
inline int listeningSocket(const std::string& path, int flags = 0) {
    const int fd = boundSocket(SOCK_STREAM | flags, path);
    EXPECT_EQ(::listen(fd, 100), 0);
    return fd;
}
// A stream; -1 when that fails.
inline int connectTo(const std::string& path) {
    const UnixAddress address(path);
    const int fd = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (::connect(fd, address, address.size) == 0)
        return fd;
    ::close(fd);
    return -1;
}

}  // namespace plr::test
