#include "bench/fanout_sockets.h"

#include <sys/epoll.h>
#include <sys/socket.h>

#include <array>

namespace bench::fanout_sockets {

void sendAll(int fd, const void* bytes, std::size_t length) {
    const auto* next = static_cast<const char*>(bytes);
    while (length > 0) {
        const ssize_t sent = ::send(fd, next, length, MSG_NOSIGNAL);
        if (sent < 0)
            fail("send");
        next += sent;
        length -= static_cast<std::size_t>(sent);
    }
}

void receiveAll(int fd, void* bytes, std::size_t length) {
    if (::recv(fd, bytes, length, MSG_WAITALL) != static_cast<ssize_t>(length))
        fail("recv");
}

void watch(const std::vector<int>& sockets, std::size_t frameBytes, fanout_cases::Board& board) {
    const int epoll = check(::epoll_create1(EPOLL_CLOEXEC), "epoll_create1");
    for (std::size_t i = 0; i < sockets.size(); ++i) {
        epoll_event event{};
        event.events = EPOLLIN;
        event.data.u64 = i;
        check(::epoll_ctl(epoll, EPOLL_CTL_ADD, sockets[i], &event), "epoll_ctl");
    }
    std::vector<std::size_t> partial(sockets.size());  // bytes of an unfinished message
    std::vector<char> buffer(64 * 1024);
    std::array<epoll_event, 256> events{};
    for (;;) {
        const int count = ::epoll_wait(epoll, events.data(), static_cast<int>(events.size()), -1);
        for (int n = 0; n < count; ++n) {
            const std::size_t i = events[static_cast<std::size_t>(n)].data.u64;
            const ssize_t got = ::recv(sockets[i], buffer.data(), buffer.size(), 0);
            if (got <= 0)
                fail("a watcher lost its connection");
            partial[i] += static_cast<std::size_t>(got);
            if (partial[i] >= frameBytes)
                board.deliver(partial[i] / frameBytes);
            partial[i] %= frameBytes;
        }
    }
}

}  // namespace bench::fanout_sockets
