#pragma once

#include <cstddef>

// System calls that fail when they are told to. A test program that is linked with
// system_faults.cpp and the static library makes its calls through it.
//
// Only what the kernel could do is done. A call that is told to find nothing (EAGAIN)
// or to take or give one byte leaves the descriptor as ready as it is; the kernel
// would report the rest to an edge-triggered epoll instance as it comes, and so does this.
namespace plr::test::faults {

enum class Call {
    send,  // send, sendmsg
    receive,
    accept,
    socket,  // socket, socketpair
    connect,
    bind,
    lock,       // flock
    open,       // open
    duplicate,  // fcntl(F_DUPFD_CLOEXEC)
    watch,      // epoll_ctl, but for EPOLL_CTL_DEL
    wait,       // epoll_wait
    count
};

// In place of an error number: the call moves one byte only.
inline constexpr int kOneByte = -1;
// A receiving call gets none of the descriptors that came (MSG_CTRUNC), as in a
// process that cannot have more open.
inline constexpr int kNoDescriptors = -2;

// From now on the call number `n` of `call`, from 1, gets `fault`.
void arm(Call call, int fault, std::size_t n);
// Everything works again. Returns whether the call came.
bool disarm();

}  // namespace plr::test::faults
