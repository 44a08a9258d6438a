#include "platform/linux/vox/send_turn.h"

#include <algorithm>
#include <utility>

#include "dispatch/time.h"
#include "platform/linux/vox/peer_connection.h"

namespace vox_link {
namespace {

// How long frames may wait for others of the turn: 100 µs; with many receivers
// about as long as writing to each of them will take, so that an update to a
// thousand of them is not written before the next one is known.
constexpr std::int64_t kDelay = 100'000;             // ns
constexpr std::int64_t kDelayForEachSender = 1'000;  // ns
constexpr std::int64_t kLongestDelay = 1'000'000;    // ns

std::int64_t delay_for(std::size_t senders) noexcept {
    return std::clamp(static_cast<std::int64_t>(senders) * kDelayForEachSender, kDelay,
                      kLongestDelay);
}

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
    if (!senders_.empty() &&
        dispatch::time::now().nanoseconds() - began_ >= delay_for(senders_.size()))
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
