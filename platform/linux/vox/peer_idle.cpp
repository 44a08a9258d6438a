// A peer connection while its process is idle, and leaves.
#include <linux/sockios.h>
#include <poll.h>
#include <sys/ioctl.h>

#include "platform/linux/vox/peer_connection.h"

namespace vox_link {
namespace {

bool has_unread_bytes(int fd) noexcept {
    int bytes = 0;
    return ::ioctl(fd, SIOCINQ, &bytes) == 0 && bytes > 0;
}

bool is_hung_up(int fd) noexcept {
    pollfd asked = {fd, 0, 0};
    return ::poll(&asked, 1, 0) > 0 && (asked.revents & POLLHUP) != 0;
}

}  // namespace

// The socket, also before the first resume; negative when not connected.
int peer_connection::socket() const {
    const int fd = fd_.load(std::memory_order_relaxed);
    return fd < 0 && origin_.from == peer_origin::kind::socket ? origin_.fd : fd;
}

// What a tap has not read yet keeps nobody.
bool peer_connection::has_open_work() const {
    const bool to_write = fd_.load(std::memory_order_relaxed) >= 0 && !out_.empty() && !is_tap_;
    return writing_ || to_write || !early_.empty() || replies_.size() > 0 || open_.size() > 0;
}

bool peer_connection::has_unread() const {
    return undelivered_.load(std::memory_order_relaxed) || has_unread_bytes(socket());
}

idle_participant::sight peer_connection::look() {
    const lock_guard guard(lock_);
    return {.passed = messages_received_.load(std::memory_order_relaxed) + out_.accepted(),
            .busy = !is_ending() && (has_open_work() || has_unread())};
}

bool peer_connection::leave(leaving_stage now) {
    const lock_guard guard(lock_);
    if (is_ending())
        return is_suspended();
    if (now < (origin_.accepted ? leaving_stage::clients : leaving_stage::everything))
        return !has_open_work();
    const int fd = socket();
    if (fd >= 0 && !receives_no_more_.exchange(true, std::memory_order_acq_rel))
        ::shutdown(fd, SHUT_RD);
    const bool all_read = is_suspended() ? !has_unread() : fd < 0 || all_read_;
    return all_read && !has_open_work();
}

// Whether the end of file that was read is our own doing. The peer's is told by
// another event when it comes.
bool peer_connection::is_own_end() {
    if (!receives_no_more_.load(std::memory_order_acquire) ||
        !greeted_.load(std::memory_order_relaxed) || broken_.load(std::memory_order_acquire) ||
        is_hung_up(fd_.load(std::memory_order_relaxed)))
        return false;
    readable_ = false;
    // What the handlers have queued here comes first.
    hold();
    queue().async([this] {
        {
            const lock_guard guard(lock_);
            all_read_ = true;
        }
        unhold();
    });
    return true;
}

}  // namespace vox_link
