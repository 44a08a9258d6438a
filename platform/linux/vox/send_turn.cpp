#include "platform/linux/vox/send_turn.h"

#include <utility>

#include "dispatch/time.h"
#include "platform/linux/vox/peer_connection.h"

namespace vox_link {
namespace {

constexpr std::int64_t kLongestDelay = 100'000;  // ns

thread_local send_turn* current = nullptr;
// The memory of the last turn's list.
thread_local std::vector<peer_connection*> spare;

}  // namespace

send_turn::send_turn(dispatch::detail::queue_core* queue) noexcept
    : queue_(queue), outer_(std::exchange(current, this)), senders_(std::move(spare)) {
    senders_.clear();
}

send_turn::~send_turn() {
    flush();
    current = outer_;
    spare = std::move(senders_);
}

send_turn* send_turn::on(dispatch::detail::queue_core* queue) noexcept {
    return current && current->queue_ == queue ? current : nullptr;
}

void send_turn::add(peer_connection* sender) {
    if (senders_.empty())
        began_ = dispatch::time::now().nanoseconds();
    sender->hold();
    senders_.push_back(sender);
}

void send_turn::flush_if_due() {
    if (!senders_.empty() && dispatch::time::now().nanoseconds() - began_ >= kLongestDelay)
        flush();
}

void send_turn::flush() {
    for (peer_connection* sender : senders_) {
        sender->flush_turn();
        sender->unhold();
    }
    senders_.clear();
}

}  // namespace vox_link
