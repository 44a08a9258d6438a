#include "platform/linux/vox/user_turns.h"

#include <utility>

#include "platform/linux/dispatch/queue_core.h"
#include "platform/linux/vox/peer_connection.h"

namespace vox_link {

user_turns::place::place(user_turns* of) noexcept
    : embedded_item([](embedded_item* work) noexcept { static_cast<place*>(work)->owner->next(); }),
      owner(of) {}

user_turns::user_turns(dispatch::queue on) noexcept : queue_(std::move(on)), place_(this) {}

bool user_turns::may_go(peer_connection& client) {
    if (self_) {
        client.hold();
        waiting_.push_back(&client);
        return false;
    }
    if (dispatch::detail::frame::more_to_do())
        take_place();
    return true;
}

void user_turns::take_place() {
    self_ = shared_from_this();
    dispatch::detail::submit(queue_.get(), &place_);
}

void user_turns::next() {
    const std::shared_ptr<user_turns> self = std::move(self_);
    if (waiting_.empty())
        return;
    peer_connection* client = waiting_.front();
    waiting_.pop_front();
    take_place();
    client->take_turn();
    client->unhold();
}

}  // namespace vox_link
