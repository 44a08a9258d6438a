#include "support/system_faults.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <sys/epoll.h>
#include <sys/file.h>
#include <sys/socket.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <map>
#include <mutex>

namespace plr::test::faults {
namespace {

constexpr auto kCalls = static_cast<std::size_t>(Call::count);

std::atomic<int> failing{-1};  // a Call
std::atomic<int> failsWith{0};
std::atomic<std::size_t> failsAt{0};
std::atomic<bool> came{false};
std::array<std::atomic<std::size_t>, kCalls> counts;

// What each descriptor is watched for.
struct Watched {
    int epoll;
    epoll_event event;
};
std::mutex watchLock;
// Never destroyed: threads of the pool use it until the process is gone.
std::map<int, Watched>& watches() {
    static auto* const all = new std::map<int, Watched>;
    return *all;
}

// The function that would have been called.
template <class Function>
Function* next(Function*, const char* name) {
    return reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
}
#define NEXT(name)                                     \
    ([]() {                                            \
        static auto* const real = next(::name, #name); \
        return real;                                   \
    }())

// Counts a call. Returns its fault, 0 for none.
int faultOf(Call call) {
    const auto index = static_cast<std::size_t>(call);
    const std::size_t number = counts[index].fetch_add(1) + 1;
    if (failing.load() != static_cast<int>(call) || number != failsAt.load())
        return 0;
    came.store(true);
    return failsWith.load();
}

// Counts a call. Whether it is to fail, with errno set.
bool fails(Call call) {
    const int fault = faultOf(call);
    if (fault != 0)
        errno = fault;
    return fault != 0;
}

// What is left in the descriptor becomes ready anew.
void becomesReady(int fd) {
    const std::lock_guard guard(watchLock);
    if (const auto found = watches().find(fd); found != watches().end())
        NEXT(epoll_ctl)(found->second.epoll, EPOLL_CTL_MOD, fd, &found->second.event);
}

// As fails(), for calls that may find nothing in `fd`.
bool failsOn(int fd, int fault) {
    if (fault <= 0)
        return false;
    if (fault == EAGAIN)
        becomesReady(fd);
    errno = fault;
    return true;
}

}  // namespace

void arm(Call call, int fault, std::size_t n) {
    failing.store(-1);
    for (std::atomic<std::size_t>& count : counts)
        count.store(0);
    came.store(false);
    failsWith.store(fault);
    failsAt.store(n);
    failing.store(static_cast<int>(call));
}

bool disarm() {
    failing.store(-1);
    return came.load();
}

}  // namespace plr::test::faults

// ---- In place of the C library's ----------------------------------------------------

using namespace plr::test::faults;

#define IN_PLACE extern "C" __attribute__((visibility("default")))

IN_PLACE ssize_t send(int fd, const void* data, size_t size, int flags) {
    const int fault = faultOf(Call::send);
    // Whoever waits for room asks for EPOLLOUT after this, and gets it.
    if (fault > 0) {
        errno = fault;
        return -1;
    }
    return NEXT(send)(fd, data, fault == kOneByte && size > 0 ? 1 : size, flags);
}

IN_PLACE ssize_t sendmsg(int fd, const msghdr* message, int flags) {
    const int fault = faultOf(Call::send);
    if (fault > 0) {
        errno = fault;
        return -1;
    }
    if (fault != kOneByte)
        return NEXT(sendmsg)(fd, message, flags);
    iovec piece = {message->msg_iov[0].iov_base, 1};
    msghdr one = *message;
    one.msg_iov = &piece;
    one.msg_iovlen = 1;
    return NEXT(sendmsg)(fd, &one, flags);
}

IN_PLACE ssize_t recvmsg(int fd, msghdr* message, int flags) {
    const int fault = faultOf(Call::receive);
    if (failsOn(fd, fault))
        return -1;
    if (fault == kNoDescriptors)
        message->msg_controllen = 0;
    if (fault != kOneByte)
        return NEXT(recvmsg)(fd, message, flags);
    const iovec whole = message->msg_iov[0];
    message->msg_iov[0].iov_len = 1;
    const ssize_t got = NEXT(recvmsg)(fd, message, flags);
    message->msg_iov[0] = whole;
    if (got == 1)
        becomesReady(fd);
    return got;
}

IN_PLACE int accept4(int fd, sockaddr* address, socklen_t* size, int flags) {
    if (failsOn(fd, faultOf(Call::accept)))
        return -1;
    return NEXT(accept4)(fd, address, size, flags);
}

IN_PLACE int socket(int domain, int type, int protocol) noexcept {
    return fails(Call::socket) ? -1 : NEXT(socket)(domain, type, protocol);
}

IN_PLACE int socketpair(int domain, int type, int protocol, int* ends) noexcept {
    return fails(Call::socket) ? -1 : NEXT(socketpair)(domain, type, protocol, ends);
}

IN_PLACE int connect(int fd, const sockaddr* address, socklen_t size) {
    return fails(Call::connect) ? -1 : NEXT(connect)(fd, address, size);
}

IN_PLACE int bind(int fd, const sockaddr* address, socklen_t size) noexcept {
    return fails(Call::bind) ? -1 : NEXT(bind)(fd, address, size);
}

IN_PLACE int flock(int fd, int operation) noexcept {
    return fails(Call::lock) ? -1 : NEXT(flock)(fd, operation);
}

IN_PLACE int open(const char* path, int flags, ...) {
    va_list more;
    va_start(more, flags);
    const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(more, mode_t) : 0;
    va_end(more);
    return fails(Call::open) ? -1 : NEXT(open)(path, flags, mode);
}

IN_PLACE int fcntl(int fd, int command, ...) {
    va_list more;
    va_start(more, command);
    void* const argument = va_arg(more, void*);
    va_end(more);
    if (command == F_DUPFD_CLOEXEC && fails(Call::duplicate))
        return -1;
    return NEXT(fcntl)(fd, command, argument);
}

IN_PLACE int epoll_ctl(int epoll, int operation, int fd, epoll_event* event) noexcept {
    if (operation != EPOLL_CTL_DEL && fails(Call::watch))
        return -1;
    const std::lock_guard guard(watchLock);
    if (operation == EPOLL_CTL_DEL)
        watches().erase(fd);
    else
        watches()[fd] = {epoll, *event};
    return NEXT(epoll_ctl)(epoll, operation, fd, event);
}

IN_PLACE int epoll_wait(int epoll, epoll_event* events, int most, int timeout) {
    return fails(Call::wait) ? -1 : NEXT(epoll_wait)(epoll, events, most, timeout);
}
