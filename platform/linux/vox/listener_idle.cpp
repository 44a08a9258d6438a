// A listener while its process is idle, and leaves.
#include <poll.h>

#include <vector>

#include "platform/linux/vox/listener.h"

namespace vox_link {
namespace {

bool has_waiting_client(int fd) noexcept {
    pollfd asked = {fd, POLLIN, 0};
    return ::poll(&asked, 1, 0) > 0;
}

}  // namespace

idle_participant::sight listener::look() {
    const lock_guard guard(lock_);
    bool busy = false;
    for (const std::unique_ptr<gate>& each : gates_)
        busy = busy || (opened_ && !closed_ && has_waiting_client(each->fd));
    return {.passed = 0, .busy = busy};
}

bool listener::leave(leaving_stage) {
    const lock_guard guard(lock_);
    if (!opened_ || closed_)
        return true;
    if (!std::exchange(leaving_, true)) {
        hold();
        queue().async([this] {
            queue_role_.entered();
            take_last();
            unhold();
        });
    }
    return left_;
}

// Whoever has connected to a socket of this process's own is served still; the
// service manager's keeps its clients for the next process.
void listener::take_last() {
    std::vector<gate*> closing;
    int shared = -1;
    {
        const lock_guard guard(lock_);
        if (service_) {
            withdraw_service(*service_);
            shared = service_->passed ? service_->fd : -1;
        }
        service_.reset();
        for (const std::unique_ptr<gate>& each : gates_)
            closing.push_back(each.get());
    }
    for (gate* each : closing) {
        while (each->fd != shared && may_take() && has_waiting_client(each->fd) &&
               take_one(*each) == taken::client) {
        }
        close_gate(each);
    }
    const lock_guard guard(lock_);
    left_ = true;
}

}  // namespace vox_link
